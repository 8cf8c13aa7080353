// Matrix product over row pointers. Caller: beat/onset_envelope.h, spectra times mel bands.
#ifndef TAVO_DSP_MATRIX_H
#define TAVO_DSP_MATRIX_H

#include <cstdint>

extern "C" {

// d[rows][cols] = a[rows][inner] x b[inner][cols], summed in double in order of inner; terms with a
// zero factor are skipped, and no row of b whose weight in a is zero is read. Returns rows.
int32_t MultiplyMtxs(int32_t rows, int32_t cols, int32_t inner, const float *const *a,
                     const float *const *b, double *const *d);
}

#endif
