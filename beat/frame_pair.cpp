#include "beat/frame_pair.h"

#include <cmath>

#include "common/alloc.h"

namespace {

constexpr int32_t kSize = kFrameSize;
constexpr int32_t kGroupBits = 6;  // log2 of kPairGroups
constexpr int32_t kLastQuarter = kSize / 4;

typedef float float_pair __attribute__((vector_size(8)));

// One transform's data; lane 0 of every element is the first frame's, lane 1 the second's.
struct pair_spectrum {
    double_pair re[kSize];
    double_pair im[kSize];
};

struct complex_pair {
    double_pair re;
    double_pair im;
};

complex_pair operator+(complex_pair a, complex_pair b) {
    return {a.re + b.re, a.im + b.im};
}

complex_pair operator-(complex_pair a, complex_pair b) {
    return {a.re - b.re, a.im - b.im};
}

complex_pair get(const pair_spectrum *x, int32_t i) {
    return {x->re[i], x->im[i]};
}

void put(pair_spectrum *x, int32_t i, complex_pair value) {
    x->re[i] = value.re;
    x->im[i] = value.im;
}

// value times twiddle factor k of 512.
complex_pair twiddle(const pair_tables *tables, int32_t k, complex_pair value) {
    const double_pair w_re = tables->cosine[k];
    const double_pair w_im = tables->sine[k];
    return {value.re * w_re - value.im * w_im, value.re * w_im + value.im * w_re};
}

// The same for a value without imaginary part.
complex_pair twiddle_real(const pair_tables *tables, int32_t k, double_pair value) {
    return {value * tables->cosine[k], value * tables->sine[k]};
}

complex_pair plus(double_pair real, complex_pair turn) {
    return {real + turn.re, turn.im};
}

complex_pair minus(double_pair real, complex_pair turn) {
    return {real - turn.re, -turn.im};
}

// The first three stages on the eight windowed samples of one group, which bit reversal brings
// together from all over the frame. Factor 0 is 1, and what is still real has no imaginary part:
// leaving those products out changes finite values in the sign of zeros alone, which their squares
// lose.
void first_stages(const pair_tables *tables, const double *first, const double *second,
                  pair_spectrum *x) {
    for (int32_t i = 0; i < kPairGroups; ++i) {
        const auto sample = [=](int32_t at) {
            const double_pair pair = {first[i + at], second[i + at]};
            const double weight = tables->window[i + at];
            return pair * double_pair{weight, weight};
        };
        const double_pair s0 = sample(0) + sample(256);
        const double_pair s1 = sample(0) - sample(256);
        const double_pair s2 = sample(128) + sample(384);
        const double_pair s3 = sample(128) - sample(384);
        const double_pair s4 = sample(64) + sample(320);
        const double_pair s5 = sample(64) - sample(320);
        const double_pair s6 = sample(192) + sample(448);
        const double_pair s7 = sample(192) - sample(448);

        const double_pair none = {0.0, 0.0};
        const complex_pair low_turn = twiddle_real(tables, 128, s3);
        const complex_pair high_turn = twiddle_real(tables, 128, s7);
        const complex_pair low1 = plus(s1, low_turn);
        const complex_pair low3 = minus(s1, low_turn);
        const complex_pair turn1 = twiddle(tables, 64, plus(s5, high_turn));
        const complex_pair turn2 = twiddle_real(tables, 128, s4 - s6);
        const complex_pair turn3 = twiddle(tables, 192, minus(s5, high_turn));

        const int32_t group = 8 * tables->order[i];
        put(x, group, {s0 + s2 + (s4 + s6), none});
        put(x, group + 1, low1 + turn1);
        put(x, group + 2, plus(s0 - s2, turn2));
        put(x, group + 3, low3 + turn3);
        put(x, group + 4, {s0 + s2 - (s4 + s6), none});
        put(x, group + 5, low1 - turn1);
        put(x, group + 6, minus(s0 - s2, turn2));
        put(x, group + 7, low3 - turn3);
    }
}

// Two stages at once, from groups of two quarters to groups of four.
template <int32_t quarter>
void two_stages(const pair_tables *tables, pair_spectrum *x) {
    constexpr int32_t kWideStep = kSize / (4 * quarter);
    for (int32_t group = 0; group < kSize; group += 4 * quarter) {
        for (int32_t j = 0; j < quarter; ++j) {
            const int32_t i = group + j;
            const complex_pair turn1 = twiddle(tables, 2 * kWideStep * j, get(x, i + quarter));
            const complex_pair turn3 = twiddle(tables, 2 * kWideStep * j, get(x, i + 3 * quarter));
            const complex_pair x0 = get(x, i) + turn1;
            const complex_pair x1 = get(x, i) - turn1;
            const complex_pair x2 = get(x, i + 2 * quarter) + turn3;
            const complex_pair x3 = get(x, i + 2 * quarter) - turn3;

            const complex_pair even = twiddle(tables, kWideStep * j, x2);
            const complex_pair odd = twiddle(tables, kWideStep * (j + quarter), x3);
            put(x, i, x0 + even);
            put(x, i + quarter, x1 + odd);
            put(x, i + 2 * quarter, x0 - even);
            put(x, i + 3 * quarter, x1 - odd);
        }
    }
}

double_pair power_of(complex_pair value) {
    const double_pair power = value.re * value.re + value.im * value.im;
    return __builtin_convertvector(__builtin_convertvector(power, float_pair), double_pair);
}

// The last two stages for the bins 0 to 255 alone, and their powers, rounded to single precision.
// Returns the sum of all powers.
double_pair last_stages(const pair_tables *tables, const pair_spectrum *x, double_pair *power) {
    double_pair total = {0.0, 0.0};
    for (int32_t j = 0; j < kLastQuarter; ++j) {
        const complex_pair turn1 = twiddle(tables, 2 * j, get(x, j + kLastQuarter));
        const complex_pair turn3 = twiddle(tables, 2 * j, get(x, j + 3 * kLastQuarter));
        const complex_pair x2 = get(x, j + 2 * kLastQuarter) + turn3;
        const complex_pair x3 = get(x, j + 2 * kLastQuarter) - turn3;
        power[j] = power_of(get(x, j) + turn1 + twiddle(tables, j, x2));
        power[j + kLastQuarter] =
            power_of(get(x, j) - turn1 + twiddle(tables, j + kLastQuarter, x3));
        total += power[j] + power[j + kLastQuarter];
    }
    return total;
}

// Fills a band's span over the bins and appends its weights. False for one that is not finite.
bool fill_band(float *const *matrix, int32_t band, double_pair *weights, band_span *span) {
    int32_t end = kPairBins;
    while (end > 0 && matrix[end - 1][band] == 0.0f) --end;
    int32_t first = 0;
    while (first < end && matrix[first][band] == 0.0f) ++first;

    *span = {first, end - first, weights};
    for (int32_t bin = first; bin < end; ++bin) {
        const auto weight = static_cast<double>(matrix[bin][band]);
        if (!std::isfinite(weight)) return false;
        weights[bin - first] = double_pair{weight, weight};
    }
    return true;
}

bool fill_bands(pair_tables *tables, float *const *matrix) {
    int32_t used = 0;
    for (int32_t band = 0; band < tables->band_count; ++band) {
        if (!fill_band(matrix, band, tables->weights + used, &tables->bands[band])) return false;
        used += tables->bands[band].count;
    }
    return true;
}

}  // namespace

pair_tables *make_pair_tables(const double *window, const TAVO_FFT_CTX *fft, float *const *matrix,
                              int32_t bands) {
    auto *tables = zeroed_items<pair_tables>(1);
    if (tables == nullptr) return nullptr;
    tables->band_count = bands;
    tables->bands = zeroed_items<band_span>(bands);
    tables->weights = zeroed_items<double_pair>(int64_t{bands} * kPairBins);
    if (tables->bands == nullptr || tables->weights == nullptr || !fill_bands(tables, matrix)) {
        release_pair_tables(tables);
        return nullptr;
    }

    for (int32_t k = 0; k < kPairBins; ++k) {
        tables->cosine[k] = double_pair{fft->cos_table[k], fft->cos_table[k]};
        tables->sine[k] = double_pair{fft->sin_table[k], fft->sin_table[k]};
    }
    for (int32_t i = 0; i < kSize; ++i) tables->window[i] = window[i];
    for (int32_t i = 0; i < kPairGroups; ++i) {
        tables->order[i] = static_cast<int32_t>(bit_reverse2(kGroupBits, static_cast<uint32_t>(i)));
    }
    return tables;
}

void release_pair_tables(pair_tables *tables) {
    if (tables == nullptr) return;
    free(tables->bands);
    free(tables->weights);
    free(tables);
}

// An infinity or NaN in any sample, and an overflow in any stage, reach the powers and their sum.
// Within finite values a band may take the terms with a zero factor, which a matrix product leaves
// out: they add nothing.
bool take_pair(const pair_tables *tables, const double *first, const double *second,
               double *to_first, double *to_second) {
    pair_spectrum x;
    double_pair power[kPairBins];
    first_stages(tables, first, second, &x);
    two_stages<8>(tables, &x);
    two_stages<32>(tables, &x);
    const double_pair total = last_stages(tables, &x, power);
    if (!std::isfinite(total[0]) || !std::isfinite(total[1])) return false;

    for (int32_t band = 0; band < tables->band_count; ++band) {
        const band_span *span = &tables->bands[band];
        const double_pair *bins = power + span->first;
        double_pair sum = {0.0, 0.0};
        for (int32_t k = 0; k < span->count; ++k) sum += bins[k] * span->weights[k];
        to_first[band] = sum[0];
        to_second[band] = sum[1];
    }
    return true;
}
