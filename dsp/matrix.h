// Multiplies matrices stored as row pointers. For direct callers; the library does not use it.
#pragma once

#include <cstdint>

extern "C" {

// Stores the product of a[rows][inner] and b[inner][cols] in d[rows][cols]. Adds the terms in
// double precision and in ascending order of the inner index. Terms with a zero factor are skipped;
// where a[i][k] is zero, row k of `b` is not read. Returns `rows`.
int32_t MultiplyMtxs(int32_t rows, int32_t cols, int32_t inner, const float *const *a,
                     const float *const *b, double *const *d);
}
