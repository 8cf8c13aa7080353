#include "dsp/fft.h"

#include <cmath>
#include <cstdlib>

#include "dsp/lanes.h"

namespace {

constexpr double kTwoPi = 6.283185307179586;
constexpr int32_t kMinSize = 2;
constexpr int32_t kMaxSize = 16384;       // the largest power of two in 16 bits
constexpr uint32_t kMaxReverseBits = 31;  // at 32 the mask would never empty

bool is_fft_size(int32_t n) {
    return n >= kMinSize && n <= kMaxSize && (n & (n - 1)) == 0;
}

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

// Every double_pair of positions is listed once, at its smaller member.
void fill_bit_reverse(TAVO_FFT_CTX *ctx, int32_t n) {
    const auto bits = static_cast<uint32_t>(ctx->stages);
    for (uint32_t i = 0; i < static_cast<uint32_t>(n); ++i) {
        const uint32_t reversed = bit_reverse2(bits, i);
        ctx->bit_reverse[i] = reversed >= i ? reversed : 0;
    }
}

void permute(double *re, double *im, int32_t n, const uint32_t *bit_reverse) {
    for (int32_t i = 0; i < n; ++i) {
        const uint32_t r = bit_reverse[i];
        if (r == 0) continue;
        const double held_re = re[i];
        const double held_im = im[i];
        re[i] = re[r];
        im[i] = im[r];
        re[r] = held_re;
        im[r] = held_im;
    }
}

// Groups of two elements.
void first_stage(double *re, double *im, int32_t n, const TAVO_FFT_CTX *ctx) {
    const double w_re = ctx->cos_table[0];
    const double w_im = ctx->sin_table[0];
    for (int32_t top = 0; top < n; top += 2) {
        const double t_re = re[top + 1] * w_re - im[top + 1] * w_im;
        const double t_im = re[top + 1] * w_im + im[top + 1] * w_re;
        const double top_re = re[top];
        const double top_im = im[top];
        re[top + 1] = top_re - t_re;
        im[top + 1] = top_im - t_im;
        re[top] = top_re + t_re;
        im[top] = top_im + t_im;
    }
}

// Groups of span elements, 4 or more; two neighbouring elements at a time.
void later_stage(double *re, double *im, int32_t n, int32_t span, const TAVO_FFT_CTX *ctx) {
    const double *cos_table = ctx->cos_table;
    const double *sin_table = ctx->sin_table;
    const int32_t half = span / 2;
    const int32_t stride = n / span;
    for (int32_t group = 0; group < n; group += span) {
        for (int32_t j = 0; j < half; j += 2) {
            const int32_t top = group + j;
            const int32_t bottom = top + half;
            const int32_t w = j * stride;
            const double_pair w_re = {cos_table[w], cos_table[w + stride]};
            const double_pair w_im = {sin_table[w], sin_table[w + stride]};
            const double_pair x_re = load_pair(re + bottom);
            const double_pair x_im = load_pair(im + bottom);
            const double_pair t_re = x_re * w_re - x_im * w_im;
            const double_pair t_im = x_re * w_im + x_im * w_re;
            const double_pair top_re = load_pair(re + top);
            const double_pair top_im = load_pair(im + top);
            store_pair(re + bottom, top_re - t_re);
            store_pair(im + bottom, top_im - t_im);
            store_pair(re + top, top_re + t_re);
            store_pair(im + top, top_im + t_im);
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
    if (ctx->cos_table == nullptr || n != 1 << ctx->stages) return re;
    permute(re, im, n, ctx->bit_reverse);
    first_stage(re, im, n, ctx);
    for (int32_t span = 4; span <= n; span *= 2) later_stage(re, im, n, span, ctx);
    return re;
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
