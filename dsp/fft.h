// The fast Fourier transform, unscaled, of double-precision data in separate real and imaginary
// arrays. Callers: beat/onset_envelope.h, for every analysis frame; dsp/dft.h.
#ifndef TAVO_DSP_FFT_H
#define TAVO_DSP_FFT_H

#include <cstddef>
#include <cstdint>

#include "common/lanes.h"

constexpr double kTwoPi = 6.283185307179586;
constexpr int32_t kMaxFftSize = 16384;  // the largest power of two in 16 bits

inline bool is_fft_size(int64_t n) {
    return n >= 2 && n <= kMaxFftSize && (n & (n - 1)) == 0;
}

// Tables for one size N, a power of two from 2 to 16384. Read-only after tavo_fft_init: one context
// can be shared by many threads.
struct TAVO_FFT_CTX {
    double *cos_table;      // [N] cos(2 pi k / N), the first N / 2 filled
    double *sin_table;      // [N] -sin(2 pi k / N), the first N / 2 filled
    uint32_t *bit_reverse;  // [N] the reversal of i where it is not below i, else 0
    int32_t stages;         // log2 N
};
static_assert(sizeof(void *) != 8 || offsetof(TAVO_FFT_CTX, stages) == 24);

extern "C" {

// Fills ctx, whatever it held before. If memory runs out, or n is not a power of two from 2 to
// 16384, all tables are null and stages is 0.
void tavo_fft_init(int16_t n, TAVO_FFT_CTX *ctx);

// Transforms re[n], im[n] in place; n as given to init. A context without tables changes nothing.
// Returns re.
double *tavo_fft_proc(double *re, double *im, int16_t n, const TAVO_FFT_CTX *ctx);

// Releases the tables; a second call does nothing.
void tavo_fft_deinit(TAVO_FFT_CTX *ctx);

// x with its lowest bits bits (1 to 31) reversed; 0 for any other bits.
uint32_t bit_reverse2(uint32_t bits, uint32_t x);
}

// Two transforms at once, bit-identical to tavo_fft_proc on each lane.
void transform_pair(double_pair *re, double_pair *im, int32_t n, const TAVO_FFT_CTX *ctx);

#endif
