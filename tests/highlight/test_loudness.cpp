// The loudness curve and the tuning, on PCM of constant levels whose loudness can be reckoned by
// hand.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <random>
#include <vector>

#include "highlight/position.h"
#include "highlight/power_envelope.h"
#include "highlight/tune.h"
#include "tests/support/reference.h"

namespace {

struct level {
    int64_t samples;
    double square;  // about their mean square, on the scale of full range = 1
};

// Each level in turn, alternating in sign.
std::vector<int16_t> levels(const std::vector<level> &list) {
    std::vector<int16_t> pcm;
    for (const level &each : list) {
        const auto peak = static_cast<int16_t>(std::lround(32767.0 * std::sqrt(each.square)));
        for (int64_t i = 0; i < each.samples; ++i) {
            pcm.push_back(static_cast<int16_t>(i % 2 == 0 ? peak : -peak));
        }
    }
    return pcm;
}

constexpr int32_t kSlow = 100;  // Hz; the curve does not depend on the rate
constexpr int32_t kRate = 8000;

std::vector<float> curve(const std::vector<int16_t> &pcm) {
    TAVO_HL_CTX hl = {};
    const auto samples = static_cast<int64_t>(pcm.size());
    const int32_t count = _calc_power_level(pcm.data(), samples, kSlow, &hl);
    EXPECT_EQ(hl.power_count, count);
    EXPECT_EQ(hl.power == nullptr, count == 0);
    const std::vector<float> values(hl.power, hl.power + count);
    free(hl.power);
    return values;
}

// Steps of 0.4 s from the first frame on, the last level repeated, behind some silence.
std::vector<int16_t> steps(int32_t rate, int64_t silent_ms, const std::vector<double> &squares) {
    std::vector<level> list = {{silent_ms * rate / 1000, 0.0}};
    const auto step = static_cast<int64_t>(0.4 * rate);
    for (size_t k = 0; k < 30; ++k) {
        list.push_back({step, k < squares.size() ? squares[k] : squares.back()});
    }
    return levels(list);
}

}  // namespace

TEST(PowerEnvelope, OneValuePerTwoSecondsFromSixOn) {
    for (const auto &c : {std::pair{0, 0}, {599, 0}, {600, 1}, {799, 1}, {800, 2}, {18000, 88}}) {
        const std::vector<int16_t> silence(static_cast<size_t>(c.first));
        EXPECT_EQ(curve(silence), std::vector<float>(static_cast<size_t>(c.second))) << c.first;
    }
    TAVO_HL_CTX hl = {};
    for (const int32_t rate : {0, -1, INT32_MIN, INT32_MAX}) {
        EXPECT_EQ(_calc_power_level(nullptr, 1000, rate, &hl), 0) << rate;
    }
    EXPECT_EQ(_calc_power_level(nullptr, INT64_MIN / 2, kSlow, &hl), 0);
    EXPECT_EQ(_calc_power_level(nullptr, INT64_MAX, 1, &hl), 0);
    EXPECT_EQ(hl.power, nullptr);
}

// Two silent seconds, two at a quarter of the full power, two at full: (0 + 1/4 + 1) / 3.
TEST(PowerEnvelope, KnownLevels) {
    for (const float value : curve(std::vector<int16_t>(800, 32767))) {
        EXPECT_EQ(value, 10.0f * log10f(2.0f));
    }
    EXPECT_NEAR(curve(levels({{200, 0.0}, {200, 0.25}, {200, 1.0}}))[0],
                10.0 * log10(1.0 + 1.25 / 3.0), 1e-4);
}

// Any number of windows, so that the parts summed side by side share one or none.
TEST(PowerEnvelope, HasTheBitsOfEachWindowSummedAlone) {
    std::mt19937 random(11);
    for (int64_t windows = 1; windows <= 9; ++windows) {
        const int64_t samples = (windows + 2) * 2 * kSlow + windows * 13 % (2 * kSlow);
        std::vector<int16_t> pcm(static_cast<size_t>(samples));
        for (int16_t &x : pcm) x = static_cast<int16_t>(random());
        const std::vector<float> values = curve(pcm);
        ASSERT_EQ(values.size(), static_cast<size_t>(windows));
        for (size_t k = 0; k < values.size(); ++k) {
            EXPECT_EQ(values[k], reference::power(pcm.data() + 2 * kSlow * k, 6 * kSlow)) << k;
        }
    }
    for (int32_t x = INT16_MIN; x <= INT16_MAX; ++x) {
        ASSERT_EQ(x * kInverseHead + x * kInverseTail, x / 32767.0) << x;
    }
}

TEST(Tune, StartsThatAreLeftAlone) {
    for (const uint32_t start : {0u, 2000u, 51001u, 52000u, 70000u}) {
        EXPECT_EQ(_tune_HL_simple(nullptr, kRate, start, 60), start);
    }
    for (const int32_t rate : {-8000, 0, 2}) {  // 2: a hop of no sample
        EXPECT_EQ(_tune_HL_simple(nullptr, rate, 20000, 60), 20000u) << rate;
    }
}

// Frame k covers steps k to k + 2, frame 0 from 3 s before the start. From step 13 on: mean squares
// from frame 10 on are 0, 0.2, 0.3, 0.3, 0.2, 0.3, 0.3, 0.2, 0, so the largest rise is at 10, the
// only fall of its five steps leads from 13 to 14.
TEST(Tune, MovesToTheStepBeforeTheFall) {
    std::vector<double> song(13, 0.0);
    for (const double square : {0.6, 0.3, 0.0, 0.3, 0.6, 0.0}) song.push_back(square);
    for (const int32_t rate : {8000, 11025, 22051, 44100}) {
        const std::vector<int16_t> pcm = steps(rate, 17000, song);
        EXPECT_EQ(_tune_HL_simple(pcm.data(), rate, 20000, 60), 22200u) << rate;
    }
    const std::vector<int16_t> at_once = steps(kRate, 0, song);
    EXPECT_EQ(_tune_HL_simple(at_once.data(), kRate, 3000, 12), 5200u);  // 9 s left exactly
    EXPECT_EQ(_tune_HL_simple(at_once.data(), kRate, 3000, 11), 3000u);
}

// A step to square c at step s: the rise at frame s - 3 is (c/3 + 2c/3 + 3c) / 5 = 0.8 c on
// average, about 3.47 c dB, and counts above 0.13; after it the first of the two equal steps of 0
// is taken.
TEST(Tune, Rises) {
    constexpr double kLeast = 0.039;  // reaches 0.13 with five frames of c, not with 0.8 or 0.73 c
    const struct {
        size_t silent;
        std::vector<double> squares;
        uint32_t ms;
    } cases[] = {
        {13, {0.045}, 5200},
        {13, {0.033}, 3000},
        {0, {0.5}, 3000},
        {13, {kLeast, kLeast, kLeast, kLeast, kLeast, 0.0}, 5200},
        {3, {0.5}, 1200},  // from the first frame
        // the first of equal rises: at frame 3, after which 6 to 7 is level
        {6, {0.5, 0.5, 0.5, 0.5, 0.5, 0, 0, 0, 0, 0, 0, 0, 0.5, 0.5, 0.5, 0.5, 0.5, 0}, 2400}};
    for (const auto &c : cases) {
        std::vector<double> song(c.silent, 0.0);
        song.insert(song.end(), c.squares.begin(), c.squares.end());
        EXPECT_EQ(_tune_HL_simple(steps(kRate, 0, song).data(), kRate, 3000, 60), c.ms);
    }
}

namespace {

// The start that PCM of exactly its size gives, twice: the curve is replaced.
uint32_t position(std::vector<int16_t> pcm, int64_t duration_s, int32_t count) {
    pcm.shrink_to_fit();
    TAVO_CTX ctx = {};
    ctx.pcm = pcm.data();
    ctx.pcm_bytes = static_cast<int64_t>(pcm.size() * sizeof(int16_t));
    ctx.fmt.sample_rate = kRate;
    ctx.duration = duration_s * kUnitsPerSecond;
    ctx.hl = static_cast<TAVO_HL_CTX *>(calloc(1, sizeof(TAVO_HL_CTX)));
    ctx.hl->hl_pos = 12345;
    const uint32_t start = getHLPosition(&ctx);
    EXPECT_EQ(ctx.hl->hl_pos, start);
    EXPECT_EQ(ctx.hl->power_count, count);
    EXPECT_EQ(getHLPosition(&ctx), start);
    clearHighlgihtCtx(ctx.hl);
    return start;
}

}  // namespace

// 120 s, loud from 60 s to 100 s. The window at 54 s is the last without the loud part: coarse
// start 54 s. Of the 27 frames from 51 s on, frame 22 is half, 23 wholly at the loud level from
// 60.2 s on; the rise is largest at 19, its smallest step leads from 23 to 24: 51 s + 9.2 s.
TEST(Position, CoarseThenFine) {
    const auto song = levels({{60 * kRate, 0.04}, {40 * kRate, 0.64}, {20 * kRate, 0.04}});
    EXPECT_EQ(position(song, 120, 58), 60200u);
    EXPECT_EQ(position({}, 120, 0), 0u);
    EXPECT_EQ(position(levels({{6 * kRate - 1, 0.5}}), 5, 0), 0u);
    EXPECT_EQ(position(std::vector<int16_t>(120 * kRate), 120, 58), 0u);
    clearHighlgihtCtx(nullptr);
}

// The only edge leads to the window at 112 s, the last but one of 120 s, whose tuning would need
// audio up to 120.6 s: the duration promises it, the PCM does not hold it. With that audio decoded
// the same start is tuned: of the frames from 109 s on, the rise is largest at 14, and 18 to 19 is
// the level step after it: 109 s + 7.2 s.
TEST(Position, TheTuningNeverReadsPastThePcm) {
    std::vector<level> song = {{116 * kRate, 0.04}, {2 * kRate, 0.64}, {2 * kRate, 0.04}};
    EXPECT_EQ(position(levels(song), 200, 58), 112000u);
    song.push_back({kRate, 0.04});
    EXPECT_EQ(position(levels(song), 200, 58), 116200u);
}
