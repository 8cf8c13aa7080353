// Tests dsp/ with known values. fuzz/toolkit.cpp uses random ones.
#include <gtest/gtest.h>
#include <pthread.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <random>
#include <utility>
#include <vector>

#include "dsp/dft.h"
#include "dsp/fft.h"
#include "dsp/mel.h"
#include "dsp/peaks.h"
#include "dsp/sort.h"
#include "dsp/stats.h"

namespace {

using indexes = std::vector<int32_t>;
using list = std::vector<double>;

constexpr double kInf = std::numeric_limits<double>::infinity();

// A plain FFT that computes one butterfly at a time, stage by stage.
void transform_by_stages(list &re, list &im, const TAVO_FFT_CTX &ctx) {
    const size_t size = re.size();
    for (size_t i = 0; i < size; ++i) {
        if (ctx.bit_reverse[i] == 0) continue;
        std::swap(re[i], re[ctx.bit_reverse[i]]);
        std::swap(im[i], im[ctx.bit_reverse[i]]);
    }
    for (size_t half = 1; half < size; half *= 2) {
        for (size_t top = 0; top < size; ++top) {
            if ((top & half) != 0) continue;
            const size_t bottom = top + half, k = top % half * (size / 2 / half);
            const double w_re = ctx.cos_table[k], w_im = ctx.sin_table[k];
            const double t_re = re[bottom] * w_re - im[bottom] * w_im;
            const double t_im = re[bottom] * w_im + im[bottom] * w_re;
            re[bottom] = re[top] - t_re;
            im[bottom] = im[top] - t_im;
            re[top] += t_re;
            im[top] += t_im;
        }
    }
}

}  // namespace

TEST(Fft, IsBitIdenticalToPlainStages) {
    std::mt19937 random(1);
    for (int16_t size = 2; size <= 8192; size = static_cast<int16_t>(size * 2)) {
        TAVO_FFT_CTX ctx;
        tavo_fft_init(size, &ctx);
        list re(static_cast<size_t>(size)), im(re.size());
        for (double &x : re) x = std::normal_distribution<double>()(random);
        for (double &x : im) x = std::normal_distribution<double>()(random);
        list expected_re = re, expected_im = im;
        EXPECT_EQ(tavo_fft_proc(re.data(), im.data(), size, &ctx), re.data());
        transform_by_stages(expected_re, expected_im, ctx);
        EXPECT_TRUE(re == expected_re && im == expected_im) << size;
        for (int i = 0; i < 2; ++i) tavo_fft_deinit(&ctx);  // the second call must do nothing
    }
}

TEST(Fft, RefusesSizesOtherThanPowersOfTwo) {
    for (const int size : {-32768, -4, 0, 1, 3, 12, 32767}) {
        const auto n = static_cast<int16_t>(size);
        TAVO_FFT_CTX ctx;
        tavo_fft_init(n, &ctx);
        EXPECT_TRUE(ctx.cos_table == nullptr && ctx.stages == 0) << n;
        double re[3] = {1, 2, 3}, im[3] = {4, 5, 6};
        EXPECT_EQ(tavo_fft_proc(re, im, n, &ctx), re);
        EXPECT_TRUE(re[1] == 2.0 && im[2] == 6.0);
    }
    EXPECT_EQ(bit_reverse2(1, 3), 1u);
    EXPECT_EQ(bit_reverse2(31, 1), 1u << 30);
    EXPECT_EQ(bit_reverse2(32, 5), 0u);
}

// The output for an infinite input is infinite too, with the sign of the cosine.
TEST(Dft, InfinityKeepsItsSign) {
    list re = {0, 0, 0, kInf, 0, 0, 0, 0}, im(8);
    tavo_dft(re.data(), im.data(), 8, 4, 1);
    EXPECT_TRUE(re[0] == kInf && re[1] == -kInf && re[3] == kInf && re[4] == -kInf);
}

TEST(Dft, RefusesLengthsOutsideTheRange) {
    list re = {1, 2}, im = {3, 4};
    for (const int64_t n : {int64_t{0}, int64_t{-1}, INT64_MIN}) {
        EXPECT_EQ(tavo_dft(re.data(), im.data(), n, n, 0), 0);
        EXPECT_EQ(tavo_inverse_dft(re.data(), im.data(), n, n, 0), 0);
    }
    EXPECT_EQ(tavo_inverse_dft(re.data(), im.data(), 2, -1, 0), 0);
    EXPECT_EQ(tavo_inverse_dft(re.data(), im.data(), INT64_MAX, 2, 0), -2);
    EXPECT_EQ(tavo_dft(re.data(), im.data(), INT64_MAX, INT64_MAX, 0), -2);
    EXPECT_TRUE(re == list({1, 2}) && im == list({3, 4}));
}

// The logarithm and the exponential are rounded to single precision.
TEST(Mel, ConvertsBothWays) {
    for (const auto &[hz, mel] : {std::pair{999.9f, 14.998492f},
                                  {1000.0f, 15.0f},
                                  {2333.0f, 27.3169632f},
                                  {2703.0f, 29.457243f}})
        EXPECT_EQ(Hz2Mel(hz), mel);
    for (const auto &[mel, hz] :
         {std::pair{7.5f, 500.00027f}, {15.0f, 1000.0f}, {17.85f, 1216.55334f}})
        EXPECT_EQ(Mel2Hz(mel), hz);
}

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
