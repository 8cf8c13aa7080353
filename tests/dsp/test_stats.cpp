#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "dsp/stats.h"

namespace {

struct Stats {
    double mean, std;
};

Stats stats(const std::vector<double> &x) {
    Stats s = {};
    getMeanStd(x.data(), static_cast<int64_t>(x.size()), &s.mean, &s.std);
    return s;
}

Stats single_stats(const std::vector<float> &x) {
    float mean = 0.0f;
    float std = 0.0f;
    getfloatMeanStd(x.data(), static_cast<int64_t>(x.size()), &mean, &std);
    return {mean, std};
}

TEST(Stats, PopulationDeviation) {
    for (const Stats &s :
         {stats({2, 4, 4, 4, 5, 5, 7, 9}), single_stats({2, 4, 4, 4, 5, 5, 7, 9})}) {
        EXPECT_EQ(s.mean, 5.0);
        EXPECT_EQ(s.std, 2.0);
    }
    EXPECT_EQ(stats({4, 4, 4}).std, 0.0);
}

TEST(Stats, SinglePrecisionLosesWhatDoubleKeeps) {
    // Above 2^24 a float no longer counts by ones, and near 5.6 million its step is 0.5.
    EXPECT_EQ(single_stats({16777216, 1, 1}).mean, 5592405.5);
    EXPECT_EQ(stats({16777216, 1, 1}).mean, 5592406.0);
}

TEST(Stats, NothingIsNotANumber) {
    for (const Stats &s : {stats({}), single_stats({})}) {
        EXPECT_TRUE(std::isnan(s.mean) && std::isnan(s.std));
    }
}

}  // namespace
