#include "dsp/matrix.h"

namespace {

// Adds the row, multiplied by `weight`, to out[cols]. Skips zeros in the row.
void add_row(double weight, const float *row, int32_t cols, double *out) {
    for (int32_t j = 0; j < cols; ++j) {
        if (row[j] != 0.0f) out[j] += weight * static_cast<double>(row[j]);
    }
}

}  // namespace

int32_t MultiplyMtxs(int32_t rows, int32_t cols, int32_t inner, const float *const *a,
                     const float *const *b, double *const *d) {
    for (int32_t i = 0; i < rows; ++i) {
        for (int32_t j = 0; j < cols; ++j) d[i][j] = 0.0;
        for (int32_t k = 0; k < inner && cols > 0; ++k) {
            if (a[i][k] != 0.0f) add_row(static_cast<double>(a[i][k]), b[k], cols, d[i]);
        }
    }
    return rows;
}
