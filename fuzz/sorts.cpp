// Sorting, statistics, the mel scale and the matrix product.
//
// Input: values of any kind, infinities and what is no number among them. Guaranteed by the
// callers: arrays of the lengths given, of 1 to 2^31 - 1 values for partition.
#include <algorithm>
#include <cmath>
#include <vector>

#include "dsp/matrix.h"
#include "dsp/mel.h"
#include "dsp/sort.h"
#include "dsp/stats.h"
#include "fuzz/fuzz.h"

namespace {

constexpr size_t kMostValues = 512;

template <typename T>
std::vector<T> take_vector(fuzz::input *in, size_t most) {
    std::vector<T> values(std::min(in->left / sizeof(T), most));
    in->take_values(values.data(), values.size());
    return values;
}

template <typename T>
bool all_numbers(const std::vector<T> &values) {
    return std::none_of(values.begin(), values.end(), [](T x) { return std::isnan(x); });
}

// Whether two arrays hold the same bits in any order.
bool same_bits(const std::vector<double> &a, const std::vector<double> &b) {
    const auto bits = [](const std::vector<double> &from) {
        std::vector<uint64_t> to(from.size());
        for (size_t i = 0; i < from.size(); ++i) memcpy(&to[i], &from[i], sizeof(double));
        std::sort(to.begin(), to.end());
        return to;
    };
    return bits(a) == bits(b);
}

void sort_doubles(fuzz::input *in) {
    const std::vector<double> given = take_vector<double>(in, kMostValues);
    std::vector<double> values = given;
    quickSort(0, static_cast<int32_t>(values.size()) - 1, values.data());
    fuzz::must(same_bits(given, values), "a sort keeps every value");
    fuzz::must(!all_numbers(given) || std::is_sorted(values.begin(), values.end()),
               "numbers ascend after a sort");
}

void part_doubles(fuzz::input *in) {
    const std::vector<double> given = take_vector<double>(in, kMostValues);
    if (given.empty()) return;
    std::vector<double> values = given;
    const auto last = static_cast<int32_t>(values.size()) - 1;
    const int32_t middle = partition(0, last, values.data());
    fuzz::must(middle >= 0 && middle <= last, "the place lies among the values");
    fuzz::must(same_bits(given, values), "a partition keeps every value");
    if (!all_numbers(given)) return;
    const double pivot = values[static_cast<size_t>(middle)];
    for (int32_t i = 0; i <= last; ++i) {
        const double value = values[static_cast<size_t>(i)];
        fuzz::must(i <= middle ? value <= pivot : value > pivot, "both parts keep to their side");
    }
}

void take_statistics(fuzz::input *in) {
    const std::vector<double> x = take_vector<double>(in, kMostValues);
    double mean = -1.0;
    double deviation = -1.0;
    getMeanStd(x.data(), static_cast<int64_t>(x.size()), &mean, &deviation);
    fuzz::must(!(deviation < 0.0), "a deviation is not negative");
    const std::vector<float> y(x.size() / 2, 0.5f);
    float mean_f = -1.0f;
    float deviation_f = -1.0f;
    getfloatMeanStd(y.data(), static_cast<int64_t>(y.size()), &mean_f, &deviation_f);
    fuzz::must(y.empty() ? std::isnan(mean_f) : mean_f == 0.5f && deviation_f == 0.0f,
               "a constant has no deviation");
}

void convert_mel(fuzz::input *in) {
    const auto hz = in->take<float>();
    const float mel = Hz2Mel(hz);
    fuzz::must(!(hz >= 0.0f) || mel >= 0.0f, "a frequency has a place on the scale");
    if (hz >= 1.0f && hz <= 100'000.0f) {
        fuzz::must(std::fabs(Mel2Hz(mel) - hz) <= 1e-4f * hz, "the scale leads back");
    }
    (void)Mel2Hz(in->take<float>());
}

// Rows of a rectangle of values.
template <typename T>
std::vector<T *> rows_of(std::vector<T> *values, int32_t rows, int32_t columns) {
    std::vector<T *> row(static_cast<size_t>(rows));
    for (int32_t i = 0; i < rows; ++i) row[static_cast<size_t>(i)] = values->data() + i * columns;
    return row;
}

void multiply(fuzz::input *in) {
    const int32_t rows = in->take_from(0, 9);
    const int32_t columns = in->take_from(0, 9);
    const int32_t inner = in->take_from(0, 9);
    const auto size = [](int32_t a, int32_t b) { return static_cast<size_t>(a * b); };
    std::vector<float> a(size(rows, inner));
    std::vector<float> b(size(inner, columns));
    std::vector<double> d(size(rows, columns), -1.0);
    in->take_values(a.data(), a.size());
    in->take_values(b.data(), b.size());
    const auto a_rows = rows_of(&a, rows, inner);
    const auto b_rows = rows_of(&b, inner, columns);
    const auto d_rows = rows_of(&d, rows, columns);
    fuzz::must(
        MultiplyMtxs(rows, columns, inner, a_rows.data(), b_rows.data(), d_rows.data()) == rows,
        "a product has its rows");
    for (int32_t i = 0; i < rows; ++i) {
        for (int32_t j = 0; j < columns; ++j) {
            double sum = 0.0;
            for (int32_t k = 0; k < inner; ++k) {
                const float left = a_rows[static_cast<size_t>(i)][k];
                const float right = b_rows[static_cast<size_t>(k)][j];
                if (left != 0.0f && right != 0.0f) {
                    sum += static_cast<double>(left) * static_cast<double>(right);
                }
            }
            const double got = d_rows[static_cast<size_t>(i)][j];
            fuzz::must(got == sum || (std::isnan(got) && std::isnan(sum)), "a product is its sum");
        }
    }
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    constexpr void (*kFunctions[])(fuzz::input *) = {sort_doubles, part_doubles, take_statistics,
                                                     convert_mel, multiply};
    fuzz::input in = {data, size};
    kFunctions[in.take<uint8_t>() % std::size(kFunctions)](&in);
    return 0;
}
