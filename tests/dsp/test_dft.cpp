#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <limits>
#include <random>
#include <vector>

#include "dsp/fft.h"

namespace {

using List = std::vector<double>;
using Complex = std::complex<double>;

constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();

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

// sign -1: forward, +1: inverse without its division.
Complex sum_of_terms(const List &re, const List &im, size_t k, double sign) {
    const double step = sign * 2.0 * M_PI / static_cast<double>(re.size());
    Complex sum = 0.0;
    for (size_t i = 0; i < re.size(); i++) {
        sum += Complex(re[i], im[i]) * std::polar(1.0, step * static_cast<double>(i * k));
    }
    return sum;
}

// Within a billionth of the values' number, none of which exceeds 1.
void expect_near(double re, double im, Complex want, const Case &of, size_t k) {
    const double bound = 1e-9 * static_cast<double>(of.n);
    EXPECT_NEAR(re, want.real(), bound) << of.n << " " << k;
    EXPECT_NEAR(im, want.imag(), bound) << of.n << " " << k;
}

// What must not be read holds poison, which would show in the outputs.
TEST(Dft, ForwardIsTheSumOfTheFirstM) {
    for (const double poison : {kNan, 1e6}) {
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
            for (size_t k = 0; k < n; k += 1 + n / 64) {
                expect_near(re[k], im[k], sum_of_terms(in_re, in_im, k, -1.0), c, k);
            }
        }
    }
}

TEST(Dft, InverseIsTheMeanAndLeavesTheRest) {
    for (const Case &c : kCases) {
        const size_t n = static_cast<size_t>(c.n);
        const List in_re = noise(n, 3);
        const List in_im = noise(n, 4);
        const List read_im = c.real_input != 0 ? List(n) : in_im;
        List re = in_re;
        List im = in_im;
        ASSERT_EQ(tavo_inverse_dft(re.data(), im.data(), c.n, c.m, c.real_input), 0);
        for (size_t t = 0; t < n; t++) {
            if (t < static_cast<size_t>(c.m)) {
                const Complex sum = sum_of_terms(in_re, read_im, t, 1.0);
                expect_near(re[t], im[t], sum / static_cast<double>(n), c, t);
            } else {
                EXPECT_EQ(re[t], in_re[t]) << c.n << " " << t;
                EXPECT_EQ(im[t], in_im[t]) << c.n << " " << t;
            }
        }
    }
}

TEST(Dft, AnInfiniteValueKeepsItsSign) {
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
