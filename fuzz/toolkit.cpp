// The toolkit: each routine against a form written from its definition.
#include "dsp/fft.h"
#include "dsp/matrix.h"
#include "dsp/peaks.h"
#include "dsp/sort.h"
#include "fuzz/fuzz.h"
#include "tests/support/reference.h"

namespace {

using fuzz::must;
using reference::complex_signal;

constexpr size_t kMostValues = 400;

double l1_norm(const complex_signal &x) {
    double sum = 0.0;
    for (const auto *part : {&x.re, &x.im}) {
        for (const double value : *part) sum += std::fabs(value);
    }
    return sum;
}

bool is_near(const complex_signal &a, const complex_signal &b, double norm) {
    if (!std::isfinite(norm) || norm > 1e150) return true;
    for (size_t i = 0; i < a.re.size(); ++i) {
        const double error = std::fmax(std::fabs(a.re[i] - b.re[i]), std::fabs(a.im[i] - b.im[i]));
        if (!(error <= 1e-9 * norm + 1e-300)) return false;
    }
    return true;
}

void transform(fuzz::input *in) {
    const bool fast = in->ConsumeBool();
    const auto n = fast ? 2 << in->ConsumeIntegralInRange(0, 6) : in->ConsumeIntegralInRange(1, 80);
    const auto m = fast ? n : in->ConsumeIntegralInRange(-2, n + 2);
    const auto real = fast ? 0 : in->ConsumeIntegralInRange(0, 1);
    const auto size = static_cast<size_t>(n);
    const complex_signal given = {fuzz::exactly<double>(in, size), fuzz::exactly<double>(in, size)};
    complex_signal x = given;
    if (fast) {
        TAVO_FFT_CTX fft;
        memset(&fft, 0xAA, sizeof fft);
        tavo_fft_init(static_cast<int16_t>(n), &fft);
        must(tavo_fft_proc(x.re.data(), x.im.data(), static_cast<int16_t>(n), &fft) == x.re.data(),
             "the transform's place is returned");
        tavo_fft_deinit(&fft);
        tavo_fft_deinit(&fft);
    } else {
        must(tavo_dft(x.re.data(), x.im.data(), n, m, real) == 0, "a transform is done");
    }
    const double norm = l1_norm(given);
    must(is_near(x, reference::transform(given, m, n, real != 0, -1.0), norm),
         "a transform is its sums");

    x = given;
    must(tavo_inverse_dft(x.re.data(), x.im.data(), n, m, real) == 0, "an inverse is done");
    complex_signal back = reference::transform(given, n, m, real != 0, 1.0);
    for (auto i = static_cast<size_t>(std::clamp(m, 0, n)); i < size; ++i) {
        must(memcmp(&x.re[i], &given.re[i], 8) == 0 && memcmp(&x.im[i], &given.im[i], 8) == 0,
             "outputs that were not asked for stay");
        back.re[i] = x.re[i];
        back.im[i] = x.im[i];
    }
    must(is_near(x, back, norm), "an inverse is its sums");
}

template <typename T>
bool is_peak(const std::vector<T> &x, int64_t at) {
    const auto i = static_cast<size_t>(at);
    return at > 0 && i + 1 < x.size() && x[i] > x[i - 1] && x[i] > x[i + 1];
}

// Whether out holds peaks in the order that the definition asks for, none suppressed by another,
// and each absent one is suppressed by one at least as large. The order of equal ones is open.
// reach: the farthest that suppresses; pinned: entries at the front that nothing suppresses; all:
// none is left out for its number.
template <typename T, typename Index>
void check_peaks(const std::vector<T> &x, const std::vector<Index> &out, int64_t pinned,
                 int64_t reach, bool all) {
    const auto count = static_cast<int64_t>(out.size());
    const auto at = [&](int64_t k) { return static_cast<int64_t>(out[static_cast<size_t>(k)]); };
    const auto value = [&](int64_t k) { return x[static_cast<size_t>(at(k))]; };
    for (int64_t k = 0; k < count; ++k) {
        must(is_peak(x, at(k)), "what is found is a peak");
        if (k < pinned) continue;
        must(k == pinned || value(k - 1) >= value(k), "peaks descend");
        for (int64_t j = 0; j < k; ++j) {
            must(std::abs(at(j) - at(k)) > reach && at(j) != at(k), "no peak is near a larger");
        }
    }
    for (int64_t i = 1; all && i + 1 < static_cast<int64_t>(x.size()); ++i) {
        bool explained = !is_peak(x, i);
        for (int64_t k = 0; k < count && !explained; ++k) {
            const bool larger = k < pinned || value(k) >= x[static_cast<size_t>(i)];
            explained = at(k) == i || (std::abs(at(k) - i) <= reach && larger);
        }
        must(explained, "an absent peak is suppressed");
    }
}

uint32_t take_distance(fuzz::input *in) {
    return in->ConsumeBool() ? in->ConsumeIntegral<uint8_t>() : in->ConsumeIntegral<uint32_t>();
}

void sorted_peaks(fuzz::input *in) {
    const uint32_t distance = take_distance(in);
    const uint32_t most = in->ConsumeBool() ? in->ConsumeIntegral<uint8_t>() : 0;
    const auto x = fuzz::values<float>(in, kMostValues);
    std::vector<uint32_t> out(most == 0 ? x.size() / 2 : std::min<size_t>(most, x.size() / 2));
    const int32_t count =
        findsortedNPeaks(x.data(), static_cast<int64_t>(x.size()), distance, most, out.data());
    out.resize(static_cast<size_t>(count));
    check_peaks(x, out, 0, distance, most == 0 || out.size() < most);
}

void spaced_peaks(fuzz::input *in) {
    const uint32_t distance = take_distance(in);
    const auto x = fuzz::values<double>(in, kMostValues);
    std::vector<int32_t> out(x.size() / 2);
    out.resize(static_cast<size_t>(
        findPeaks(x.data(), static_cast<int64_t>(x.size()), distance, out.data())));
    if (distance == 0) {
        must(std::is_sorted(out.begin(), out.end()), "without a distance peaks come in order");
        std::stable_sort(out.begin(), out.end(), [&](int32_t a, int32_t b) {
            return x[static_cast<size_t>(a)] > x[static_cast<size_t>(b)];
        });
    }
    check_peaks(x, out, 0, static_cast<int64_t>(distance) - 1, true);
}

void priority_peaks(fuzz::input *in) {
    const auto distance = static_cast<int32_t>(take_distance(in) & INT32_MAX);
    std::vector<int32_t> priority(in->ConsumeIntegralInRange<size_t>(0, 16));
    for (int32_t &position : priority) position = in->ConsumeIntegral<int16_t>();
    const auto x = fuzz::values<double>(in, kMostValues);
    const auto length = static_cast<int64_t>(x.size());
    std::vector<int32_t> out(priority.size() + x.size() / 2);
    const int32_t count = findPeaksPriority(x.data(), length, distance, out.data(), priority.data(),
                                            static_cast<int32_t>(priority.size()));
    must((count == -1) == (distance == 0), "only a distance of 0 is refused");
    if (count < 0) return;
    out.resize(static_cast<size_t>(count));
    std::vector<int32_t> peaks;
    for (int32_t i = 0; i < length; ++i) {
        if (is_peak(x, i)) peaks.push_back(i);
    }
    size_t pinned = 0;
    for (const int32_t position : priority) {
        if (peaks.size() < 2) break;
        const auto nearest = std::min_element(
            peaks.begin(), peaks.end(),
            [&](int32_t a, int32_t b) { return std::abs(a - position) < std::abs(b - position); });
        if (nearest == peaks.end() - 1) continue;  // the last peak is never pinned
        must(pinned < out.size() && out[pinned] == *nearest,
             "the nearest to each position come first");
        ++pinned;
    }
    check_peaks(x, out, static_cast<int64_t>(pinned), int64_t{distance} - 1, true);
}

// The bits of the values, sorted.
std::vector<uint64_t> bits_of(const std::vector<double> &values) {
    std::vector<uint64_t> bits(values.size());
    if (!values.empty()) memcpy(bits.data(), values.data(), 8 * values.size());
    std::sort(bits.begin(), bits.end());
    return bits;
}

void sort(fuzz::input *in) {
    const bool whole = in->ConsumeBool();
    const auto given = fuzz::values<double>(in, kMostValues);
    std::vector<double> x = given;
    const auto last = static_cast<int32_t>(x.size()) - 1;
    if (!whole && x.empty()) return;
    const int32_t place = whole ? 0 : partition(0, last, x.data());
    if (whole) quickSort(0, last, x.data());
    must(bits_of(x) == bits_of(given), "every value is kept");
    if (std::any_of(x.begin(), x.end(), [](double value) { return std::isnan(value); })) return;
    must(!whole || std::is_sorted(x.begin(), x.end()), "values ascend after a sort");
    must(place >= 0 && place <= std::max(last, 0), "the place lies among the values");
    for (int32_t i = 0; i <= last && !whole; ++i) {
        const double pivot = x[static_cast<size_t>(place)];
        const double value = x[static_cast<size_t>(i)];
        must(i <= place ? value <= pivot : value > pivot, "both parts keep to their side");
    }
}

void multiply(fuzz::input *in) {
    const auto rows = in->ConsumeIntegralInRange<size_t>(0, 9);
    const auto columns = in->ConsumeIntegralInRange<size_t>(0, 9);
    const auto inner = in->ConsumeIntegralInRange<size_t>(0, 9);
    auto a = fuzz::exactly<float>(in, rows * inner);
    auto b = fuzz::exactly<float>(in, inner * columns);
    std::vector<double> d(rows * columns, -1.0);
    std::vector<float *> a_rows, b_rows;
    std::vector<double *> d_rows;
    for (size_t i = 0; i < rows; ++i) a_rows.push_back(a.data() + i * inner);
    for (size_t i = 0; i < inner; ++i) b_rows.push_back(b.data() + i * columns);
    for (size_t i = 0; i < rows; ++i) d_rows.push_back(d.data() + i * columns);
    const auto n = [](size_t count) { return static_cast<int32_t>(count); };
    must(MultiplyMtxs(n(rows), n(columns), n(inner), a_rows.data(), b_rows.data(), d_rows.data()) ==
             n(rows),
         "a product has its rows");
    for (size_t at = 0; at < d.size(); ++at) {
        double sum = 0.0;
        for (size_t k = 0; k < inner; ++k) {
            const float left = a_rows[at / columns][k], right = b_rows[k][at % columns];
            if (left != 0.0f && right != 0.0f)
                sum += static_cast<double>(left) * static_cast<double>(right);
        }
        must(d[at] == sum || (std::isnan(d[at]) && std::isnan(sum)), "a product is its sum");
    }
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    fuzz::run_one({transform, sorted_peaks, spaced_peaks, priority_peaks, sort, multiply}, data,
                  size);
    return 0;
}
