// Comparators for qsort and an in-place quicksort of doubles. The comparators never report
// equality. Used by dsp/peaks.h and beat/power_rise.h.
#pragma once

#include <cstdint>

extern "C" {

int compare_peak_f(const void *a, const void *b);  // PEAK_INFO_F, descending by value
int compare_peak(const void *a, const void *b);    // PEAK_INFO, descending by value
int compare_value(const void *a, const void *b);   // double, ascending
int compare_fvalue(const void *a, const void *b);  // float, ascending
int compare_ivalue(const void *a, const void *b);  // int32_t, ascending

// Sorts a[lo .. hi], both ends inclusive, in ascending order.
void quickSort(int32_t lo, int32_t hi, double *a);

// Moves a[lo] to its sorted position among a[lo .. hi] and returns that position.
int32_t partition(int32_t lo, int32_t hi, double *a);

// Exchanges two 8-byte values.
void swap(void *a, void *b);
}
