// Fourier transforms.
//
// Input: a size, then values of any kind. Guaranteed by the callers: arrays of n values.
#include <algorithm>
#include <cmath>
#include <vector>

#include "dsp/fft.h"
#include "fuzz/fuzz.h"

namespace {

constexpr int32_t kMostValues = 80;

struct signal {
    std::vector<double> re;
    std::vector<double> im;
};

constexpr double kTiny = 1e-300;  // sums of smaller values lose digits

signal take_signal(fuzz::input *in, int32_t n) {
    signal x = {std::vector<double>(static_cast<size_t>(n)),
                std::vector<double>(static_cast<size_t>(n))};
    in->take_values(x.re.data(), x.re.size());
    in->take_values(x.im.data(), x.im.size());
    return x;
}

double l1_norm(const signal &x) {
    double sum = 0.0;
    for (const double value : x.re) sum += std::fabs(value);
    for (const double value : x.im) sum += std::fabs(value);
    return sum;
}

void must_be_near(const signal &a, const signal &b, double norm, const char *what) {
    if (!std::isfinite(norm) || norm > 1e150) return;
    const double most = 1e-9 * norm + kTiny;
    for (size_t i = 0; i < a.re.size(); ++i) {
        fuzz::must(std::fabs(a.re[i] - b.re[i]) <= most, what);
        fuzz::must(std::fabs(a.im[i] - b.im[i]) <= most, what);
    }
}

bool same_bits(const double *a, const double *b, int32_t count) {
    return count == 0 || memcmp(a, b, static_cast<size_t>(count) * sizeof(double)) == 0;
}

void transform_fast(fuzz::input *in) {
    constexpr int16_t kOddSizes[8] = {0, 1, 3, -1, -2, INT16_MAX, INT16_MIN, 16384};
    const uint8_t which = in->take<uint8_t>();
    const bool odd = which >= 248;
    const auto n = static_cast<int16_t>(odd ? kOddSizes[which - 248] : 2 << which % 6);
    TAVO_FFT_CTX fft;
    memset(&fft, 0xAA, sizeof fft);
    tavo_fft_init(n, &fft);
    fuzz::must((fft.cos_table != nullptr) == (!odd || n == 16384), "powers of two are prepared");
    if (!odd) {
        const signal given = take_signal(in, n);
        signal fast = given;
        signal sums = given;
        fuzz::must(tavo_fft_proc(fast.re.data(), fast.im.data(), n, &fft) == fast.re.data(),
                   "the real part is returned");
        fuzz::must(tavo_dft(sums.re.data(), sums.im.data(), n, n, 0) == 0, "a transform is done");
        must_be_near(fast, sums, l1_norm(given), "both transforms are one");
    }
    tavo_fft_deinit(&fft);
    tavo_fft_deinit(&fft);
}

// There and back again.
void transform_any(fuzz::input *in) {
    const int32_t n = in->take_from(1, kMostValues);
    const int32_t m = in->take_from(-2, kMostValues + 2);
    const int32_t real = in->take<uint8_t>() & 1;
    const signal given = take_signal(in, n);
    signal x = given;
    fuzz::must(tavo_dft(x.re.data(), x.im.data(), n, m, real) == 0, "a transform is done");
    const int32_t used = std::clamp(m, 0, n);
    signal kept = given;
    for (int32_t i = 0; i < n; ++i) {
        if (i >= used) kept.re[static_cast<size_t>(i)] = 0.0;
        if (i >= used || real != 0) kept.im[static_cast<size_t>(i)] = 0.0;
    }
    const signal spectrum = x;
    fuzz::must(tavo_inverse_dft(x.re.data(), x.im.data(), n, n, 0) == 0, "an inverse is done");
    must_be_near(x, kept, l1_norm(kept), "the inverse leads back");

    x = spectrum;
    fuzz::must(tavo_inverse_dft(x.re.data(), x.im.data(), n, m, real) == 0, "an inverse is done");
    fuzz::must(same_bits(x.re.data() + used, spectrum.re.data() + used, n - used) &&
                   same_bits(x.im.data() + used, spectrum.im.data() + used, n - used),
               "outputs that were not asked for stay");
}

void reverse_bits(fuzz::input *in) {
    const uint32_t bits = in->take<uint8_t>() % 34;
    const auto x = in->take<uint32_t>();
    const uint32_t reversed = bit_reverse2(bits, x);
    if (bits < 1 || bits > 31) {
        fuzz::must(reversed == 0, "no such number of bits");
    } else {
        const uint32_t low = x & ((1u << bits) - 1);
        fuzz::must(bit_reverse2(bits, reversed) == low, "twice reversed is as it was");
    }
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    constexpr void (*kFunctions[])(fuzz::input *) = {transform_fast, transform_any, reverse_bits};
    fuzz::input in = {data, size};
    kFunctions[in.take<uint8_t>() % std::size(kFunctions)](&in);
    return 0;
}
