#include "dsp/sort.h"

#include <cstring>

#include "dsp/peaks.h"

int compare_peak_f(const void *a, const void *b) {
    const float left = static_cast<const PEAK_INFO_F *>(a)->value;
    const float right = static_cast<const PEAK_INFO_F *>(b)->value;
    return left > right ? -1 : 1;
}

int compare_peak(const void *a, const void *b) {
    const double left = static_cast<const PEAK_INFO *>(a)->value;
    const double right = static_cast<const PEAK_INFO *>(b)->value;
    return left > right ? -1 : 1;
}

int compare_value(const void *a, const void *b) {
    return *static_cast<const double *>(a) > *static_cast<const double *>(b) ? 1 : -1;
}

int compare_fvalue(const void *a, const void *b) {
    return *static_cast<const float *>(a) > *static_cast<const float *>(b) ? 1 : -1;
}

int compare_ivalue(const void *a, const void *b) {
    return *static_cast<const int32_t *>(a) > *static_cast<const int32_t *>(b) ? 1 : -1;
}

void swap(void *a, void *b) {
    char copy[8];
    memcpy(copy, a, sizeof copy);
    memmove(a, b, sizeof copy);
    memcpy(b, copy, sizeof copy);
}

int32_t partition(int32_t lo, int32_t hi, double *a) {
    const double pivot = a[lo];
    int64_t i = lo;
    int64_t j = static_cast<int64_t>(hi) + 1;
    for (;;) {
        while (i < j && a[i] <= pivot) ++i;
        do {
            --j;
        } while (j > lo && a[j] > pivot);
        if (i >= j) break;
        swap(&a[i], &a[j]);
    }
    swap(&a[lo], &a[j]);
    return static_cast<int32_t>(j);
}

// Recursing only into the smaller part limits the depth to log2 of the length. The two parts are
// independent, so the result does not depend on which is sorted first.
void quickSort(int32_t lo, int32_t hi, double *a) {
    while (lo < hi) {
        const int32_t middle = partition(lo, hi, a);
        if (middle - lo < hi - middle) {
            quickSort(lo, middle - 1, a);
            lo = middle + 1;
        } else {
            quickSort(middle + 1, hi, a);
            hi = middle - 1;
        }
    }
}
