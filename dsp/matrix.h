// Product of two matrices of row pointers. Caller: beat/onset_envelope.h, spectra times mel bands.
#ifndef TAVO_DSP_MATRIX_H
#define TAVO_DSP_MATRIX_H

#include <cstdint>

extern "C" {

// d[rows][cols] = a[rows][inner] x b[inner][cols]. Sums in double, in the order of inner. Terms
// with a zero factor are skipped; where a[i][k] is zero, row k of b is not read. Returns rows.
int32_t MultiplyMtxs(int32_t rows, int32_t cols, int32_t inner, const float *const *a,
                     const float *const *b, double *const *d);
}

#endif
