#include <gtest/gtest.h>

#include <tuple>

#include "beat/tempo.h"
#include "tests/beat/beat_fixture.h"

namespace {

struct pulse_pair {
    size_t first, lag;  // frames
    double weight;
};

int32_t estimate(std::vector<double> env, const std::vector<pulse_pair> &pairs = {}) {
    for (const pulse_pair &pair : pairs) {
        env[pair.first] = 1.0;
        env[pair.first + pair.lag] = pair.weight;
    }
    TAVO_BEAT_CTX beat = {};
    beat.onset_env = env.data();
    beat.frame_count = static_cast<int64_t>(env.size());
    beat.hop_seconds = kHop;
    return estimate_tempo(&beat);
}

}  // namespace

// Distant pairs correlate only at their own lags. The weights of the lags are:
// lag  13     20     27     39     40     41     42     59     60     61     81
// 0.767  0.994  0.948  0.693  0.671  0.650  0.629  0.347  0.335  0.324  0.161
// The tempo is 2583.984375 frames per minute divided by the lag: 129 BPM for 20, 95 for 27.
TEST(Tempo, BestScoreOfTwoOrThreePeriodsWins) {
    const struct {
        std::vector<std::pair<size_t, double>> weights;  // of each lag
        int32_t bpm;
    } cases[] = {
        {{{13, 1}}, 198},
        {{{12, 1}}, 90},            // 215 BPM is discarded
        {{{18, 1}, {26, 1}}, 143},  // 0.967 and 0.964, on either side of 120 BPM
        {{{18, 1}, {26, 1.01}}, 99},
        // Lag 20 scores 0.994, and its double adds 0.5 x 0.671: 1.330. The double's neighbours add
        // 0.25 x 1.342 instead. Lag 27 scores 1.313 or 1.346, and then 1.300 or 1.360.
        {{{20, 1}, {40, 1}, {27, 1.385}}, 129},
        {{{20, 1}, {40, 1}, {27, 1.42}}, 95},
        {{{20, 1}, {39, 1}, {41, 1}, {27, 1.371}}, 129},
        {{{20, 1}, {39, 1}, {41, 1}, {27, 1.434}}, 95},
        // Lag 60, the triple of 20, and its neighbours raise the score of lag 20. Lag 27 scores
        // slightly less or slightly more.
        {{{20, 1}, {59, 1}, {60, 1}, {61, 1}, {27, 1.385}}, 129},
        {{{20, 1}, {59, 1}, {60, 1}, {61, 1}, {27, 1.413}}, 95},
        {{{20, 1}, {59, 1}, {27, 1.1}}, 129},  // only 59: 1.109 and 1.043
        // Lag 20 contributes 0.533 or 0.527 of its score, its double (64 BPM) the rest.
        {{{20, 1}, {40, 1.30}}, 129},
        {{{20, 1}, {40, 1.33}}, 64},
        // The longest lags: 42 beats 27, which scores 0.45; then 81 as the triple of 27.
        {{{42, 1}, {27, 0.475}}, 61},
        {{{27, 1}, {81, 5.6}}, 31},
    };
    for (const auto &c : cases) {
        std::vector<pulse_pair> pairs;
        for (const auto &[lag, weight] : c.weights)
            pairs.push_back({100 + 200 * pairs.size(), lag, weight});
        EXPECT_EQ(estimate(std::vector<double>(2584), pairs), c.bpm) << c.weights.back().second;
    }
}

// The excerpt is the last minute, or the second minute of a song longer than two minutes. A pair of
// pulses inside it, 20 frames apart, outweighs the other pair.
TEST(Tempo, DependsOnOneMinuteOnly) {
    const std::tuple<size_t, size_t, int32_t> cases[] = {{7750, 2583, 129}, {7750, 2582, 95},
                                                         {7750, 5146, 129}, {7750, 5147, 95},
                                                         {3000, 416, 129},  {3000, 415, 95}};
    for (const auto &[length, first, bpm] : cases) {
        const std::vector<double> silence(length);
        EXPECT_EQ(estimate(silence, {{2900, 27, 0.5}, {first, 20, 1.0}}), bpm) << first;
    }
}

// Pulses every p frames correlate almost equally at p and 2p, so the weighting decides: p up to
// about 144 BPM, otherwise 2p. Without a period, as in silence, the tempo is 90 BPM, and
// calc_bpm_acf returns a value above every tempo.
TEST(Tempo, ShortExcerptsAndSilenceHaveATempo) {
    for (const auto &[length, period, bpm] :
         {std::tuple{1290u, 20u, 129},  // half a minute
          {42u, 20u, 129},              // one second: more lags than the transform has values
          {10u, 4u, 80}}) {  // best in the circular correlation of 16 values; 161 BPM, so 32 frames
        std::vector<double> env(length);
        for (size_t i = 0; i < length; i += period) env[i] = 1.0;
        EXPECT_EQ(estimate(env), bpm) << length << " frames, period " << period;
    }
    for (const double value : {0.0, double{NAN}, double{INFINITY}}) {
        std::vector<double> env(64);
        env[5] = value;
        EXPECT_EQ(estimate(env), 90) << value;
        EXPECT_GT(calc_bpm_acf(env.data(), 64, 3, 64, kHop), 200) << value;
    }
}
