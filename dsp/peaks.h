// Peak picking. A peak is an index, neither first nor last, whose value is greater than both of its
// neighbours. The caller owns every array. Callers: highlight/search.h (rising edges of the
// loudness curve), beat/candidates.h (peaks of the onset envelope).
#ifndef TAVO_DSP_PEAKS_H
#define TAVO_DSP_PEAKS_H

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
// Writes at most max_count (0: no limit) to out[min(max_count, len / 2)]. Returns how many it
// wrote.
int32_t findsortedNPeaks(const float *x, int64_t len, uint32_t min_dist, uint32_t max_count,
                         uint32_t *out);

// Finds all peaks in ascending order if min_dist is 0; else largest first, dropping each one closer
// than min_dist to a larger one. out: [len / 2]. Returns how many it wrote.
int32_t findPeaks(const double *x, int64_t len, uint32_t min_dist, int32_t *out);

// Finds the peaks nearest to the priority positions, which are always kept; then the others,
// largest first, dropping each one closer than min_dist to a peak already written. out: [n_priority
// + len / 2]. Returns how many it wrote; -1 if min_dist is 0.
int32_t findPeaksPriority(const double *x, int64_t len, int32_t min_dist, int32_t *out,
                          const int32_t *priority, int32_t n_priority);

// Index of the element of list[n] (ascending) nearest to target; the lower index if two are equally
// near. 0 if n < 2.
int32_t findNearestIndex(const int32_t *list, int32_t target, int32_t n);

// First index at which x[n] equals value; 0 if it does not occur.
int32_t findIndex(const double *x, int32_t n, double value);
}

#endif
