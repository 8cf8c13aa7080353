// Tests peaks, searches, sorts and statistics with known lists. fuzz/toolkit.cpp uses random ones.
#include <gtest/gtest.h>
#include <pthread.h>

#include <algorithm>
#include <cmath>
#include <vector>

#include "dsp/peaks.h"
#include "dsp/sort.h"
#include "dsp/stats.h"

namespace {

using indexes = std::vector<int32_t>;
using list = std::vector<double>;

}  // namespace

// A search that compares every pair of peaks would exceed the test's time limit.
TEST(Peaks, AreSuppressedInLinearTime) {
    list x(500001);
    for (size_t i = 1; i < x.size(); i += 2) x[i] = 1.0 + static_cast<double>(i * 7919 % 500000);
    indexes out(350000), priority(100000, 250000);
    EXPECT_EQ(findPeaks(x.data(), 500001, 2, out.data()), 250000);
    findPeaksPriority(x.data(), 500001, 200000, out.data(), priority.data(), 100000);
    EXPECT_EQ(std::count(out.begin(), out.begin() + 100000, 249999), 100000);
}

TEST(Peaks, SearchReturnsTheNearestOrTheFirstEqual) {
    const indexes ascending = {10, 20, 30};
    const struct {
        int32_t target, n, expected;
    } cases[] = {{100, 3, 2}, {100, 2, 1}, {100, 1, 0}, {100, 0, 0},
                 {15, 3, 0},  {16, 3, 1},  {-5, 3, 0}};  // 15: the first of two equally near ones
    for (const auto &c : cases) {
        EXPECT_EQ(findNearestIndex(ascending.data(), c.target, c.n), c.expected) << c.target;
    }
    const list x = {3, 1, 4, 1};
    EXPECT_EQ(findIndex(x.data(), 4, 1.0), 1);
    EXPECT_EQ(findIndex(x.data(), 4, 9.0), 0);
    EXPECT_EQ(findIndex(x.data(), 2, 4.0), 0);
}

// Equal, falling and rising values are the worst input: each partition splits off one element.
TEST(Sort, RecursionIsShallowOnTheWorstInput) {
    pthread_attr_t small;
    pthread_attr_init(&small);
    ASSERT_EQ(pthread_attr_setstacksize(&small, 128 * 1024), 0);
    for (const double step : {0.0, -1.0, 1.0}) {
        list a(8000);
        for (size_t i = 0; i < a.size(); ++i) a[i] = step * static_cast<double>(i);
        const auto sort_all = [](void *argument) -> void * {
            auto *values = static_cast<list *>(argument);
            quickSort(0, static_cast<int32_t>(values->size()) - 1, values->data());
            return nullptr;
        };
        pthread_t thread;
        ASSERT_EQ(pthread_create(&thread, &small, sort_all, &a), 0);
        pthread_join(thread, nullptr);
        EXPECT_TRUE(std::is_sorted(a.begin(), a.end()));
    }
    pthread_attr_destroy(&small);
}

// In single precision, adding 1 to the first value of `large` does not change it.
TEST(Stats, PopulationDeviationInBothPrecisions) {
    const double x[] = {2, 4, 4, 4, 5, 5, 7, 9};
    const float single[] = {2, 4, 4, 4, 5, 5, 7, 9}, large[] = {16777216, 1, 1};
    double mean = 0.0, std = 0.0;
    float single_mean = 0.0f, single_std = 0.0f;
    getMeanStd(x, 8, &mean, &std);
    getfloatMeanStd(single, 8, &single_mean, &single_std);
    EXPECT_TRUE(mean == 5.0 && std == 2.0 && single_mean == 5.0f && single_std == 2.0f);
    getfloatMeanStd(large, 3, &single_mean, &single_std);
    EXPECT_EQ(single_mean, 5592405.5f);
    getMeanStd(x, 0, &mean, &std);
    getfloatMeanStd(single, 0, &single_mean, &single_std);
    for (const double none : {mean, std, double{single_mean}, double{single_std}})
        EXPECT_TRUE(std::isnan(none));
}
