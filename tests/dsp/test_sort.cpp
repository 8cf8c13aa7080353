#include <gtest/gtest.h>
#include <pthread.h>

#include <algorithm>
#include <random>
#include <vector>

#include "dsp/peaks.h"
#include "dsp/sort.h"

namespace {

using List = std::vector<double>;

template <typename Value>
int order(int (*compare)(const void *, const void *), Value a, Value b) {
    return compare(&a, &b);
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
    EXPECT_EQ(order(compare_peak, PEAK_INFO{1.0, 9}, PEAK_INFO{2.0, 0}), 1);
    EXPECT_EQ(order(compare_peak, PEAK_INFO{1.0, 0}, PEAK_INFO{1.0, 9}), 1);
    EXPECT_EQ(order(compare_peak_f, PEAK_INFO_F{2.0f, 0}, PEAK_INFO_F{1.0f, 9}), -1);
    EXPECT_EQ(order(compare_peak_f, PEAK_INFO_F{1.0f, 0}, PEAK_INFO_F{1.0f, 9}), 1);
}

TEST(Sort, PartitionPutsTheFirstElementInPlace) {
    List a = {3, 1, 4, 1, 5};
    EXPECT_EQ(partition(0, 4, a.data()), 2);
    EXPECT_EQ(a, (List{1, 1, 3, 4, 5}));
    a = {9, 5, 7, 6, 0};
    EXPECT_EQ(partition(1, 3, a.data()), 1);
    EXPECT_EQ(a, (List{9, 5, 7, 6, 0}));
    a = {2, 2, 2};
    EXPECT_EQ(partition(0, 2, a.data()), 2);
}

TEST(Sort, QuickSortSortsTheRangeAlone) {
    std::mt19937 random(3);
    for (int round = 0; round < 200; round++) {
        List a(random() % 300 + 2);
        for (double &x : a) x = static_cast<double>(random() % (round % 2 == 0 ? 5 : 100000));
        List want = a;
        std::sort(want.begin() + 1, want.end() - 1);
        quickSort(1, static_cast<int32_t>(a.size()) - 2, a.data());
        EXPECT_EQ(a, want);
    }
    List one = {1, 0};
    quickSort(1, 0, one.data());
    quickSort(0, -1, one.data());
    EXPECT_EQ(one, (List{1, 0}));
}

// Equal and falling values split off one element at a time.
void *sort_on_a_small_stack(void *argument) {
    List *a = static_cast<List *>(argument);
    quickSort(0, static_cast<int32_t>(a->size()) - 1, a->data());
    return nullptr;
}

TEST(Sort, DepthStaysSmallOnTheWorstInput) {
    pthread_attr_t small;
    pthread_attr_init(&small);
    ASSERT_EQ(pthread_attr_setstacksize(&small, 128 * 1024), 0);
    for (double step : {0.0, -1.0, 1.0}) {
        List a(20000);
        for (size_t i = 0; i < a.size(); i++) a[i] = step * static_cast<double>(i);
        pthread_t thread;
        ASSERT_EQ(pthread_create(&thread, &small, sort_on_a_small_stack, &a), 0);
        pthread_join(thread, nullptr);
        EXPECT_TRUE(std::is_sorted(a.begin(), a.end()));
    }
    pthread_attr_destroy(&small);
}

TEST(Sort, SwapExchangesEightBytes) {
    int64_t a[2] = {1, 2};
    int64_t b[2] = {3, 4};
    swap(a, b);
    swap(a, a);
    EXPECT_TRUE(a[0] == 3 && b[0] == 1);
    EXPECT_TRUE(a[1] == 2 && b[1] == 4);
}

}  // namespace
