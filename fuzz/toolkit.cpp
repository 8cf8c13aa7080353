// Fuzzes the functions of dsp/ and compares each with its definition.
#include <complex>

#include "dsp/dft.h"
#include "dsp/peaks.h"
#include "dsp/sort.h"
#include "fuzz/fuzz.h"

namespace {

using fuzz::must;

constexpr size_t kMaxValues = 400;

struct signal {
    std::vector<double> re, im;
};

// Returns term `k` of the discrete Fourier transform of the first `count` values of `x`. `sign` is
// -1 for the forward transform and 1 for the inverse, which divides by n.
std::complex<double> sum_at(const signal &x, int count, int k, int sign) {
    const auto n = static_cast<int>(x.re.size());
    std::complex<double> sum = 0.0;
    for (int j = 0; j < count; ++j) {
        const auto at = static_cast<size_t>(j);
        const double angle = sign * 2.0 * M_PI * (j * k % n) / n;
        sum += std::complex<double>(x.re[at], x.im[at]) * std::polar(1.0, angle);
    }
    return sign < 0 ? sum : sum / static_cast<double>(n);
}

// Checks that the first `outputs` values of `y` are the transform of the first `inputs` of `x`.
void check_sums(const signal &y, int outputs, const signal &x, int inputs, int sign) {
    double norm = 0.0;
    for (size_t i = 0; i < x.re.size(); ++i) norm += std::fabs(x.re[i]) + std::fabs(x.im[i]);
    if (!std::isfinite(norm) || norm > 1e150) return;
    for (int k = 0; k < outputs; ++k) {
        const auto at = static_cast<size_t>(k);
        const std::complex<double> found(y.re[at], y.im[at]);
        must(std::abs(found - sum_at(x, inputs, k, sign)) <= 2e-9 * norm + 1e-300,
             "a transform is its sums");
    }
}

void transform(fuzz::input *in) {
    const auto n = in->ConsumeIntegralInRange(1, 80);
    const auto m = in->ConsumeIntegralInRange(-2, n + 2);
    const bool real = in->ConsumeBool();
    const auto size = static_cast<size_t>(n);
    const auto count = std::clamp(m, 0, n);
    const signal given = {fuzz::padded_values<double>(in, size),
                          fuzz::padded_values<double>(in, size)};
    signal x = given, y = given;
    if (real) std::fill(x.im.begin(), x.im.end(), 0.0);
    must(tavo_dft(y.re.data(), y.im.data(), n, m, real) == 0, "a transform succeeds");
    check_sums(y, n, x, count, -1);

    y = given;
    must(tavo_inverse_dft(y.re.data(), y.im.data(), n, m, real) == 0, "an inverse succeeds");
    check_sums(y, count, x, n, 1);
    for (auto i = static_cast<size_t>(count); i < size; ++i) {
        must(memcmp(&y.re[i], &given.re[i], 8) == 0 && memcmp(&y.im[i], &given.im[i], 8) == 0,
             "outputs from m on stay");
    }
}

// Returns the positions of the peaks, ascending.
template <typename T>
std::vector<int64_t> peaks_of(const std::vector<T> &x) {
    std::vector<int64_t> peaks;
    for (size_t i = 1; i + 1 < x.size(); ++i) {
        if (x[i] > x[i - 1] && x[i] > x[i + 1]) peaks.push_back(static_cast<int64_t>(i));
    }
    return peaks;
}

// Checks that `out` contains the `expected` positions and then the other peaks, highest first.
// Peaks within `radius` of an earlier entry must be missing. Equal peaks may be in any order.
template <typename T, typename Index>
void check_peaks(const std::vector<T> &x, const std::vector<Index> &out,
                 std::vector<int64_t> expected, int64_t radius, size_t max_count = SIZE_MAX) {
    const auto value = [&x](int64_t at) { return x.at(static_cast<size_t>(at)); };
    const std::vector<int64_t> peaks = peaks_of(x);
    std::vector<int64_t> order(out.begin(), out.end());
    order.insert(order.end(), peaks.begin(), peaks.end());
    std::stable_sort(order.begin(), order.end(),
                     [&](int64_t a, int64_t b) { return value(a) > value(b); });
    for (const int64_t at : order) {
        const auto is_near = [&](int64_t other) { return std::abs(at - other) <= radius; };
        const bool is_peak = std::binary_search(peaks.begin(), peaks.end(), at);
        const bool free = std::none_of(expected.begin(), expected.end(), is_near);
        if (is_peak && free && expected.size() < max_count) expected.push_back(at);
    }
    must(std::equal(out.begin(), out.end(), expected.begin(), expected.end()),
         "the peaks are found");
}

uint32_t choose_distance(fuzz::input *in) {
    return in->ConsumeBool() ? in->ConsumeIntegral<uint8_t>() : in->ConsumeIntegral<uint32_t>();
}

void find_sorted_peaks(fuzz::input *in) {
    const uint32_t distance = choose_distance(in);
    const uint32_t max_count = in->ConsumeBool() ? in->ConsumeIntegral<uint8_t>() : 0;
    const auto x = fuzz::values<float>(in, kMaxValues);
    const size_t limit = max_count == 0 ? SIZE_MAX : max_count;
    std::vector<uint32_t> out(std::min(limit, x.size() / 2));
    out.resize(static_cast<size_t>(findsortedNPeaks(x.data(), static_cast<int64_t>(x.size()),
                                                    distance, max_count, out.data())));
    check_peaks(x, out, {}, distance, limit);
}

void find_spaced_peaks(fuzz::input *in) {
    const uint32_t distance = choose_distance(in);
    const auto x = fuzz::values<double>(in, kMaxValues);
    std::vector<int32_t> out(x.size() / 2);
    out.resize(static_cast<size_t>(
        findPeaks(x.data(), static_cast<int64_t>(x.size()), distance, out.data())));
    const std::vector<int64_t> peaks = peaks_of(x);
    must(distance > 0 || std::equal(out.begin(), out.end(), peaks.begin(), peaks.end()),
         "without a distance peaks come in order");
    if (distance > 0) check_peaks(x, out, {}, int64_t{distance} - 1);
}

void find_priority_peaks(fuzz::input *in) {
    const auto distance = static_cast<int32_t>(choose_distance(in) & INT32_MAX);
    std::vector<int32_t> priority(in->ConsumeIntegralInRange<size_t>(0, 16));
    for (int32_t &position : priority) position = in->ConsumeIntegral<int16_t>();
    const auto x = fuzz::values<double>(in, kMaxValues);
    std::vector<int32_t> out(priority.size() + x.size() / 2);
    const int32_t count =
        findPeaksPriority(x.data(), static_cast<int64_t>(x.size()), distance, out.data(),
                          priority.data(), static_cast<int32_t>(priority.size()));
    must((count == -1) == (distance == 0), "only a distance of 0 is refused");
    if (count < 0) return;
    out.resize(static_cast<size_t>(count));
    const std::vector<int64_t> peaks = peaks_of(x);
    std::vector<int64_t> pinned;  // the nearest peak to each position, unless it is the last peak
    for (const int32_t position : priority) {
        if (peaks.size() < 2) break;
        const int64_t nearest = *std::min_element(
            peaks.begin(), peaks.end(),
            [&](int64_t a, int64_t b) { return std::abs(a - position) < std::abs(b - position); });
        if (nearest != peaks.back()) pinned.push_back(nearest);
    }
    check_peaks(x, out, pinned, int64_t{distance} - 1);
}

// NaN compares to nothing, so a list with NaN has no order.
void sort(fuzz::input *in) {
    std::vector<double> x = fuzz::values<double>(in, kMaxValues), sorted = x;
    if (x.empty()) return;
    const bool ordered =
        std::none_of(x.begin(), x.end(), [](double value) { return std::isnan(value); });
    const auto last = static_cast<int32_t>(x.size()) - 1;
    const int32_t pivot_at = partition(0, last, x.data());
    must(pivot_at >= 0 && pivot_at <= last, "the pivot is among the values");
    const auto pivot = x.begin() + pivot_at;
    const auto small = [&](double value) { return value <= *pivot; };
    must(!ordered ||
             (std::all_of(x.begin(), pivot, small) && std::none_of(pivot + 1, x.end(), small)),
         "the pivot separates the values");
    quickSort(0, last, x.data());
    if (!ordered) return;
    std::sort(sorted.begin(), sorted.end());
    must(x == sorted, "values ascend after a sort, and none is lost");
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    fuzz::run_one({transform, find_sorted_peaks, find_spaced_peaks, find_priority_peaks, sort},
                  data, size);
    return 0;
}
