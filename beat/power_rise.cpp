#include "beat/power_rise.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "dsp/lanes.h"
#include "dsp/sort.h"

namespace {

typedef int32_t int_pair __attribute__((vector_size(8)));

constexpr int64_t kBlock = 5512;               // samples, half a second at 11025 Hz
constexpr double kUnmeasured = -150.0;         // dB of a block that no sample was measured in
constexpr int32_t kTopLevel = 32767;           // the level is a 16-bit value and stays there
constexpr int32_t kLevelFloor = 1000;          // -30.31 dB
constexpr int32_t kDecay = 1000;               // the held level loses a thousandth per sample
constexpr int64_t kReach = 5;                  // samples before, and with the sample itself after
constexpr int64_t kStep = 4;                   // samples measured at a time
constexpr int64_t kSpan = 2 * kReach + kStep;  // squares around the last ones
constexpr int64_t kLookAhead = 8;              // blocks in the four-second mean
constexpr int64_t kRiseApart = 7;              // blocks from a rise to the next possible one
constexpr double kMeanStep = 4.0;              // dB the quiet blocks lie below the mean to come
constexpr double kLoudMargin = 3.0;            // dB that the loud part may miss P60 by

struct block_levels {
    sample_view view;
    double *db;         // [count + kLookAhead] loudest level of each block, the rest kUnmeasured
    int32_t *entry;     // [count] the follower's held level before the block's first sample
    double *squares;    // [kBlock + kSpan] of one block's samples and their neighbours
    int32_t *measured;  // [kBlock + kStep] what one block's samples measure
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
    for (int64_t i = 0; i + 1 < count; i += 2) {
        const double_pair sample = load_pair(squares + i);
        store_pair(squares + i, sample * sample);
    }
    if (count % 2 != 0) squares[count - 1] *= squares[count - 1];
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

// measured[j] from the ten squares from j on, which are added in their order; kStep at a time, the
// last ones beyond count.
void measure_samples(const double *squares, int64_t count, int32_t *measured) {
    for (int64_t j = 0; j < count; j += kStep) {
        const auto two = [=](int64_t k) { return load_pair(squares + j + k); };
        const double_pair low =
            two(0) + two(1) + two(2) + two(3) + two(4) + two(5) + two(6) + two(7) + two(8) + two(9);
        const double_pair high = two(2) + two(3) + two(4) + two(5) + two(6) + two(7) + two(8) +
                                 two(9) + two(10) + two(11);
        const int_pair levels[] = {mean_levels(low), mean_levels(high)};
        memcpy(measured + j, levels, sizeof levels);
    }
}

// Measures the samples from first to the end of block b. Returns how many.
int64_t measure_block(const block_levels *blocks, int64_t first, int64_t b) {
    const int64_t count = b * kBlock - first + 1;
    take_squares(blocks->view, first - kReach, count + 2 * kReach - 1, blocks->squares);
    measure_samples(blocks->squares, count, blocks->measured);
    return count;
}

// The level of a sample: what it measures, or what an earlier peak has decayed to. held is carried
// from sample to sample.
int32_t follow_level(int32_t measured, int32_t *held) {
    const int32_t level = measured >= *held ? measured : *held;
    *held = level - level / kDecay;
    return level;
}

// Block b is measured over the samples (b - 1) * kBlock + 1 to b * kBlock, from kReach on. The
// decibels of the largest level are the largest decibels, so one logarithm a block is enough.
void measure_blocks(int64_t n, block_levels *blocks) {
    int32_t held = 0;
    int64_t first = kReach;
    for (int64_t b = 1; b < blocks->count && b * kBlock <= n - kReach; ++b) {
        blocks->entry[b] = held;
        const int64_t count = measure_block(blocks, first, b);
        int32_t loudest = 0;
        for (int64_t i = 0; i < count; ++i) {
            const int32_t level = follow_level(blocks->measured[i], &held);
            if (level > loudest) loudest = level;
        }
        blocks->db[b] = level_db(loudest);
        first = b * kBlock + 1;
    }
}

// First sample among (b - 1) * kBlock to b * kBlock whose decibels reach target, or -1. The two
// boundary samples carry the maxima of their blocks; between them the levels are followed again
// from the block's entry, which spares an array of n of them.
int64_t find_sample(const block_levels *blocks, int64_t b, double target) {
    const int64_t start = (b - 1) * kBlock;
    if (blocks->db[b - 1] >= target) return start;

    int32_t held = blocks->entry[b];
    int32_t loudest = -1;
    measure_block(blocks, start + 1, b);
    for (int64_t i = 1; i < kBlock; ++i) {
        const int32_t level = follow_level(blocks->measured[i - 1], &held);
        if (level <= loudest) continue;  // no louder than one that did not reach the target
        loudest = level;
        if (level_db(level) >= target) return start + i;
    }
    return blocks->db[b] >= target ? start + kBlock : -1;
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

bool obtain_levels(block_levels *blocks) {
    blocks->db = zeroed_items<double>(blocks->count + kLookAhead);
    blocks->entry = zeroed_items<int32_t>(blocks->count);
    blocks->squares = zeroed_items<double>(kBlock + kSpan);
    blocks->measured = zeroed_items<int32_t>(kBlock + kStep);
    return blocks->db != nullptr && blocks->entry != nullptr && blocks->squares != nullptr &&
           blocks->measured != nullptr;
}

void release_levels(block_levels *blocks) {
    free(blocks->db);
    free(blocks->entry);
    free(blocks->squares);
    free(blocks->measured);
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

    double *sorted = zeroed_items<double>(blocks.count);
    *samples = zeroed_items<int64_t>(blocks.count / kRiseApart + 1);
    int32_t count = TAVO_ERR_MEMORY;
    if (obtain_levels(&blocks) && sorted != nullptr && *samples != nullptr) {
        std::fill_n(blocks.db, blocks.count + kLookAhead, kUnmeasured);
        measure_blocks(n, &blocks);
        const rise_limits limits = take_limits(&blocks, sorted);
        count = locate_rises(&blocks, &limits, *samples);
    }
    free(sorted);
    release_levels(&blocks);
    return count;
}
