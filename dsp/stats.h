// Computes the mean and the population standard deviation in two passes, in index order. Both are
// NaN if n is 0. Used by beat/onset_envelope.h (doubles) and highlight/search.h (floats).
#pragma once

#include <cstdint>

extern "C" {

void getMeanStd(const double *x, int64_t n, double *mean, double *std);
// Computes sums, quotients and the square root in single precision.
void getfloatMeanStd(const float *x, int64_t n, float *mean, float *std);
}
