// Peaks, searches, sorts and statistics on lists known by hand; random ones go through
// fuzz/toolkit.cpp.
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

const list kThree = {0, 4, 0, 9, 0, 7, 0};  // peaks 1, 3, 5

indexes largest(const list &values, uint32_t min_dist, uint32_t max_count) {
    const std::vector<float> x(values.begin(), values.end());
    std::vector<uint32_t> out(x.size() / 2 + 1);
    const int32_t n =
        findsortedNPeaks(x.data(), static_cast<int64_t>(x.size()), min_dist, max_count, out.data());
    return {out.begin(), out.begin() + n};
}

indexes spaced(const list &x, uint32_t min_dist) {
    indexes out(x.size() / 2 + 1);
    const int32_t n = findPeaks(x.data(), static_cast<int64_t>(x.size()), min_dist, out.data());
    return {out.begin(), out.begin() + n};
}

indexes with_priority(const list &x, int32_t min_dist, const indexes &priority) {
    indexes out(x.size() / 2 + 1 + priority.size());
    const int32_t n = findPeaksPriority(x.data(), static_cast<int64_t>(x.size()), min_dist,
                                        out.data(), priority.empty() ? nullptr : priority.data(),
                                        static_cast<int32_t>(priority.size()));
    return {out.begin(), out.begin() + n};
}

template <typename Value>
int order(int (*compare)(const void *, const void *), Value a, Value b) {
    return compare(&a, &b);
}

}  // namespace

TEST(Peaks, ByDistance) {
    const struct {
        list x;
        uint32_t min_dist;
        indexes expected;
    } cases[] = {{{1, 3, 3, 1}, 0, {}},
                 {{}, 0, {}},
                 {kThree, 0, {1, 3, 5}},
                 {kThree, 2, {3, 5, 1}},  // the range is open
                 {kThree, 3, {3}},
                 {kThree, UINT32_MAX, {3}},
                 // 9 at 3 suppresses 8 at 5, which therefore leaves 7 at 7.
                 {{0, 0, 0, 9, 0, 8, 0, 7, 0}, 3, {3, 7}}};
    for (const auto &c : cases) EXPECT_EQ(spaced(c.x, c.min_dist), c.expected) << c.min_dist;
}

TEST(Peaks, LargestFirstUpToACount) {
    const struct {
        list x;
        uint32_t min_dist, max_count;
        indexes expected;
    } cases[] = {{kThree, 0, 2, {3, 5}},       {kThree, 0, 10, {3, 5, 1}},
                 {kThree, 0, 0, {3, 5, 1}},    {kThree, 2, 0, {3}},  // the range is closed
                 {kThree, UINT32_MAX, 0, {3}}, {{0, 4, 0, 9, 0, 7, 0, 0, 3, 0}, 2, 2, {3, 8}}};
    for (const auto &c : cases) {
        EXPECT_EQ(largest(c.x, c.min_dist, c.max_count), c.expected) << c.min_dist;
    }
    EXPECT_EQ(findsortedNPeaks(nullptr, -5, 1, 0, nullptr), 0);
}

TEST(Peaks, PriorityCandidatesComeFirst) {
    const struct {
        int32_t min_dist;
        indexes priority, expected;
    } cases[] = {{3, {2}, {1, 5}},
                 {3, {5}, {3}},           // the last peak: nothing
                 {3, {0, 1}, {1, 1, 5}},  // taken twice
                 {1, {4, 0}, {3, 1, 5}},  // in the order given
                 {3, {99, 0}, {1, 5}},    // packed
                 {3, {1, 3}, {1, 3}},     // too close, yet both kept
                 {3, {}, {3}}};
    for (const auto &c : cases)
        EXPECT_EQ(with_priority(kThree, c.min_dist, c.priority), c.expected);
    int32_t untouched = -7;
    EXPECT_EQ(findPeaksPriority(kThree.data(), 7, 0, &untouched, nullptr, 0), -1);
    EXPECT_EQ(untouched, -7);
}

// A long recording's worth: striking in pairs would take the test's whole time limit.
TEST(Peaks, AQuarterOfAMillionPeaks) {
    list x(500001);
    for (size_t i = 1; i < x.size(); i += 2) x[i] = 1.0 + static_cast<double>(i * 7919 % 500000);
    EXPECT_EQ(spaced(x, 2).size(), 250000u);
    const indexes out = with_priority(x, 200000, indexes(100000, 250000));
    EXPECT_EQ(std::count(out.begin(), out.end(), 249999), 100000);
}

TEST(Peaks, Searches) {
    const indexes ascending = {10, 20, 30};
    const struct {
        int32_t target, n, expected;
    } cases[] = {{100, 3, 2}, {100, 2, 1}, {100, 1, 0}, {100, 0, 0},
                 {15, 3, 0},  {16, 3, 1},  {-5, 3, 0}};  // equally near: the lower
    for (const auto &c : cases) {
        EXPECT_EQ(findNearestIndex(ascending.data(), c.target, c.n), c.expected) << c.target;
    }
    const list x = {3, 1, 4, 1};
    EXPECT_EQ(findIndex(x.data(), 4, 1.0), 1);
    EXPECT_EQ(findIndex(x.data(), 4, 9.0), 0);
    EXPECT_EQ(findIndex(x.data(), 2, 4.0), 0);
}

TEST(Sort, ComparatorsNeverReportEquality) {
    EXPECT_EQ(order(compare_value, 2.0, 1.0), 1);
    EXPECT_EQ(order(compare_value, 1.0, 2.0), -1);
    EXPECT_EQ(order(compare_value, 1.0, 1.0), -1);
    EXPECT_EQ(order(compare_fvalue, 2.0f, 1.0f), 1);
    EXPECT_EQ(order(compare_fvalue, 1.0f, 1.0f), -1);
    EXPECT_EQ(order(compare_ivalue, 1, -2), 1);
    EXPECT_EQ(order(compare_ivalue, INT32_MIN, INT32_MAX), -1);
    EXPECT_EQ(order(compare_ivalue, 7, 7), -1);
    EXPECT_EQ(order(compare_peak, PEAK_INFO{2.0, 0}, PEAK_INFO{1.0, 9}), -1);
    EXPECT_EQ(order(compare_peak, PEAK_INFO{1.0, 0}, PEAK_INFO{1.0, 9}), 1);
    EXPECT_EQ(order(compare_peak_f, PEAK_INFO_F{2.0f, 0}, PEAK_INFO_F{1.0f, 9}), -1);
    EXPECT_EQ(order(compare_peak_f, PEAK_INFO_F{1.0f, 0}, PEAK_INFO_F{1.0f, 9}), 1);
}

TEST(Sort, RangesAndPivots) {
    list a = {9, 5, 7, 6, 0};
    EXPECT_EQ(partition(1, 3, a.data()), 1);
    quickSort(1, 3, a.data());
    quickSort(1, 0, a.data());
    swap(&a[0], &a[4]);
    swap(&a[1], &a[1]);
    EXPECT_EQ(a, (list{0, 5, 6, 7, 9}));
}

// Equal, falling and rising values split off one element at a time.
TEST(Sort, DepthStaysSmallOnTheWorstInput) {
    pthread_attr_t small;
    pthread_attr_init(&small);
    ASSERT_EQ(pthread_attr_setstacksize(&small, 128 * 1024), 0);
    for (const double step : {0.0, -1.0, 1.0}) {
        list a(20000);
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

// Above 2^24 a float no longer counts by ones, and near 5.6 million its step is 0.5.
TEST(Stats, PopulationDeviationInBothPrecisions) {
    const struct {
        list x;
        double mean, std, single_mean;
    } cases[] = {{{2, 4, 4, 4, 5, 5, 7, 9}, 5.0, 2.0, 5.0},
                 {{4, 4, 4}, 4.0, 0.0, 4.0},
                 {{16777216, 1, 1}, 5592406.0, NAN, 5592405.5},
                 {{}, NAN, NAN, NAN}};
    for (const auto &c : cases) {
        const std::vector<float> single(c.x.begin(), c.x.end());
        const auto n = static_cast<int64_t>(c.x.size());
        double mean = 0.0, std = 0.0;
        float single_mean = 0.0f, single_std = 0.0f;
        getMeanStd(c.x.data(), n, &mean, &std);
        getfloatMeanStd(single.data(), n, &single_mean, &single_std);
        EXPECT_TRUE(mean == c.mean || (n == 0 && std::isnan(mean)));
        EXPECT_TRUE(static_cast<double>(single_mean) == c.single_mean ||
                    (n == 0 && std::isnan(single_mean)));
        EXPECT_TRUE(std::isnan(c.std) ||
                    (std == c.std && static_cast<double>(single_std) == c.std));
        EXPECT_EQ(std::isnan(std), n == 0);
    }
}
