#include "dsp/stats.h"

#include <cmath>

void getMeanStd(const double *x, int64_t n, double *mean, double *std) {
    const auto count = static_cast<double>(n);
    double sum = 0.0;
    for (int64_t i = 0; i < n; ++i) sum += x[i];
    const double average = sum / count;
    double squares = 0.0;
    for (int64_t i = 0; i < n; ++i) {
        const double deviation = x[i] - average;
        squares += deviation * deviation;
    }
    *mean = average;
    *std = sqrt(squares / count);
}

void getfloatMeanStd(const float *x, int64_t n, float *mean, float *std) {
    const auto count = static_cast<float>(n);
    float sum = 0.0f;
    for (int64_t i = 0; i < n; ++i) sum += x[i];
    const float average = sum / count;
    float squares = 0.0f;
    for (int64_t i = 0; i < n; ++i) {
        const float deviation = x[i] - average;
        squares += deviation * deviation;
    }
    *mean = average;
    *std = sqrtf(squares / count);
}
