#include <gtest/gtest.h>

#include <algorithm>

#include "beat/power_rise.h"
#include "tests/beat/beat_fixture.h"

namespace {

constexpr size_t kBlock = 5512;

// Constant samples that give the follower's level, 16-bit scale.
double sample_of_level(double level) {
    return sqrt((level + 0.5) / 32767.0);
}

struct step {
    size_t start;  // sample
    double sample;
};

// 21 blocks are measured, 1 to 20: block b over samples 5512 (b - 1) + 1 to 5512 b.
std::vector<double> steps(const std::vector<step> &list, size_t n = 20 * kBlock + 100) {
    std::vector<double> signal(n);
    for (const step &s : list)
        std::fill(signal.begin() + static_cast<long>(s.start), signal.end(), s.sample);
    return signal;
}

// The flagged samples; the count returned must agree.
std::vector<size_t> rises_of(const std::vector<double> &signal) {
    std::vector<int32_t> flags(signal.size());
    const int32_t count =
        detectPowerVariation(signal.data(), flags.data(), static_cast<int64_t>(signal.size()));
    std::vector<size_t> rises;
    for (size_t i = 0; i < flags.size(); ++i) {
        if (flags[i] != 0) rises.push_back(i);
    }
    EXPECT_EQ(static_cast<size_t>(count), rises.size());
    return rises;
}

using samples = std::vector<size_t>;

}  // namespace

TEST(PowerRise, Steps) {
    constexpr size_t kBegin = 10 * kBlock;
    const struct {
        const char *name;
        std::vector<step> steps;
        samples rises;
    } cases[] = {
        // Silence is at the floor of -30.31 dB, sample 0.5 at level 8191, -12.04 dB. P60 is -12.04,
        // the target twice that, level 2048: three of the ten samples around i, each 819 of the
        // mean, must be loud.
        {"in a block", {{kBegin + 2000, 0.5}}, {kBegin + 1998}},
        {"at a block's start", {{kBegin + 3, 0.5}}, {kBegin + 1}},
        // Block 0 is never measured and counts as quiet.
        {"in the second block", {{kBlock + 2000, 0.5}}, {kBlock + 1998}},
        // Anything below level 1000 counts as the floor. A step to -28.03 dB (level 1300) is then
        // too low, its limit being -32.03; one to -24.29 dB (2000) is not, and its target lies
        // below the floor.
        {"too low", {{kBegin + 2000, sample_of_level(1300)}}, {}},
        {"just high enough", {{kBegin + 2000, sample_of_level(2000)}}, {kBegin}},
        // -23.46 dB before the step is below the limit of -17.75 but above the target of -24.08:
        // the boundary sample carries the block before.
        {"above the target before", {{0, sample_of_level(2200)}, {kBegin + 2000, 0.5}}, {kBegin}},
        // Ten samples of -32768 have a mean of 32769, beyond 16 bits. The target is the top, 0 dB,
        // which only ten loud samples reach.
        {"saturated", {{kBegin + 2000, -32768.0 / 32767.0}}, {kBegin + 2005}},
    };
    for (const auto &c : cases) EXPECT_EQ(rises_of(steps(c.steps)), c.rises) << c.name;
}

// Loud, quiet for two blocks and loud again, in block 17 or 18 after a rise in block 11: -22 dB
// (level 2602) lies far enough below the means. The target lies below it, so that a rise is flagged
// at its block's boundary.
TEST(PowerRise, NextRiseSevenBlocksLater) {
    const size_t n = 30 * kBlock + 100;
    const double quiet = sample_of_level(2602);
    const auto song = [&](size_t loud_again) {
        return steps({{0, quiet},
                      {10 * kBlock + 2000, 0.5},
                      {(loud_again - 4) * kBlock + 2000, quiet},
                      {(loud_again - 1) * kBlock + 2000, 0.5}},
                     n);
    };
    EXPECT_EQ(rises_of(steps({{0, quiet}, {16 * kBlock + 2000, 0.5}}, n)), samples{16 * kBlock});
    EXPECT_EQ(rises_of(song(17)), samples{10 * kBlock});
    EXPECT_EQ(rises_of(song(18)), (samples{10 * kBlock, 17 * kBlock}));
}

// Blocks that the song no longer has count as -150 dB, so the last rise needs eight from its own
// on.
TEST(PowerRise, NearTheEnd) {
    const std::vector<step> list = {{8 * kBlock + 2000, 0.5}};
    EXPECT_EQ(rises_of(steps(list, 16 * kBlock + 5)).size(), 1u);
    EXPECT_EQ(rises_of(steps(list, 16 * kBlock + 4)).size(), 0u);  // block 16 is not measured
    EXPECT_EQ(rises_of(steps(list, 16 * kBlock)).size(), 0u);
}

TEST(PowerRise, ShortAndEven) {
    for (const size_t n : {size_t{0}, size_t{9}, size_t{10}, size_t{5517}, size_t{11023},
                           size_t{11024}, 40 * kBlock}) {
        EXPECT_EQ(rises_of(std::vector<double>(n, 0.5)), samples{}) << n;
    }
}
