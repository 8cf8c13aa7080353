// Discrete Fourier transforms of any size. Real and imaginary parts are in separate arrays. The
// forward transform is unscaled; the inverse divides by n. Used by beat/tempo.h for one excerpt.
#pragma once

#include <cstdint>

extern "C" {

// Replaces re[n] and im[n] with the transform of their first `m` values; the others count as zero.
// If real_input is not 0, `im` is not read. Returns 0, or TAVO_ERR_MEMORY with nothing changed.
int32_t tavo_dft(double *re, double *im, int64_t n, int64_t m, int32_t real_input);

// Replaces the first `m` values of re[n] and im[n] with those of the inverse transform and leaves
// the others unchanged. If real_input is not 0, the imaginary input is ignored. Returns 0, or
// TAVO_ERR_MEMORY with nothing changed.
int32_t tavo_inverse_dft(double *re, double *im, int64_t n, int64_t m, int32_t real_input);
}
