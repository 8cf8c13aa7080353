#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <random>
#include <vector>

#include "dsp/fft.h"

namespace {

using List = std::vector<double>;

constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
constexpr double kTolerance = 1e-9;  // of the sum of the inputs' magnitudes

struct Case {
    int64_t n;
    int64_t m;
    int32_t real_input;
};

const Case kCases[] = {{1, 1, 0},  {2, 2, 1},   {8, 3, 1},    {8, 8, 0},     {12, 12, 0},
                       {13, 5, 1}, {64, 42, 1}, {100, 77, 0}, {1024, 86, 1}, {4096, 100, 0}};

List noise(size_t n, unsigned seed) {
    std::mt19937 random(seed);
    std::uniform_real_distribution<double> uniform(-1.0, 1.0);
    List list(n);
    for (double &x : list) x = uniform(random);
    return list;
}

double magnitude(const List &re, const List &im) {
    double sum = 0.0;
    for (double x : re) sum += fabs(x);
    for (double x : im) sum += fabs(x);
    return sum;
}

// sign -1: forward, +1: inverse without its division.
void sum_terms(const List &re, const List &im, int64_t k, double sign, double *out_re,
               double *out_im) {
    const double n = static_cast<double>(re.size());
    *out_re = 0.0;
    *out_im = 0.0;
    for (size_t i = 0; i < re.size(); i++) {
        const double theta =
            static_cast<double>(i) * 6.283185307179586 * static_cast<double>(k) / n;
        const double s = sign * sin(theta);
        *out_re += re[i] * cos(theta) - im[i] * s;
        *out_im += re[i] * s + im[i] * cos(theta);
    }
}

// What must not be read holds poison, which would show in the outputs.
void expect_forward_sums(double poison) {
    for (const Case &c : kCases) {
        const size_t n = static_cast<size_t>(c.n);
        List in_re = noise(n, 1);
        List in_im = noise(n, 2);
        List re = in_re;
        List im = in_im;
        for (size_t i = 0; i < n; i++) {
            const bool excluded = i >= static_cast<size_t>(c.m);
            if (excluded) re[i] = poison;
            if (excluded || c.real_input != 0) im[i] = poison;
            if (excluded) in_re[i] = 0.0;
            if (excluded || c.real_input != 0) in_im[i] = 0.0;
        }
        ASSERT_EQ(tavo_dft(re.data(), im.data(), c.n, c.m, c.real_input), 0);
        const double bound = kTolerance * magnitude(in_re, in_im);
        for (int64_t k = 0; k < c.n; k += 1 + c.n / 64) {
            double want_re;
            double want_im;
            sum_terms(in_re, in_im, k, -1.0, &want_re, &want_im);
            EXPECT_NEAR(re[static_cast<size_t>(k)], want_re, bound) << c.n << " " << k;
            EXPECT_NEAR(im[static_cast<size_t>(k)], want_im, bound) << c.n << " " << k;
        }
    }
}

TEST(Dft, ForwardIsTheSumOfTheFirstM) {
    expect_forward_sums(kNan);
    expect_forward_sums(1e6);
}

TEST(Dft, InverseIsTheMeanAndLeavesTheRest) {
    for (const Case &c : kCases) {
        const size_t n = static_cast<size_t>(c.n);
        const List in_re = noise(n, 3);
        List in_im = noise(n, 4);
        List re = in_re;
        List im = in_im;
        const List before = in_im;
        if (c.real_input != 0) in_im.assign(n, 0.0);
        ASSERT_EQ(tavo_inverse_dft(re.data(), im.data(), c.n, c.m, c.real_input), 0);
        const double bound = kTolerance * magnitude(in_re, in_im);
        for (int64_t t = 0; t < c.m; t++) {
            double want_re;
            double want_im;
            sum_terms(in_re, in_im, t, 1.0, &want_re, &want_im);
            EXPECT_NEAR(re[static_cast<size_t>(t)], want_re / static_cast<double>(n), bound);
            EXPECT_NEAR(im[static_cast<size_t>(t)], want_im / static_cast<double>(n), bound);
        }
        for (size_t t = static_cast<size_t>(c.m); t < n; t++) {
            EXPECT_EQ(re[t], in_re[t]) << c.n << " " << t;
            EXPECT_EQ(im[t], before[t]) << c.n << " " << t;
        }
    }
}

TEST(Dft, InverseOfTheFirstLineIsOne) {
    List re = {8, 0, 0, 0, 0, 0, 0, 0};
    List im(8, kNan);
    ASSERT_EQ(tavo_inverse_dft(re.data(), im.data(), 8, 3, 1), 0);
    EXPECT_EQ(re, (List{1, 1, 1, 0, 0, 0, 0, 0}));
    for (size_t t = 0; t < 3; t++) EXPECT_EQ(im[t], 0.0);
    EXPECT_TRUE(std::isnan(im[3]));
}

TEST(Dft, ForwardThenInverseGivesTheInput) {
    for (size_t n : {16u, 24u}) {
        const List in_re = noise(n, 5);
        const List in_im = noise(n, 6);
        List re = in_re;
        List im = in_im;
        const int64_t size = static_cast<int64_t>(n);
        tavo_dft(re.data(), im.data(), size, size, 0);
        tavo_inverse_dft(re.data(), im.data(), size, size, 0);
        for (size_t i = 0; i < n; i++) {
            EXPECT_NEAR(re[i], in_re[i], 1e-12);
            EXPECT_NEAR(im[i], in_im[i], 1e-12);
        }
    }
}

TEST(Dft, AnInfiniteValueKeepsItsSign) {
    const double kInf = std::numeric_limits<double>::infinity();
    List re = {0, 0, 0, kInf, 0, 0, 0, 0};
    List im(8, 0.0);
    tavo_dft(re.data(), im.data(), 8, 4, 1);
    EXPECT_EQ(re[0], kInf);
    EXPECT_EQ(re[1], -kInf);
    EXPECT_EQ(re[3], kInf);
    EXPECT_EQ(re[4], -kInf);
}

TEST(Dft, LengthsOutsideTheRange) {
    List re = {1, 2};
    List im = {3, 4};
    for (int64_t n : {int64_t{0}, int64_t{-1}, INT64_MIN}) {
        EXPECT_EQ(tavo_dft(re.data(), im.data(), n, n, 0), 0);
        EXPECT_EQ(tavo_inverse_dft(re.data(), im.data(), n, n, 0), 0);
    }
    EXPECT_EQ(tavo_inverse_dft(re.data(), im.data(), 2, -1, 0), 0);
    EXPECT_EQ(tavo_inverse_dft(re.data(), im.data(), INT64_MAX, 2, 0), -2);
    EXPECT_EQ(re, (List{1, 2}));
    EXPECT_EQ(im, (List{3, 4}));
    EXPECT_EQ(tavo_dft(re.data(), im.data(), 2, 99, 0), 0);  // as with all 2 values
    EXPECT_NEAR(re[0], 3.0, 1e-15);
    EXPECT_NEAR(im[1], -1.0, 1e-15);
    EXPECT_EQ(tavo_dft(re.data(), im.data(), 2, -5, 0), 0);  // as with none
    EXPECT_EQ(re, (List{0, 0}));
    EXPECT_EQ(im, (List{0, 0}));
}

}  // namespace
