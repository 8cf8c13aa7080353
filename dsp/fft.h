// Unscaled fast Fourier transform of doubles. Real and imaginary parts are in separate arrays. Used
// by beat/onset_envelope.h for every analysis frame, and by dsp/dft.h.
#pragma once

#include <cstddef>
#include <cstdint>

#include "common/lanes.h"

constexpr double kTwoPi = 6.283185307179586;
constexpr int32_t kMaxFftSize = 16384;  // the largest power of two that fits an int16_t

inline bool is_fft_size(int64_t n) {
    return n >= 2 && n <= kMaxFftSize && (n & (n - 1)) == 0;
}

// Tables for one size N, a power of two from 2 to 16384. tavo_fft_init fills them; afterwards they
// are read-only, so threads may share one context.
struct TAVO_FFT_CTX {
    double *cos_table;      // [N] cos(2 pi k / N) in the first N / 2 entries
    double *sin_table;      // [N] -sin(2 pi k / N) in the first N / 2 entries
    uint32_t *bit_reverse;  // [N] entry i: bit reversal of i if that is at least i, else 0
    int32_t stages;         // log2 N
};
static_assert(sizeof(void *) != 8 || offsetof(TAVO_FFT_CTX, stages) == 24);

extern "C" {

// Fills `ctx`, which may be uninitialised. If memory runs out or `n` is not a power of two from 2
// to 16384, all tables are null and stages is 0.
void tavo_fft_init(int16_t n, TAVO_FFT_CTX *ctx);

// Transforms re[n] and im[n] in place. `n` is the size passed to tavo_fft_init. Does nothing if the
// tables are missing. Returns `re`.
double *tavo_fft_proc(double *re, double *im, int16_t n, const TAVO_FFT_CTX *ctx);

// Releases the tables; a second call does nothing.
void tavo_fft_deinit(TAVO_FFT_CTX *ctx);

// Returns the lowest `bits` bits of `x` in reverse order, or 0 if `bits` is not between 1 and 31.
uint32_t bit_reverse2(uint32_t bits, uint32_t x);
}

// Two real analysis frames to be transformed side by side, and the window that weights both.
struct frame_pair {
    const double *first;   // [n]
    const double *second;  // [n]
    const double *window;  // [n]
};

// Fills powers[n / 2] with the powers of the lower n / 2 bins of two windowed frames. Each power is
// rounded to single precision. It is bit-identical to the power computed by transforming its frame
// alone with tavo_fft_proc. `n` is the size passed to tavo_fft_init. scratch[2 * n] is overwritten.
void compute_frame_powers(const frame_pair &frames, int32_t n, const TAVO_FFT_CTX *ctx,
                          double_pair *scratch, double_pair *powers);
