#include "beat/power_rise.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "dsp/lanes.h"
#include "dsp/sort.h"

namespace {

typedef int32_t int_pair __attribute__((vector_size(8)));

constexpr int64_t kBlock = 5512;        // samples, half a second at 11025 Hz
constexpr double kUnmeasured = -150.0;  // dB of a block that no sample was measured in
constexpr int32_t kTopLevel = 32767;    // the level is a 16-bit value and stays there
constexpr int32_t kLevelFloor = 1000;   // -30.31 dB
constexpr int32_t kDecay = 1000;        // the held level loses a thousandth per sample
constexpr int64_t kReach = 5;           // samples before, and with the sample itself after
constexpr int64_t kChunk = 64;          // samples measured at once; even
static_assert(kChunk % 2 == 0 && kBlock % 2 == 0 && kReach % 2 == 1);  // no block's count is odd
constexpr double kNearlyMost = 1.0 - 0x1p-40;  // far more than roundings make of a sum of squares
constexpr int64_t kLookAhead = 8;              // blocks in the four-second mean
constexpr int64_t kRiseApart = 7;              // blocks from a rise to the next possible one
constexpr double kMeanStep = 4.0;              // dB the quiet blocks lie below the mean to come
constexpr double kLoudMargin = 3.0;            // dB that the loud part may miss P60 by

struct block_levels {
    sample_view view;
    double *db;  // [count + kLookAhead] loudest level of each block, the rest kUnmeasured
    int64_t count;
};

struct rise_limits {
    double p60;
    double mid;  // between the 40th and the 60th percentile
};

double level_db(int32_t level) {
    return 20.0 * log10((level < kLevelFloor ? kLevelFloor : level) / kFullScale);
}

// Squares of the view's samples from first on.
void take_squares(sample_view view, int64_t first, int64_t count, double *squares) {
    scale_samples({view.samples + first, view.full_scale}, count, squares);
    for (int64_t i = 0; i < count; ++i) squares[i] *= squares[i];
}

// Means of ten squares each, for two neighbouring samples, as levels that 16 bits hold. What is not
// a number counts as 0.
int_pair mean_levels(double_pair sum) {
    const double_pair mean = sum / 10.0 * kFullScale;
    const double_pair none = {0.0, 0.0};
    const double_pair top = {kTopLevel, kTopLevel};
    const double_pair number = mean > none ? mean : none;
    return __builtin_convertvector(number < top ? number : top, int_pair);
}

// What the samples from first on measure, at most kChunk of them: the mean power of the ten around
// each. Two side by side; the ten squares are added in their order.
void measure_chunk(sample_view view, int64_t first, int64_t count, int32_t *measured) {
    double squares[kChunk + 2 * kReach] = {};
    take_squares(view, first - kReach, count + 2 * kReach - 1, squares);
    for (int64_t j = 0; j < count; j += 2) {
        const auto two = [&](int64_t k) { return load_pair(squares + j + k); };
        const int_pair levels = mean_levels(two(0) + two(1) + two(2) + two(3) + two(4) + two(5) +
                                            two(6) + two(7) + two(8) + two(9));
        memcpy(measured + j, &levels, sizeof levels);
    }
}

// About the largest sum of the ten squares around the samples from first on, an even count of them,
// without their scale: within a few units in the last place of what measure_chunk adds. Infinite or
// NaN when a sum is.
double chunk_power(sample_view view, int64_t first, int64_t count) {
    const double *x = view.samples + (first - kReach);
    const auto two_squares = [=](int64_t j) {
        const double_pair a = load_pair(x + j);
        const double_pair b = load_pair(x + j + 1);
        return a * a + b * b;
    };
    // sums of four squares from j on: four[0] at j, four[1] at j + 2, four[2] at j + 4
    double_pair last = two_squares(6);
    double_pair four[3] = {two_squares(0) + two_squares(2), two_squares(2) + two_squares(4),
                           two_squares(4) + last};
    double_pair most = {0.0, 0.0};
    double_pair total = {0.0, 0.0};
    for (int64_t j = 0; j < count; j += 2) {
        const double_pair next = two_squares(j + 8);
        const double_pair ten = four[0] + four[2] + next;
        most = ten > most ? ten : most;
        total += ten;
        four[0] = four[1];
        four[1] = four[2];
        four[2] = last + next;
        last = next;
    }
    const double sum = total[0] + total[1];
    return std::isfinite(sum) ? std::max(most[0], most[1]) : sum;
}

// The largest that the samples from first to last measure. Only where the sum of squares comes near
// the largest one is it taken exactly.
int32_t measure_block(sample_view view, int64_t first, int64_t last) {
    double power[kBlock / kChunk + 1];
    double most = 0.0;
    int64_t chunks = 0;
    for (int64_t i = first; i <= last; i += kChunk, ++chunks) {
        power[chunks] = chunk_power(view, i, std::min(kChunk, last - i + 1));
        most = std::max(most, power[chunks]);
    }

    int32_t largest = 0;
    int32_t measured[kChunk];
    for (int64_t c = 0; c < chunks; ++c) {
        if (power[c] < most * kNearlyMost) continue;  // never true of NaN
        const int64_t begin = first + c * kChunk;
        const int64_t count = std::min(kChunk, last - begin + 1);
        measure_chunk(view, begin, count, measured);
        largest = std::max(largest, *std::max_element(measured, measured + count));
    }
    return largest;
}

// The level of a sample: what it measures, or what an earlier peak has decayed to. held is carried
// from sample to sample.
int32_t follow_level(int32_t measured, int32_t *held) {
    const int32_t level = std::max(measured, *held);
    *held = level - level / kDecay;
    return level;
}

// Samples after which even the largest level has decayed below the floor: what is held from before
// them makes no difference.
constexpr int64_t samples_to_forget() {
    int64_t count = 0;
    for (int32_t level = kTopLevel; level >= kLevelFloor; level -= level / kDecay) ++count;
    return count;
}
static_assert(samples_to_forget() < kBlock - kReach);

int64_t first_sample(int64_t b) {
    return b == 1 ? kReach : (b - 1) * kBlock + 1;
}

// The level held after block b, as its last samples, reach of them, leave it.
int32_t held_after(sample_view view, int64_t b, int64_t reach) {
    int32_t held = 0;
    int32_t measured[kChunk];
    const int64_t end = b * kBlock + 1;
    for (int64_t i = std::max(end - reach, first_sample(b)); b > 0 && i < end; i += kChunk) {
        const int64_t count = std::min(kChunk, end - i);
        measure_chunk(view, i, count, measured);
        for (int64_t k = 0; k < count; ++k) follow_level(measured[k], &held);
    }
    return held;
}

// Samples after which a level up to largest has decayed to level, or to the floor if that is
// higher.
int64_t samples_to_decay(int32_t largest, int32_t level) {
    const int32_t bottom = std::max(level, kLevelFloor - 1);
    const int32_t step =
        std::max((bottom + 1) / kDecay, 1);  // the least that any sample takes away
    return largest > bottom ? (largest - bottom + step - 1) / step : 0;
}

// First sample among (b - 1) * kBlock to b * kBlock, b at least 2, whose decibels reach target, or
// -1. The two boundary samples carry the maxima of their blocks; between them the levels are
// followed one by one.
int64_t find_sample(const block_levels *blocks, int64_t b, double target) {
    const int64_t start = (b - 1) * kBlock;
    const int64_t end = start + kBlock;
    if (blocks->db[b - 1] >= target) return start;

    int32_t held = held_after(blocks->view, b - 1, samples_to_forget());
    int32_t loudest = -1;
    int32_t measured[kChunk];
    for (int64_t i = start + 1; i < end; i += kChunk) {
        const int64_t count = std::min(kChunk, end - i);
        measure_chunk(blocks->view, i, count, measured);
        for (int64_t k = 0; k < count; ++k) {
            const int32_t level = follow_level(measured[k], &held);
            if (level <= loudest) continue;  // no louder than one that did not reach the target
            loudest = level;
            if (level_db(level) >= target) return i + k;
        }
    }
    return blocks->db[b] >= target ? end : -1;
}

double mean_ahead(const double *db) {
    double sum = 0.0;
    for (int64_t k = 0; k < kLookAhead; ++k) sum += db[k];
    return sum * 0.125;
}

// True when a rise starts in the block at db. Never in an unmeasured one: its 60th percentile would
// have to be kUnmeasured too, and no block is quieter than that.
bool starts_rise(const double *db, double mean, const rise_limits *limits) {
    const double step = mean - kMeanStep;
    const double quiet = step < limits->mid ? step : limits->mid;
    const double loud = limits->p60 - kLoudMargin;
    return db[-2] < quiet && db[-1] < quiet && mean >= loud && db[0] > loud;
}

// Writes the sample of each rise, ascending, and returns how many there are.
int32_t locate_rises(const block_levels *blocks, const rise_limits *limits, int64_t *samples) {
    int32_t count = 0;
    int64_t b = 2;
    while (b < blocks->count) {
        const double mean = mean_ahead(blocks->db + b);
        int64_t sample = -1;
        if (starts_rise(blocks->db + b, mean, limits)) {
            sample = find_sample(blocks, b, (mean + 3.0 * limits->p60) * 0.5);
        }
        if (sample >= 0) samples[count++] = sample;
        b += sample >= 0 ? kRiseApart : 1;
    }
    return count;
}

// sorted: scratch for blocks->count values.
rise_limits take_limits(const block_levels *blocks, double *sorted) {
    for (int64_t b = 0; b < blocks->count; ++b) sorted[b] = blocks->db[b];
    quickSort(0, static_cast<int32_t>(blocks->count - 1), sorted);
    const auto count = static_cast<double>(blocks->count);
    const double p60 = sorted[static_cast<int64_t>(count * 0.6)];
    const double p40 = sorted[static_cast<int64_t>(count * 0.4)];
    return {p60, (p60 + p40) * 0.5};
}

}  // namespace

int32_t detectPowerVariation(const double *signal, int32_t *flags, int64_t n) {
    int64_t *samples = nullptr;
    const int32_t count = find_power_rises({signal, 1.0}, n, &samples);
    for (int32_t k = 0; k < count; ++k) flags[samples[k]] = 1;
    free(samples);
    return count;
}

int32_t find_power_rises(sample_view view, int64_t n, int64_t **samples) {
    *samples = nullptr;
    block_levels blocks = {};
    blocks.view = view;
    blocks.count = n / kBlock + 1;
    if (blocks.count < 3) return 0;

    blocks.db = zeroed_items<double>(blocks.count + kLookAhead);
    auto *sorted = zeroed_items<double>(blocks.count);
    *samples = zeroed_items<int64_t>(blocks.count / kRiseApart + 1);
    int32_t count = TAVO_ERR_MEMORY;
    if (blocks.db != nullptr && sorted != nullptr && *samples != nullptr) {
        std::fill_n(blocks.db + blocks.count, kLookAhead, kUnmeasured);
        measure_block_levels(view, n, blocks.db);
        const rise_limits limits = take_limits(&blocks, sorted);
        count = locate_rises(&blocks, &limits, *samples);
    }
    free(blocks.db);
    free(sorted);
    return count;
}

// Block b is measured over the samples (b - 1) * kBlock + 1 to b * kBlock, from kReach on. The
// decibels of the largest level are the largest decibels, so one logarithm a block is enough; and
// the largest level is the largest measured, or what is held from the block before.
void measure_block_levels(sample_view view, int64_t n, double *db) {
    std::fill_n(db, n / kBlock + 1, kUnmeasured);
    int32_t largest_before = 0;
    for (int64_t b = 1; b * kBlock <= n - kReach; ++b) {
        const int32_t largest = measure_block(view, first_sample(b), b * kBlock);
        const int64_t reach = samples_to_decay(largest_before, largest);
        db[b] = level_db(std::max(largest, held_after(view, b - 1, reach)));
        largest_before = largest;
    }
}
