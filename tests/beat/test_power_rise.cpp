#include <gtest/gtest.h>

#include <algorithm>

#include "beat/power_rise.h"
#include "tests/beat/beat_fixture.h"
#include "tests/support/reference.h"

namespace {

constexpr size_t kBlock = 5512;

// Constant samples that give the follower's level, 16-bit scale.
double sample_of_level(double level) {
    return sqrt((level + 0.5) / 32767.0);
}

}  // namespace

// Silence is at the floor of -30.31 dB, sample 0.5 at level 8191, -12.04 dB. P60 is -12.04, the
// target twice that, level 2048: three of the ten samples around i, each 819 of the mean, must be
// loud. 20 blocks are measured, block b over samples 5512 (b - 1) + 1 to 5512 b.
TEST(PowerRise, Steps) {
    constexpr size_t kBegin = 10 * kBlock;
    const struct {
        size_t start;
        double sample;
        size_t rise;  // 0: none
    } cases[] = {
        {kBegin + 2000, 0.5, kBegin + 1998},
        {kBegin + 3, 0.5, kBegin + 1},
        {kBlock + 2000, 0.5, kBlock + 1998},  // block 0 is never measured and counts as quiet
        // Anything below level 1000 counts as the floor. A step to -28.03 dB (level 1300) is then
        // too low, its limit being -32.03; one to -24.29 dB (2000) is not, and its target lies
        // below the floor.
        {kBegin + 2000, sample_of_level(1300), 0},
        {kBegin + 2000, sample_of_level(2000), kBegin},
        // Ten samples of -32768 have a mean of 32769, beyond 16 bits. The target is the top, 0 dB,
        // which only ten loud samples reach.
        {kBegin + 2000, -32768.0 / 32767.0, kBegin + 2005},
        {kBegin + kBlock - 5, -32768.0 / 32767.0, kBegin + kBlock},  // at the block's last sample
    };
    for (const auto &c : cases) {
        std::vector<double> signal(20 * kBlock + 100, c.sample);
        std::fill_n(signal.begin(), c.start, 0.0);
        std::vector<int32_t> flags(signal.size()), expected(signal.size());
        if (c.rise > 0) expected[c.rise] = 1;
        EXPECT_EQ(
            detectPowerVariation(signal.data(), flags.data(), static_cast<int64_t>(signal.size())),
            c.rise > 0 ? 1 : 0);
        EXPECT_TRUE(flags == expected) << c.start << " " << c.sample;
    }
}

// Loud and quiet by turns, at all lengths around a block's: noise, wild values, and samples whose
// tens measure whole levels, so that a rounding more or less decides.
TEST(PowerRise, HasTheBitsOfTheLevelsOneByOne) {
    std::mt19937 random(7);
    int found = 0;
    for (int round = 0; round < 80; ++round) {
        const size_t n = (random() % 50) * kBlock + random() % (round % 2 == 0 ? 12 : kBlock);
        std::vector<double> signal = wild_samples(n, 20, &random);
        double loudness = 0.1;
        for (double &x : signal) {
            if (random() % 25000 == 0) loudness = pow(10.0, -1.5 * fabs(uniform(&random)));
            if (round % 4 != 0) x = loudness * uniform(&random);
            if (round % 4 == 1) x = sqrt(floor(3276.7 * fabs(x)) * 10.0 / 32767.0);
        }
        if (round % 8 == 3 && n > 0) signal[0] = 4.0;  // in the first sum alone
        if (round % 6 == 0 && n > 0) signal[random() % n] = round % 4 == 0 ? NAN : INFINITY;

        std::vector<double> levels(n / kBlock + 1), db;
        measure_block_levels({signal.data(), 1.0}, static_cast<int64_t>(n), levels.data());
        ASSERT_TRUE(same_bits(levels.data(), reference::block_levels(signal, &db))) << round;
        std::vector<int32_t> flags(n);
        found += detectPowerVariation(signal.data(), flags.data(), static_cast<int64_t>(n));
        ASSERT_TRUE(flags == reference::rises(signal)) << round;
    }
    EXPECT_GT(found, 15);
}
