#include "beat/power_rise.h"

#include <cmath>

#include "dsp/sort.h"

namespace {

constexpr int64_t kBlock = 5512;        // samples, half a second at 11025 Hz
constexpr double kUnmeasured = -150.0;  // dB of a block that no sample was measured in
constexpr double kFullScale = 32767.0;
constexpr int32_t kTopLevel = 32767;   // the level is a 16-bit value and stays there
constexpr int32_t kLevelFloor = 1000;  // -30.31 dB
constexpr int32_t kDecay = 1000;       // the held level loses a thousandth per sample
constexpr int64_t kReach = 5;          // samples before, and with the sample itself after
constexpr int64_t kLookAhead = 8;      // blocks in the four-second mean
constexpr int64_t kRiseApart = 7;      // blocks from a rise to the next possible one
constexpr double kMeanStep = 4.0;      // dB the quiet blocks lie below the mean to come
constexpr double kLoudMargin = 3.0;    // dB that the loud part may miss P60 by

struct block_levels {
    double *db;      // [count + kLookAhead] loudest level of each block, the rest kUnmeasured
    int32_t *entry;  // [count] the follower's held level before the block's first sample
    int64_t count;
};

struct rise_limits {
    double p60;
    double mid;  // between the 40th and the 60th percentile
};

double level_db(int32_t level) {
    return 20.0 * log10((level < kLevelFloor ? kLevelFloor : level) / kFullScale);
}

double power(double sample) {
    return sample * sample;
}

// Level of sample i: the power of the ten samples around it, or what an earlier peak has decayed
// to. held is carried from sample to sample.
int32_t follow_level(const double *signal, int64_t i, int32_t *held) {
    const double *x = signal + (i - kReach);
    double sum = power(x[0]);
    for (int32_t k = 1; k < 2 * kReach; ++k) sum += power(x[k]);
    const double mean = sum / 10.0 * kFullScale;

    int32_t value = 0;
    if (mean >= kTopLevel) {
        value = kTopLevel;
    } else if (mean > 0.0) {
        value = static_cast<int32_t>(mean);
    }
    const int32_t level = value >= *held ? value : *held;
    *held = level - level / kDecay;
    return level;
}

// Block b is measured over the samples (b - 1) * kBlock + 1 to b * kBlock, from kReach on. The
// decibels of the largest level are the largest decibels, so one logarithm a block is enough.
void measure_blocks(const double *signal, int64_t n, block_levels *blocks) {
    int32_t held = 0;
    int64_t i = kReach;
    for (int64_t b = 1; b < blocks->count && b * kBlock <= n - kReach; ++b) {
        blocks->entry[b] = held;
        int32_t loudest = 0;
        for (; i <= b * kBlock; ++i) {
            const int32_t level = follow_level(signal, i, &held);
            if (level > loudest) loudest = level;
        }
        blocks->db[b] = level_db(loudest);
    }
}

// First sample among (b - 1) * kBlock to b * kBlock whose decibels reach target, or -1. The two
// boundary samples carry the maxima of their blocks; between them the levels are followed again
// from the block's entry, which spares an array of n of them.
int64_t find_sample(const double *signal, const block_levels *blocks, int64_t b, double target) {
    const int64_t start = (b - 1) * kBlock;
    if (blocks->db[b - 1] >= target) return start;

    int32_t held = blocks->entry[b];
    int32_t loudest = -1;
    for (int64_t i = start + 1; i < start + kBlock; ++i) {
        const int32_t level = follow_level(signal, i, &held);
        if (level <= loudest) continue;  // no louder than one that did not reach the target
        loudest = level;
        if (level_db(level) >= target) return i;
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

int32_t flag_rises(const double *signal, const block_levels *blocks, const rise_limits *limits,
                   int32_t *flags) {
    int32_t count = 0;
    int64_t b = 2;
    while (b < blocks->count) {
        const double mean = mean_ahead(blocks->db + b);
        int64_t sample = -1;
        if (starts_rise(blocks->db + b, mean, limits)) {
            const double target = (mean + 3.0 * limits->p60) * 0.5;
            sample = find_sample(signal, blocks, b, target);
        }
        if (sample >= 0) {
            flags[sample] = 1;
            ++count;
        }
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
    const int64_t count = n / kBlock + 1;
    if (count < 3) return 0;

    block_levels blocks = {zeroed_items<double>(count + kLookAhead), zeroed_items<int32_t>(count),
                           count};
    double *sorted = zeroed_items<double>(count);
    int32_t rises = TAVO_ERR_MEMORY;
    if (blocks.db != nullptr && blocks.entry != nullptr && sorted != nullptr) {
        for (int64_t b = 0; b < count + kLookAhead; ++b) blocks.db[b] = kUnmeasured;
        measure_blocks(signal, n, &blocks);
        const rise_limits limits = take_limits(&blocks, sorted);
        rises = flag_rises(signal, &blocks, &limits, flags);
    }
    free(blocks.db);
    free(blocks.entry);
    free(sorted);
    return rises;
}

int32_t collect_rise_frames(TAVO_BEAT_CTX *beat, int64_t n, int32_t hop_size, int32_t count) {
    if (count < 1 || hop_size < 1) return 0;
    beat->rise_frames = zeroed_items<int32_t>(count);
    if (beat->rise_frames == nullptr) return TAVO_ERR_MEMORY;
    for (int64_t s = 0; s < n && beat->rise_count < count; ++s) {
        if (beat->rise_flags[s] != 0) {
            beat->rise_frames[beat->rise_count] = static_cast<int32_t>(s / hop_size);
            ++beat->rise_count;
        }
    }
    return 0;
}
