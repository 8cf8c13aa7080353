#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <random>
#include <vector>

#include "dsp/fft.h"

namespace {

using List = std::vector<double>;

void transform(List *re, List *im) {
    TAVO_FFT_CTX ctx;
    const int16_t n = static_cast<int16_t>(re->size());
    tavo_fft_init(n, &ctx);
    ASSERT_EQ(tavo_fft_proc(re->data(), im->data(), n, &ctx), re->data());
    tavo_fft_deinit(&ctx);
}

TEST(Fft, ImpulseIsFlat) {
    List re = {1, 0, 0, 0, 0, 0, 0, 0};
    List im(8, 0.0);
    transform(&re, &im);
    EXPECT_EQ(re, List(8, 1.0));
    EXPECT_EQ(im, List(8, 0.0));
}

TEST(Fft, EverySizeAgreesWithTheSums) {
    std::mt19937 random(1);
    std::uniform_real_distribution<double> uniform(-1.0, 1.0);
    for (size_t n = 2; n <= 1024; n *= 2) {
        List re(n);
        List im(n);
        for (double &x : re) x = uniform(random);
        for (double &x : im) x = uniform(random);
        const List x_re = re;
        const List x_im = im;
        transform(&re, &im);
        const size_t step = n > 74 ? 37 : 1;
        for (size_t k = 0; k < n; k += step) {
            std::complex<double> sum = 0.0;
            for (size_t i = 0; i < n; i++) {
                const double turns = static_cast<double>(i * k % n) / static_cast<double>(n);
                sum += std::complex(x_re[i], x_im[i]) * std::polar(1.0, -2.0 * M_PI * turns);
            }
            EXPECT_NEAR(re[k], sum.real(), 1e-11) << n << " " << k;
            EXPECT_NEAR(im[k], sum.imag(), 1e-11) << n << " " << k;
        }
    }
}

TEST(Fft, TablesListEveryPairOnce) {
    TAVO_FFT_CTX ctx;
    tavo_fft_init(8, &ctx);
    EXPECT_EQ(ctx.stages, 3);
    const std::vector<uint32_t> listed(ctx.bit_reverse, ctx.bit_reverse + 8);
    EXPECT_EQ(listed, (std::vector<uint32_t>{0, 4, 2, 6, 0, 5, 0, 7}));
    EXPECT_EQ(ctx.cos_table[0], 1.0);
    EXPECT_DOUBLE_EQ(ctx.cos_table[1], std::sqrt(0.5));
    EXPECT_DOUBLE_EQ(ctx.sin_table[1], -std::sqrt(0.5));
    EXPECT_EQ(ctx.sin_table[2], -1.0);
    for (int k = 4; k < 8; k++) {
        EXPECT_EQ(ctx.cos_table[k], 0.0);
        EXPECT_EQ(ctx.sin_table[k], 0.0);
    }
    tavo_fft_deinit(&ctx);
    tavo_fft_deinit(&ctx);
    EXPECT_TRUE(ctx.cos_table == nullptr && ctx.sin_table == nullptr);
    EXPECT_EQ(ctx.bit_reverse, nullptr);
}

TEST(Fft, RefusesSizesThatAreNoPowerOfTwo) {
    for (int n_wide : {-32768, -4, 0, 1, 3, 12, 32767}) {
        const int16_t n = static_cast<int16_t>(n_wide);
        TAVO_FFT_CTX ctx;
        tavo_fft_init(n, &ctx);
        EXPECT_EQ(ctx.cos_table, nullptr) << n;
        EXPECT_EQ(ctx.stages, 0) << n;
        double re[3] = {1, 2, 3};
        double im[3] = {4, 5, 6};
        EXPECT_EQ(tavo_fft_proc(re, im, n, &ctx), re);
        EXPECT_EQ(re[1], 2.0);
        EXPECT_EQ(im[2], 6.0);
    }
}

TEST(Fft, BitReverse) {
    EXPECT_EQ(bit_reverse2(3, 1), 4u);
    EXPECT_EQ(bit_reverse2(3, 6), 3u);
    EXPECT_EQ(bit_reverse2(1, 3), 1u);
    EXPECT_EQ(bit_reverse2(1, 2), 0u);
    EXPECT_EQ(bit_reverse2(31, 1), 1u << 30);
    EXPECT_EQ(bit_reverse2(0, 5), 0u);
    EXPECT_EQ(bit_reverse2(32, 5), 0u);
}

}  // namespace
