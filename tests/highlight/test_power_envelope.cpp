#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <random>
#include <vector>

#include "highlight/power_envelope.h"
#include "level_steps.h"

namespace {

constexpr int32_t kRate = 100;  // Hz; nothing here depends on it

std::vector<float> envelope(const std::vector<int16_t> &pcm, int32_t rate) {
    TAVO_HL_CTX hl = {};
    const int32_t count =
        _calc_power_level(pcm.data(), static_cast<int64_t>(pcm.size()), rate, &hl);
    EXPECT_EQ(hl.power_count, count);
    EXPECT_EQ(hl.power == nullptr, count == 0);
    const std::vector<float> values(hl.power, hl.power + count);
    free(hl.power);
    return values;
}

TEST(PowerEnvelope, OneValuePerTwoSecondsFromSixOn) {
    const struct {
        int64_t samples;
        size_t count;
    } cases[] = {{0, 0}, {590, 0}, {599, 0}, {600, 1}, {799, 1}, {800, 2}, {18000, 88}};
    for (const auto &c : cases) {
        const std::vector<int16_t> pcm(static_cast<size_t>(c.samples), 0);
        EXPECT_EQ(envelope(pcm, kRate), std::vector<float>(c.count, 0.0f)) << c.samples;
    }
}

TEST(PowerEnvelope, LengthsAndRatesThatMakeNoSense) {
    TAVO_HL_CTX hl = {};
    for (int32_t rate : {0, -1, INT32_MIN, INT32_MAX}) {
        EXPECT_EQ(_calc_power_level(nullptr, 1000, rate, &hl), 0) << rate;
    }
    EXPECT_EQ(_calc_power_level(nullptr, INT64_MIN / 2, kRate, &hl), 0);
    EXPECT_EQ(_calc_power_level(nullptr, INT64_MAX, 1, &hl), 0);
    EXPECT_EQ(hl.power, nullptr);
}

TEST(PowerEnvelope, KnownLevels) {
    const std::vector<int16_t> full(800, 32767);
    for (float value : envelope(full, kRate)) EXPECT_EQ(value, 10.0f * log10f(2.0f));
    // Two silent seconds, two at a quarter of the full power, two at full: (0 + 1/4 + 1) / 3.
    const auto values = envelope(levels({{200, 0.0}, {200, 0.25}, {200, 1.0}}), kRate);
    ASSERT_EQ(values.size(), 1u);
    EXPECT_NEAR(values[0], 10.0 * log10(1.0 + 1.25 / 3.0), 1e-4);
}

// Any number of windows, so that the parts summed side by side share one or none.
TEST(PowerEnvelope, HasTheBitsOfEachWindowSummedAlone) {
    std::mt19937 random(11);
    for (int64_t windows = 1; windows <= 9; windows++) {
        const int64_t samples = (windows + 2) * 2 * kRate + windows * 13 % (2 * kRate);
        std::vector<int16_t> pcm(static_cast<size_t>(samples));
        for (int16_t &x : pcm) x = static_cast<int16_t>(random());
        const std::vector<float> values = envelope(pcm, kRate);
        ASSERT_EQ(values.size(), static_cast<size_t>(windows));
        for (int64_t k = 0; k < windows; k++) {
            double sum = 0.0;
            for (int64_t i = 0; i < 6 * kRate; i++) {
                const double x = pcm[static_cast<size_t>(k * 2 * kRate + i)] / 32767.0;
                sum += x * x;
            }
            const float mean = static_cast<float>(sum / (6.0 * kRate));
            EXPECT_EQ(values[static_cast<size_t>(k)], 10.0f * log10f(mean + 1.0f)) << k;
        }
    }
}

TEST(PowerEnvelope, TheProductsAreTheQuotientForEverySample) {
    for (int32_t sample = INT16_MIN; sample <= INT16_MAX; sample++) {
        const double x = sample;
        ASSERT_EQ(x * kInverseHead + x * kInverseTail, x / 32767.0) << sample;
    }
}

}  // namespace
