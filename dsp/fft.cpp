#include "dsp/fft.h"

#include <cmath>
#include <cstdlib>
#include <utility>

namespace {

constexpr uint32_t kMaxReverseBits = 31;  // bit_reverse2 returns 0 beyond it

int32_t count_halvings(int32_t n) {
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
struct complex {
    T re;
    T im;
};

// The data of one transform. T is double, or double_pair for two transforms side by side.
template <typename T>
struct spectrum {
    T *re;
    T *im;
};

template <typename T>
inline complex<T> load(const spectrum<T> &x, size_t i) {
    return {x.re[i], x.im[i]};
}

template <typename T>
inline void store(const spectrum<T> &x, size_t i, complex<T> value) {
    x.re[i] = value.re;
    x.im[i] = value.im;
}

// top becomes top + w * bottom, bottom becomes top - w * bottom.
template <typename T>
inline void butterfly(complex<T> *top, complex<T> *bottom, double w_re, double w_im) {
    const complex<T> t = {bottom->re * w_re - bottom->im * w_im,
                          bottom->re * w_im + bottom->im * w_re};
    *bottom = {top->re - t.re, top->im - t.im};
    *top = {top->re + t.re, top->im + t.im};
}

// Radix 2, decimation in time. Each pass over the data runs two stages on four elements at a time,
// which stay in registers between the stages. If the number of stages is odd, the first one has a
// pass of its own.
template <typename T>
void transform(T *re, T *im, int32_t n, const TAVO_FFT_CTX *ctx) {
    if (ctx->cos_table == nullptr || n != 1 << ctx->stages) return;
    permute(re, im, n, ctx->bit_reverse);
    const spectrum<T> x = {re, im};
    const double *w_re = ctx->cos_table;
    const double *w_im = ctx->sin_table;
    const auto size = static_cast<size_t>(n);
    size_t half = 1;  // distance of the two inputs of a butterfly in the pass's first stage
    if (ctx->stages % 2 != 0) {
        for (size_t i = 0; i < size; i += 2) {
            complex<T> a = load(x, i);
            complex<T> b = load(x, i + 1);
            butterfly(&a, &b, w_re[0], w_im[0]);
            store(x, i, a);
            store(x, i + 1, b);
        }
        half = 2;
    }
    for (; half < size; half *= 4) {
        const size_t stride = size / (4 * half);  // of the second stage's twiddle factors
        for (size_t j = 0; j < half; ++j) {
            const complex<double> w0 = {w_re[2 * stride * j], w_im[2 * stride * j]};
            const complex<double> w1 = {w_re[stride * j], w_im[stride * j]};
            const complex<double> w2 = {w_re[stride * (j + half)], w_im[stride * (j + half)]};
            for (size_t i = j; i < size; i += 4 * half) {
                complex<T> a = load(x, i);
                complex<T> b = load(x, i + half);
                complex<T> c = load(x, i + 2 * half);
                complex<T> d = load(x, i + 3 * half);
                butterfly(&a, &b, w0.re, w0.im);
                butterfly(&c, &d, w0.re, w0.im);
                butterfly(&a, &c, w1.re, w1.im);
                butterfly(&b, &d, w2.re, w2.im);
                store(x, i, a);
                store(x, i + half, b);
                store(x, i + 2 * half, c);
                store(x, i + 3 * half, d);
            }
        }
    }
}

}  // namespace

void tavo_fft_init(int16_t n, TAVO_FFT_CTX *ctx) {
    *ctx = {};
    if (!is_fft_size(n)) return;
    const auto size = static_cast<size_t>(n);
    ctx->stages = count_halvings(n);
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
