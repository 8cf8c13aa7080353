#include <gtest/gtest.h>

#include "beat/tempo.h"
#include "tests/beat/beat_fixture.h"

namespace {

constexpr int32_t kLags = 86;  // two seconds

int32_t bpm_of(const std::vector<double> &x, int64_t nfft, int32_t lags = kLags) {
    return calc_bpm_acf(x.data(), nfft, lags, static_cast<int32_t>(x.size()), kHop);
}

}  // namespace

// Frames to BPM: 2583.984375 / period. With pulses every p frames the correlation at p and 2p is
// nearly the same, so the prior decides: p up to about 144 BPM, else 2p.
TEST(Tempo, Pulses) {
    const struct {
        size_t length;
        int64_t nfft;
        size_t period;
        int32_t bpm;
    } cases[] = {
        {2584, 4096, 20, 129},  // weights 0.994 and 0.671: share 0.599
        {2584, 4096, 13, 99},   // 198.77 BPM, weights 0.767 and 0.964: share 0.444, 26 frames
        {2584, 4096, 42, 61},   // the longest period looked at
        {2584, 4096, 44, 58},   // found as the double of 22, where nothing is
        {1290, 2048, 20, 129},  // half a minute
        {42, 64, 20, 129},      // a second: more lags than the transform has values
        {10, 16, 4, 80},        // the circle of 16 correlates best; 161 BPM, so 32 frames
    };
    for (const auto &c : cases) {
        std::vector<double> x(c.length);
        for (size_t i = 0; i < c.length; i += c.period) x[i] = 1.0;
        EXPECT_EQ(bpm_of(x, c.nfft), c.bpm) << c.length << " frames, period " << c.period;
    }
}

// Pulses far from each other correlate at their distances alone. 12: 60 / (12 hops) = 215.33.
// Twenty and, of its triple's neighbours, 59 weigh 0.994 + 0.33 * 4 * 0.347, more than 24
// alone: 1.44 * 0.988. No period, as in silence, counts as above every tempo.
TEST(Tempo, SinglePeriods) {
    std::vector<double> x(2584);
    x[100] = x[112] = 1.0;
    EXPECT_EQ(bpm_of(x, 4096), 215);
    TAVO_BEAT_CTX beat = {};
    beat.onset_env = x.data();
    beat.frame_count = 2584;
    beat.hop_seconds = kHop;
    EXPECT_EQ(estimate_tempo(&beat), 90);  // above 200
    x[112] = 0.0;
    x[120] = 1.0;
    x[300] = x[359] = 2.0;
    x[600] = x[624] = 1.2;
    EXPECT_EQ(bpm_of(x, 4096), 129);
    for (const double odd_one : {0.0, double{NAN}, double{INFINITY}}) {
        x.assign(64, 0.0);
        x[5] = odd_one;
        for (const int32_t lags : {kLags, 3}) EXPECT_GT(bpm_of(x, 64, lags), 200) << odd_one;
    }
}
