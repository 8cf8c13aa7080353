#include "beat/power_rise.h"

#include <algorithm>
#include <cmath>

#include "common/lanes.h"
#include "dsp/sort.h"

namespace {

constexpr int64_t kBlock = 5512;        // samples, half a second at 11025 Hz
constexpr double kUnmeasured = -150.0;  // dB, for a block that is not measured
constexpr int32_t kTopLevel = 32767;    // largest level; levels are 16-bit values
constexpr int32_t kLevelFloor = 1000;   // -30.31 dB; lower levels are raised to it
constexpr int32_t kDecay = 1000;        // a peak loses a thousandth of its level per sample
constexpr int64_t kSumRadius = 5;       // the sum of sample i covers samples i - 5 to i + 4
constexpr int64_t kChunk = 256;         // sums computed in one step; even
static_assert(kBlock % 2 == 0 && kSumRadius % 2 == 1);  // every block has an even number of sums
constexpr int64_t kLookAhead = 8;    // blocks in the mean of the next four seconds
constexpr int64_t kRiseApart = 7;    // blocks from a rise to the next possible one
constexpr double kMeanStep = 4.0;    // dB; the quiet blocks must be this far below the mean ahead
constexpr double kLoudMargin = 3.0;  // dB; the loud part may be this far below the 60th percentile

// The levels of all blocks. Block b consists of the samples (b - 1) * kBlock + 1 to b * kBlock,
// except that block 1 starts at sample kSumRadius.
struct block_levels {
    sample_view view;
    double *db;  // [count + kLookAhead] largest level of each block in dB, or kUnmeasured
    int64_t count;
};

struct rise_limits {
    double p60;  // 60th percentile of the block levels
    double mid;  // halfway between the 40th and the 60th percentile
};

double level_db(int32_t level) {
    return 20.0 * log10((level < kLevelFloor ? kLevelFloor : level) / kFullScale);
}

// Sums the squares of the ten samples around each of the `count` samples from `first` on. Passes
// the sums to `use` in pairs. `count` must be even. The order of the additions is fixed.
template <typename Use>
void for_each_sum(sample_view view, int64_t first, int64_t count, Use use) {
    double squares[kChunk + 2 * kSumRadius] = {};
    for (int64_t done = 0; done < count; done += kChunk) {
        const int64_t part = std::min(kChunk, count - done);
        const int64_t used = part + 2 * kSumRadius - 1;
        scale_samples({view.samples + (first + done - kSumRadius), view.full_scale}, used, squares);
        for (double &square : squares) square *= square;  // the fixed count allows vectorisation
        for (int64_t j = 0; j < part; j += 2) {
            const auto two = [p = squares + j](int64_t k) { return load_pair(p + k); };
            const double_pair sum = two(0) + two(1) + two(2) + two(3) + two(4) + two(5) + two(6) +
                                    two(7) + two(8) + two(9);
            use(sum);
        }
    }
}

// Converts a sum of ten squares to a level, clamped to 0..32767; NaN becomes 0.
int32_t level_of(double sum) {
    const double mean = sum / 10.0 * kFullScale;
    if (!(mean > 0.0)) return 0;
    return mean < kTopLevel ? static_cast<int32_t>(mean) : kTopLevel;
}

// Returns the level of a sample: the level of its sum or *decayed, whichever is larger. *decayed is
// the decayed level of an earlier peak; it is updated for the next sample.
int32_t follow_level(double sum, int32_t *decayed) {
    const int32_t level = std::max(level_of(sum), *decayed);
    *decayed = level - level / kDecay;
    return level;
}

// Returns the number of samples until `level` has decayed to `bottom` or below kLevelFloor. A level
// below kLevelFloor no longer has an effect.
constexpr int64_t samples_to_decay(int32_t level, int32_t bottom) {
    int64_t count = 0;
    for (; level > bottom && level >= kLevelFloor; level -= level / kDecay) ++count;
    return count;
}
constexpr int64_t kLongestDecay = samples_to_decay(kTopLevel, 0);
static_assert(kLongestDecay < kBlock - kSumRadius);

// Returns the decayed level at the end of block `b`, based on its last `count` samples.
int32_t find_decayed_level(sample_view view, int64_t b, int64_t count) {
    int32_t decayed = 0;
    if (b < 1 || count < 1) return decayed;
    count += count % 2;
    for_each_sum(view, b * kBlock + 1 - count, count, [&](double_pair sum) {
        follow_level(sum[0], &decayed);
        follow_level(sum[1], &decayed);
    });
    return decayed;
}

// Returns the level of the largest sum in block `b`. Ignores NaNs and the decay of earlier peaks.
int32_t largest_level(sample_view view, int64_t b) {
    const int64_t first = b == 1 ? kSumRadius : (b - 1) * kBlock + 1;
    double_pair most = {0.0, 0.0};
    for_each_sum(view, first, b * kBlock + 1 - first,
                 [&](double_pair sum) { most = sum > most ? sum : most; });
    return level_of(std::max(most[0], most[1]));
}

// Fills blocks->db. The largest level of a block comes from its largest sum or from a decaying peak
// of the previous block, so each block needs only one conversion to decibels.
void measure_blocks(block_levels *blocks, int64_t n) {
    std::fill_n(blocks->db, blocks->count + kLookAhead, kUnmeasured);
    int32_t largest_before = 0;
    for (int64_t b = 1; b * kBlock <= n - kSumRadius; ++b) {
        const int32_t largest = largest_level(blocks->view, b);
        const int64_t decay = samples_to_decay(largest_before, largest);
        blocks->db[b] = level_db(std::max(largest, find_decayed_level(blocks->view, b - 1, decay)));
        largest_before = largest;
    }
}

// Of the samples (b - 1) * kBlock to b * kBlock, returns the first whose level reaches `target`, or
// -1 if none does. `b` is at least 2. For the first and the last of these samples, uses the largest
// level of their block instead of their own.
int64_t find_sample(const block_levels *blocks, int64_t b, double target) {
    const int64_t start = (b - 1) * kBlock;
    if (blocks->db[b - 1] >= target) return start;
    int32_t decayed = find_decayed_level(blocks->view, b - 1, kLongestDecay);
    int64_t sample = start;
    int64_t found = -1;
    const auto test = [&](double sum) {
        ++sample;
        const int32_t level = follow_level(sum, &decayed);
        if (found < 0 && sample < start + kBlock && level_db(level) >= target) found = sample;
    };
    for_each_sum(blocks->view, start + 1, kBlock, [&](double_pair sum) {
        test(sum[0]);
        test(sum[1]);
    });
    if (found >= 0) return found;
    return blocks->db[b] >= target ? start + kBlock : -1;
}

double mean_ahead(const double *db) {
    double sum = 0.0;
    for (int64_t k = 0; k < kLookAhead; ++k) sum += db[k];
    return sum * 0.125;
}

// True if a rise starts in the block whose level is db[0]. An unmeasured block never qualifies: it
// can exceed `loud` only if p60 is kUnmeasured as well, and then no earlier block is quiet enough.
bool starts_rise(const double *db, double mean, const rise_limits *limits) {
    const double step = mean - kMeanStep;
    const double quiet = step < limits->mid ? step : limits->mid;
    const double loud = limits->p60 - kLoudMargin;
    return db[-2] < quiet && db[-1] < quiet && mean >= loud && db[0] > loud;
}

// Writes the sample where each rise starts, in ascending order. Returns the number of rises.
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

// Computes the limits from the block levels. `sorted` is scratch memory for blocks->count values.
rise_limits compute_limits(const block_levels *blocks, double *sorted) {
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
        measure_blocks(&blocks, n);
        const rise_limits limits = compute_limits(&blocks, sorted);
        count = locate_rises(&blocks, &limits, *samples);
    }
    free(blocks.db);
    free(sorted);
    return count;
}
