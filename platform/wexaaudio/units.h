// Samples and 100-ns units. A time made from a sample count gives that count back, both rounded
// down and rounded to nearest, so that a position reported is the true sample.
#ifndef WEXAAUDIO_UNITS_H
#define WEXAAUDIO_UNITS_H

#include <cstdint>

constexpr int64_t kUnits = 10'000'000;                   // per second
constexpr int64_t kMaxSamples = INT64_MAX / kUnits / 4;  // far beyond any file; products stay exact

// The first time at which sample (>= 0, sample frames) is the current one: rounded up.
inline int64_t units_from_samples(int64_t sample, int32_t rate) {
    const int64_t whole = sample / rate;
    const int64_t part = sample % rate;
    return whole * kUnits + (part * kUnits + rate - 1) / rate;
}

// The sample that is current at a time (>= 0): rounded down.
inline int64_t samples_from_units(int64_t units, int32_t rate) {
    return units / kUnits * rate + units % kUnits * rate / kUnits;
}

#endif
