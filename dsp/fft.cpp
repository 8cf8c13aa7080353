#include "dsp/fft.h"

#include <cmath>
#include <cstdlib>
#include <utility>

namespace {

constexpr uint32_t kMaxReverseBits = 31;  // at 32 the mask would never empty

int32_t halvings(int32_t n) {
    int32_t count = 0;
    for (; n > 1; n /= 2) ++count;
    return count;
}

void fill_twiddles(TAVO_FFT_CTX *ctx, int32_t n) {
    for (int32_t k = 0; k < n / 2; ++k) {
        const double angle = k * kTwoPi / n;
        ctx->cos_table[k] = cos(angle);
        ctx->sin_table[k] = -sin(angle);
    }
}

// Each swap is listed once, at its lower index; all other entries are 0.
void fill_bit_reverse(TAVO_FFT_CTX *ctx, int32_t n) {
    const auto bits = static_cast<uint32_t>(ctx->stages);
    for (uint32_t i = 0; i < static_cast<uint32_t>(n); ++i) {
        const uint32_t reversed = bit_reverse2(bits, i);
        ctx->bit_reverse[i] = reversed >= i ? reversed : 0;
    }
}

template <typename T>
void permute(T *re, T *im, int32_t n, const uint32_t *bit_reverse) {
    for (int32_t i = 0; i < n; ++i) {
        const uint32_t r = bit_reverse[i];
        if (r == 0) continue;
        std::swap(re[i], re[r]);
        std::swap(im[i], im[r]);
    }
}

template <typename T>
inline void butterfly(T *re, T *im, size_t top, size_t bottom, double w_re, double w_im) {
    const T t_re = re[bottom] * w_re - im[bottom] * w_im;
    const T t_im = re[bottom] * w_im + im[bottom] * w_re;
    const T top_re = re[top];
    const T top_im = im[top];
    re[bottom] = top_re - t_re;
    im[bottom] = top_im - t_im;
    re[top] = top_re + t_re;
    im[top] = top_im + t_im;
}

// Radix 2, decimation in time. T is double, or double_pair for two transforms in one pass. The
// butterflies of a stage are independent: the longer of its two loops is the inner one.
template <typename T>
void transform(T *re, T *im, int32_t n, const TAVO_FFT_CTX *ctx) {
    if (ctx->cos_table == nullptr || n != 1 << ctx->stages) return;
    permute(re, im, n, ctx->bit_reverse);
    const double *w_re = ctx->cos_table;
    const double *w_im = ctx->sin_table;
    const auto size = static_cast<size_t>(n);
    for (size_t half = 1; half < size; half *= 2) {
        const size_t stride = size / 2 / half;
        if (half < stride) {
            for (size_t j = 0; j < half; ++j) {
                const double j_re = w_re[j * stride];
                const double j_im = w_im[j * stride];
                for (size_t top = j; top < size; top += 2 * half) {
                    butterfly(re, im, top, top + half, j_re, j_im);
                }
            }
        } else {
            for (size_t group = 0; group < size; group += 2 * half) {
                for (size_t j = 0; j < half; ++j) {
                    butterfly(re, im, group + j, group + j + half, w_re[j * stride],
                              w_im[j * stride]);
                }
            }
        }
    }
}

}  // namespace

void tavo_fft_init(int16_t n, TAVO_FFT_CTX *ctx) {
    *ctx = {};
    if (!is_fft_size(n)) return;
    const auto size = static_cast<size_t>(n);
    ctx->stages = halvings(n);
    ctx->cos_table = static_cast<double *>(calloc(size, sizeof(double)));
    ctx->sin_table = static_cast<double *>(calloc(size, sizeof(double)));
    ctx->bit_reverse = static_cast<uint32_t *>(calloc(size, sizeof(uint32_t)));
    if (ctx->cos_table == nullptr || ctx->sin_table == nullptr || ctx->bit_reverse == nullptr) {
        tavo_fft_deinit(ctx);
        ctx->stages = 0;
        return;
    }
    fill_twiddles(ctx, n);
    fill_bit_reverse(ctx, n);
}

double *tavo_fft_proc(double *re, double *im, int16_t n, const TAVO_FFT_CTX *ctx) {
    transform(re, im, n, ctx);
    return re;
}

void transform_pair(double_pair *re, double_pair *im, int32_t n, const TAVO_FFT_CTX *ctx) {
    transform(re, im, n, ctx);
}

void tavo_fft_deinit(TAVO_FFT_CTX *ctx) {
    free(ctx->cos_table);
    free(ctx->sin_table);
    free(ctx->bit_reverse);
    ctx->cos_table = nullptr;
    ctx->sin_table = nullptr;
    ctx->bit_reverse = nullptr;
}

uint32_t bit_reverse2(uint32_t bits, uint32_t x) {
    if (bits < 1 || bits > kMaxReverseBits) return 0;
    uint32_t result = 0;
    uint32_t value = 1;
    for (uint32_t mask = 1u << (bits - 1); mask != 0; mask >>= 1) {
        if ((x & mask) != 0) result |= value;
        value <<= 1;
    }
    return result;
}
