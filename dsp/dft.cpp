#include "dsp/dft.h"

#include <cmath>
#include <cstdlib>
#include <cstring>

#include "dsp/fft.h"
#include "include/tavo.h"

namespace {

constexpr int64_t kMaxCopy = INT64_MAX / 32;  // values; keeps the size of two arrays in range

// The real and imaginary parts, in one allocation.
struct complex_copy {
    double *re;
    double *im;
};

// Allocates `count` complex values. Copies the first `used` values of `re`, and of `im` unless it
// is null; the rest are zero.
bool copy_input(complex_copy *copy, const double *re, const double *im, int64_t used,
                int64_t count) {
    if (count > kMaxCopy) return false;
    const auto capacity = static_cast<size_t>(count < 1 ? 1 : count);
    copy->re = static_cast<double *>(calloc(capacity, 2 * sizeof(double)));
    if (copy->re == nullptr) return false;
    copy->im = copy->re + capacity;
    const auto bytes = static_cast<size_t>(used) * sizeof(double);
    if (bytes > 0) memcpy(copy->re, re, bytes);
    if (bytes > 0 && im != nullptr) memcpy(copy->im, im, bytes);
    return true;
}

// True if the fast transform is exact enough for the input. It would spread an infinite or NaN
// value to all outputs, and very large values could overflow inside it. Such input is summed term
// by term instead.
bool is_fit_for_fft(const complex_copy &x, int64_t used, int64_t n) {
    if (!is_fft_size(n)) return false;
    double l1_norm = 0.0;
    for (int64_t i = 0; i < used; ++i) l1_norm += fabs(x.re[i]) + fabs(x.im[i]);
    return std::isfinite(2.0 * l1_norm);
}

bool transform_fast(double *re, double *im, int64_t n) {
    TAVO_FFT_CTX fft;
    const auto size = static_cast<int16_t>(n);
    tavo_fft_init(size, &fft);
    if (fft.cos_table == nullptr) return false;
    tavo_fft_proc(re, im, size, &fft);
    tavo_fft_deinit(&fft);
    return true;
}

// Computes the forward transform term by term. Skips the inputs from `used` on, which are zero.
void forward_sums(double *re, double *im, int64_t n, const complex_copy &x, int64_t used,
                  bool real_input) {
    for (int64_t k = 0; k < n; ++k) {
        double sum_re = 0.0;
        double sum_im = 0.0;
        for (int64_t i = 0; i < used; ++i) {
            const auto theta =
                static_cast<double>(i) * kTwoPi * static_cast<double>(k) / static_cast<double>(n);
            const double c = cos(theta);
            const double s = sin(theta);
            if (real_input) {
                sum_re += x.re[i] * c;
                sum_im += x.re[i] * s;
            } else {
                sum_re += x.re[i] * c + x.im[i] * s;
                sum_im += x.im[i] * c - x.re[i] * s;
            }
        }
        re[k] = sum_re;
        im[k] = real_input ? -sum_im : sum_im;
    }
}

void inverse_sums(double *re, double *im, int64_t n, int64_t m, const complex_copy &x,
                  bool real_input) {
    for (int64_t t = 0; t < m; ++t) {
        double sum_re = 0.0;
        double sum_im = 0.0;
        for (int64_t i = 0; i < n; ++i) {
            const auto theta =
                static_cast<double>(t) * kTwoPi * static_cast<double>(i) / static_cast<double>(n);
            const double c = cos(theta);
            const double s = sin(theta);
            if (real_input) {
                sum_re += x.re[i] * c;
                sum_im += x.re[i] * s;
            } else {
                sum_re += x.re[i] * c - x.im[i] * s;
                sum_im += x.re[i] * s + x.im[i] * c;
            }
        }
        re[t] = sum_re / static_cast<double>(n);
        im[t] = sum_im / static_cast<double>(n);
    }
}

int64_t clamp_count(int64_t m, int64_t n) {
    if (m < 0) return 0;
    return m < n ? m : n;
}

}  // namespace

int32_t tavo_dft(double *re, double *im, int64_t n, int64_t m, int32_t real_input) {
    if (n <= 0) return 0;
    const bool real = real_input != 0;
    const int64_t used = clamp_count(m, n);
    const bool small = n <= kMaxFftSize;  // the fast transform works in place on the copy
    complex_copy x;
    if (!copy_input(&x, re, real ? nullptr : im, used, small ? n : used)) return TAVO_ERR_MEMORY;
    if (is_fit_for_fft(x, used, n) && transform_fast(x.re, x.im, n)) {
        const auto bytes = static_cast<size_t>(n) * sizeof(double);
        memcpy(re, x.re, bytes);
        memcpy(im, x.im, bytes);
    } else {
        forward_sums(re, im, n, x, used, real);
    }
    free(x.re);
    return 0;
}

int32_t tavo_inverse_dft(double *re, double *im, int64_t n, int64_t m, int32_t real_input) {
    const int64_t outputs = clamp_count(m, n);
    if (n <= 0 || outputs == 0) return 0;
    const bool real = real_input != 0;
    complex_copy x;
    if (!copy_input(&x, re, real ? nullptr : im, n, n)) return TAVO_ERR_MEMORY;
    // Swapping the real and imaginary parts before and after the forward transform gives the
    // inverse.
    if (is_fit_for_fft(x, n, n) && transform_fast(x.im, x.re, n)) {
        for (int64_t t = 0; t < outputs; ++t) {
            re[t] = x.re[t] / static_cast<double>(n);
            im[t] = x.im[t] / static_cast<double>(n);
        }
    } else {
        inverse_sums(re, im, n, outputs, x, real);
    }
    free(x.re);
    return 0;
}
