#include "dsp/fft.h"

#include <cmath>
#include <cstdlib>
#include <utility>

namespace {

constexpr uint32_t kMaxReverseBits = 31;  // bit_reverse2 returns 0 for more

int32_t count_halvings(size_t n) {
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

bool has_tables(const TAVO_FFT_CTX *ctx, int32_t n) {
    return ctx->cos_table != nullptr && n == 1 << ctx->stages;
}

// Lists each swap once, at its lower index; all other entries are 0.
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

inline complex<double> twiddle(const TAVO_FFT_CTX *ctx, size_t k) {
    return {ctx->cos_table[k], ctx->sin_table[k]};
}

// Replaces `top` with top + w * bottom, and `bottom` with top - w * bottom.
template <typename T>
inline void butterfly(complex<T> *top, complex<T> *bottom, complex<double> w) {
    const complex<T> t = {bottom->re * w.re - bottom->im * w.im,
                          bottom->re * w.im + bottom->im * w.re};
    *bottom = {top->re - t.re, top->im - t.im};
    *top = {top->re + t.re, top->im + t.im};
}

template <typename T>
void run_stage(const spectrum<T> &x, size_t half, size_t size, const TAVO_FFT_CTX *ctx) {
    const size_t stride = size / (2 * half);
    for (size_t j = 0; j < half; ++j) {
        const complex<double> w = twiddle(ctx, stride * j);
        for (size_t i = j; i < size; i += 2 * half) {
            complex<T> a = load(x, i);
            complex<T> b = load(x, i + half);
            butterfly(&a, &b, w);
            store(x, i, a);
            store(x, i + half, b);
        }
    }
}

// Runs two consecutive stages on four elements at a time, which stay in registers between the
// stages. `half` is the distance between the two inputs of a butterfly in the first stage.
template <typename T>
void run_two_stages(const spectrum<T> &x, size_t half, size_t size, const TAVO_FFT_CTX *ctx) {
    const size_t stride = size / (4 * half);  // step between the second stage's twiddle factors
    for (size_t j = 0; j < half; ++j) {
        const complex<double> w0 = twiddle(ctx, 2 * stride * j);
        const complex<double> w1 = twiddle(ctx, stride * j);
        const complex<double> w2 = twiddle(ctx, stride * (j + half));
        for (size_t i = j; i < size; i += 4 * half) {
            complex<T> a = load(x, i);
            complex<T> b = load(x, i + half);
            complex<T> c = load(x, i + 2 * half);
            complex<T> d = load(x, i + 3 * half);
            butterfly(&a, &b, w0);
            butterfly(&c, &d, w0);
            butterfly(&a, &c, w1);
            butterfly(&b, &d, w2);
            store(x, i, a);
            store(x, i + half, b);
            store(x, i + 2 * half, c);
            store(x, i + 3 * half, d);
        }
    }
}

// Runs a radix-2 transform with decimation in time.
template <typename T>
void transform(const spectrum<T> &x, int32_t n, const TAVO_FFT_CTX *ctx) {
    if (!has_tables(ctx, n)) return;
    permute(x.re, x.im, n, ctx->bit_reverse);
    const auto size = static_cast<size_t>(n);
    size_t half = 1;
    if (ctx->stages % 2 != 0) {
        run_stage(x, half, size, ctx);
        half *= 2;
    }
    for (; half < size; half *= 4) run_two_stages(x, half, size, ctx);
}

inline double_pair windowed(const frame_pair &frames, size_t i) {
    return double_pair{frames.first[i], frames.second[i]} * frames.window[i];
}

inline double_pair power_of(const complex<double_pair> &x) {
    const double_pair power = x.re * x.re + x.im * x.im;
    return __builtin_convertvector(__builtin_convertvector(power, float_pair), double_pair);
}

}  // namespace

void tavo_fft_init(int16_t n, TAVO_FFT_CTX *ctx) {
    *ctx = {};
    if (!is_fft_size(n)) return;
    const auto size = static_cast<size_t>(n);
    ctx->stages = count_halvings(size);
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
    transform<double>({re, im}, n, ctx);
    return re;
}

void compute_frame_powers(const frame_pair &frames, int32_t n, const TAVO_FFT_CTX *ctx,
                          double_pair *scratch, double_pair *powers) {
    const auto size = static_cast<size_t>(n);
    const spectrum<double_pair> x = {scratch, scratch + size};
    for (size_t i = 0; i < size; ++i) store(x, i, {windowed(frames, i), double_pair{0.0, 0.0}});
    transform(x, n, ctx);
    for (size_t j = 0; j < size / 2; ++j) powers[j] = power_of(load(x, j));
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
