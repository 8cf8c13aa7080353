// Finds peaks. A peak is an index, neither the first nor the last, whose value is greater than both
// neighbouring values. The caller owns every array. Used by highlight/search.h for the rising edges
// of the loudness curve and by beat/candidates.h for the peaks of the onset envelope.
#pragma once

#include <cstddef>
#include <cstdint>

struct PEAK_INFO {
    double value;
    int32_t index;  // position in the input
};
struct PEAK_INFO_F {
    float value;
    uint32_t index;  // position in the input
};
static_assert(offsetof(PEAK_INFO, index) == 8 && sizeof(PEAK_INFO_F) == 8);

extern "C" {

// Finds the peaks of x[len], largest first, and drops each one within min_dist of a larger one.
// Writes at most max_count peaks to `out`, or all if max_count is 0; `out` needs at most len / 2
// entries. Returns the number of peaks written.
int32_t findsortedNPeaks(const float *x, int64_t len, uint32_t min_dist, uint32_t max_count,
                         uint32_t *out);

// If min_dist is 0, finds all peaks in index order. Otherwise, finds them largest first and drops
// each one closer than min_dist to a larger one. Writes them to out[len / 2] and returns how many
// it wrote.
int32_t findPeaks(const double *x, int64_t len, uint32_t min_dist, int32_t *out);

// For each priority position, first writes the nearest peak, unless it is the last peak of x. Then
// writes the other peaks, largest first, dropping each one closer than min_dist to a peak already
// written. `out` has n_priority + len / 2 entries. Returns the number of peaks written, or -1 if
// min_dist is 0.
int32_t findPeaksPriority(const double *x, int64_t len, int32_t min_dist, int32_t *out,
                          const int32_t *priority, int32_t n_priority);

// Returns the index of the element of list[n] (ascending) that is nearest to `target`, or the lower
// index if two are equally near. Returns 0 if `n` is less than 2.
int32_t findNearestIndex(const int32_t *list, int32_t target, int32_t n);

// Returns the first index at which x[n] equals `value`, or 0 if the value does not occur.
int32_t findIndex(const double *x, int32_t n, double value);
}
