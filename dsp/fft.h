// Fourier transforms of double-precision data in separate real and imaginary arrays. The forward
// transforms are unscaled, the inverse divides by N. Callers: beat/onset_envelope.h (the FFT of
// every frame), beat/tempo.h (the direct transforms of one excerpt).
#ifndef TAVO_DSP_FFT_H
#define TAVO_DSP_FFT_H

#include <cstddef>
#include <cstdint>

// Tables for one size N, a power of two from 2 to 16384. Read-only after tavo_fft_init: one context
// can be shared by many threads.
struct TAVO_FFT_CTX {
    double *cos_table;      // [N] cos(2 pi k / N), the first N / 2 filled
    double *sin_table;      // [N] -sin(2 pi k / N), the first N / 2 filled
    uint32_t *bit_reverse;  // [N] the reversal of i where it is not below i, else 0
    int32_t stages;         // log2 N
};
static_assert(offsetof(TAVO_FFT_CTX, stages) == 24);

extern "C" {

// Fills ctx whatever it held before. When memory runs out, or n is no power of two from 2 to 16384,
// all tables are null and stages is 0.
void tavo_fft_init(int16_t n, TAVO_FFT_CTX *ctx);

// Transforms re[n], im[n] in place; n as given to init. A context without tables changes nothing.
// Returns re.
double *tavo_fft_proc(double *re, double *im, int16_t n, const TAVO_FFT_CTX *ctx);

// Releases the tables; a second call does nothing.
void tavo_fft_deinit(TAVO_FFT_CTX *ctx);

// re[n], im[n] become the transform of the first m values, the rest taken as zero. With real_input
// the imaginary input is ignored. Returns 0; -2 out of memory, nothing changed.
int32_t tavo_dft(double *re, double *im, int64_t n, int64_t m, int32_t real_input);

// The first m outputs of the inverse transform of re[n], im[n], in place; entries from m on stay as
// they were. With real_input the imaginary input is ignored. Returns 0; -2 out of memory, nothing
// changed.
int32_t tavo_inverse_dft(double *re, double *im, int64_t n, int64_t m, int32_t real_input);

// x with its lowest bits bits (1 to 31) reversed; 0 for any other bits.
uint32_t bit_reverse2(uint32_t bits, uint32_t x);
}

#endif
