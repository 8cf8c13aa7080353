// Mean and population standard deviation, in two passes in index order. NaN for n = 0. Callers:
// beat/onset_envelope.h (doubles), highlight/search.h (floats).
#ifndef TAVO_DSP_STATS_H
#define TAVO_DSP_STATS_H

#include <cstdint>

extern "C" {

void getMeanStd(const double *x, int64_t n, double *mean, double *std);
// Sums, divides and takes the root in single precision.
void getfloatMeanStd(const float *x, int64_t n, float *mean, float *std);
}

#endif
