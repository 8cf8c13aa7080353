#include <gtest/gtest.h>

#include <cmath>

#include "dsp/stats.h"

namespace {

TEST(Stats, PopulationDeviation) {
    const double x[] = {2, 4, 4, 4, 5, 5, 7, 9};
    double mean;
    double std;
    getMeanStd(x, 8, &mean, &std);
    EXPECT_EQ(mean, 5.0);
    EXPECT_EQ(std, 2.0);
    getMeanStd(x + 1, 3, &mean, &std);
    EXPECT_EQ(mean, 4.0);
    EXPECT_EQ(std, 0.0);

    const float xf[] = {2, 4, 4, 4, 5, 5, 7, 9};
    float mean_f;
    float std_f;
    getfloatMeanStd(xf, 8, &mean_f, &std_f);
    EXPECT_EQ(mean_f, 5.0f);
    EXPECT_EQ(std_f, 2.0f);
}

TEST(Stats, SinglePrecisionLosesWhatDoubleKeeps) {
    // Above 2^24 a float no longer counts by ones, and near 5.6 million its step is 0.5.
    const float xf[] = {16777216.0f, 1.0f, 1.0f};
    float mean_f;
    float std_f;
    getfloatMeanStd(xf, 3, &mean_f, &std_f);
    EXPECT_EQ(mean_f, 5592405.5f);
    const double x[] = {16777216.0, 1.0, 1.0};
    double mean;
    double std;
    getMeanStd(x, 3, &mean, &std);
    EXPECT_EQ(mean, 5592406.0);
}

TEST(Stats, NothingIsNotANumber) {
    double mean = 0.0;
    double std = 0.0;
    getMeanStd(nullptr, 0, &mean, &std);
    EXPECT_TRUE(std::isnan(mean));
    EXPECT_TRUE(std::isnan(std));
    float mean_f = 0.0f;
    float std_f = 0.0f;
    getfloatMeanStd(nullptr, 0, &mean_f, &std_f);
    EXPECT_TRUE(std::isnan(mean_f));
    EXPECT_TRUE(std::isnan(std_f));
}

}  // namespace
