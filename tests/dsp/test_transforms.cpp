// Tests the FFT, the transforms of any size and the mel scale with known values. fuzz/toolkit.cpp
// uses random ones.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <random>
#include <utility>
#include <vector>

#include "dsp/dft.h"
#include "dsp/fft.h"
#include "dsp/mel.h"

namespace {

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
