#include <gtest/gtest.h>

#include <vector>

#include "highlight/search.h"

namespace {

using Indexes = std::vector<int32_t>;

constexpr int32_t kUnwritten = -99;

// Loud everywhere but at the low points; with mean 0.5 and deviation 0.25 the threshold is 0.25.
Indexes valleys(const Indexes &lows, int32_t n, float hop_s = 2.0f) {
    std::vector<float> values(static_cast<size_t>(n), 0.75f);
    for (int32_t low : lows) values[static_cast<size_t>(low)] = 0.125f;
    Indexes out(15, kUnwritten);
    const int32_t count = tavo_find_valley(values.data(), n, out.data(), 0.5f, 0.25f, hop_s);
    for (size_t k = static_cast<size_t>(count); k < out.size(); k++) {
        EXPECT_EQ(out[k], kUnwritten);
    }
    out.resize(static_cast<size_t>(count));
    return out;
}

TEST(Valleys, EndsOfTheQuietStretches) {
    EXPECT_EQ(valleys({}, 20), Indexes{});
    EXPECT_EQ(valleys({}, 0), Indexes{});
    EXPECT_EQ(valleys({0, 1, 5, 6, 12}, 20), (Indexes{1, 6, 12}));
    EXPECT_EQ(valleys({0, 10}, 20), (Indexes{10}));  // the opening is no valley
    EXPECT_EQ(valleys({0}, 20), (Indexes{0}));       // unless it is all there is
    EXPECT_EQ(valleys({4, 6, 9}, 20), (Indexes{6, 9}));
    EXPECT_EQ(valleys({4, 6, 9}, 20, 1.0f), (Indexes{9}));  // the gap is then 7 points
}

TEST(Valleys, AtMostFifteen) {
    Indexes lows;
    for (int32_t k = 1; k <= 20; k++) lows.push_back(5 * k);
    EXPECT_EQ(valleys(lows, 120), Indexes(lows.begin(), lows.begin() + 15));
    lows.resize(15);
    EXPECT_EQ(valleys(lows, 120), lows);
}

TEST(Valleys, LoudSongsNeedDeeperDips) {
    const float values[] = {1.0f, 0.5f, 1.0f, 1.0f, 1.0f, 0.25f, 1.0f};
    int32_t out[15];
    // Mean above 0.5: below 0.75 - 1.5 x 0.25 = 0.375.
    ASSERT_EQ(tavo_find_valley(values, 7, out, 0.75f, 0.25f, 2.0f), 1);
    EXPECT_EQ(out[0], 5);
    // Mean 0.5 exactly is not above: below 0.5 - 0.125 = 0.375 as well, not 0.3125.
    const float shallow[] = {1.0f, 0.34375f, 1.0f};
    ASSERT_EQ(tavo_find_valley(shallow, 3, out, 0.5f, 0.125f, 2.0f), 1);
    EXPECT_EQ(out[0], 1);
    EXPECT_EQ(tavo_find_valley(shallow, 3, out, 0.5625f, 0.25f, 2.0f), 0);
}

TEST(Valleys, AHopOfNothingFindsOneStretch) {
    EXPECT_EQ(valleys({4, 10, 16}, 20, 0.0f), (Indexes{16}));
}

}  // namespace
