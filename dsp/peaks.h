// Peak picking over plain arrays. A peak is an index i, neither first nor last, whose value is
// greater than both neighbours'. The caller owns every array. Callers: highlight/search.h (rising
// edges of the loudness curve), beat/candidates.h (peaks of the onset envelope).
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

// Finds the peaks of x[len], largest first, without those at most min_dist away from a larger one;
// at most max_count (0: no limit). out: [min(max_count, len / 2)]. Returns how many were
// written.
int32_t findsortedNPeaks(const float *x, int64_t len, uint32_t min_dist, uint32_t max_count,
                         uint32_t *out);

// Finds all peaks in ascending order if min_dist is 0, else largest first, without those closer
// than min_dist to a larger one. out: [len / 2]. Returns how many were written.
int32_t findPeaks(const double *x, int64_t len, uint32_t min_dist, int32_t *out);

// Finds the peaks nearest to the priority positions first, never suppressed, then the others,
// largest first, without those closer than min_dist to an entry before them. out: [n_priority + len
// / 2]. Returns how many were written; -1 if min_dist is 0.
int32_t findPeaksPriority(const double *x, int64_t len, int32_t min_dist, int32_t *out,
                          const int32_t *priority, int32_t n_priority);

// Index of the element of list[n] (ascending) nearest to target; the lower of two equally near. 0
// for n < 2.
int32_t findNearestIndex(const int32_t *list, int32_t target, int32_t n);

// First index of x[n] that equals value, or 0.
int32_t findIndex(const double *x, int32_t n, double value);
}

#endif
