#include <gtest/gtest.h>

#include <limits>
#include <random>
#include <vector>

#include "dsp/matrix.h"

namespace {

template <typename Value>
struct Matrix {
    std::vector<Value> values;
    std::vector<Value *> rows;

    Matrix(size_t row_count, size_t cols, Value fill)
        : values(row_count * cols, fill), rows(row_count) {
        for (size_t i = 0; i < row_count; i++) rows[i] = values.data() + i * cols;
    }
};

TEST(Matrix, ZeroWeightsAndZeroTermsTouchNothing) {
    const float kInf = std::numeric_limits<float>::infinity();
    float a0[3] = {0.0f, 2.0f, kInf};
    float b1[2] = {1.0f, kInf};
    float b2[2] = {0.0f, 1.0f};
    const float *a[] = {a0};
    const float *b[] = {nullptr, b1, b2};  // no row where the weight is zero
    double d0[2];
    double *d[] = {d0};
    EXPECT_EQ(MultiplyMtxs(1, 2, 3, a, b, d), 1);
    EXPECT_EQ(d0[0], 2.0);
    EXPECT_EQ(d0[1], std::numeric_limits<double>::infinity());
}

TEST(Matrix, EmptyShapes) {
    double d0[2] = {7.0, 7.0};
    double *d[] = {d0};
    EXPECT_EQ(MultiplyMtxs(1, 0, 3, nullptr, nullptr, d), 1);
    EXPECT_EQ(MultiplyMtxs(0, 2, 3, nullptr, nullptr, d), 0);
    EXPECT_EQ(d0[0], 7.0);
    EXPECT_EQ(MultiplyMtxs(1, 2, 0, nullptr, nullptr, d), 1);
    EXPECT_TRUE(d0[0] == 0.0 && d0[1] == 0.0);
}

// A spectrum times overlapping bands, with some zeros inside the bands.
TEST(Matrix, BandsAgreeWithTheSumInOrder) {
    constexpr size_t kRows = 5;
    constexpr size_t kCols = 36;
    constexpr size_t kInner = 64;
    std::mt19937 random(9);
    std::uniform_real_distribution<float> uniform(0.0f, 1e6f);
    Matrix<float> a(kRows, kInner, 0.0f);
    Matrix<float> b(kInner, kCols, 0.0f);
    Matrix<double> d(kRows, kCols, -1.0);
    for (float &x : a.values) x = random() % 4 == 0 ? 0.0f : uniform(random);
    for (size_t k = 0; k < kInner; k++) {
        for (size_t j = k / 2; j < kCols && j < k / 2 + 4; j++) {
            b.rows[k][j] = random() % 5 == 0 ? 0.0f : uniform(random);
        }
    }
    ASSERT_EQ(MultiplyMtxs(kRows, kCols, kInner, a.rows.data(), b.rows.data(), d.rows.data()),
              int{kRows});
    for (size_t i = 0; i < kRows; i++) {
        for (size_t j = 0; j < kCols; j++) {
            double sum = 0.0;
            for (size_t k = 0; k < kInner; k++) {
                sum += static_cast<double>(a.rows[i][k]) * static_cast<double>(b.rows[k][j]);
            }
            EXPECT_EQ(d.rows[i][j], sum) << i << " " << j;
        }
    }
}

}  // namespace
