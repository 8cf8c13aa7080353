// Fourier transforms of any size in separate real and imaginary arrays. The forward transform is
// unscaled, the inverse divides by N. Caller: beat/tempo.h, for one excerpt.
#ifndef TAVO_DSP_DFT_H
#define TAVO_DSP_DFT_H

#include <cstdint>

extern "C" {

// re[n], im[n] become the transform of the first m values, the rest taken as zero. With real_input
// the imaginary input is ignored. Returns 0; TAVO_ERR_MEMORY, nothing changed.
int32_t tavo_dft(double *re, double *im, int64_t n, int64_t m, int32_t real_input);

// The first m outputs of the inverse transform of re[n], im[n], in place; entries from m on stay as
// they were. With real_input the imaginary input is ignored. Returns 0; TAVO_ERR_MEMORY, nothing
// changed.
int32_t tavo_inverse_dft(double *re, double *im, int64_t n, int64_t m, int32_t real_input);
}

#endif
