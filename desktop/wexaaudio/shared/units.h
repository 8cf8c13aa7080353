// Samples and 100-ns units. A time made from a sample count gives that count back, both rounded
// down and rounded to nearest, so that a position reported is the true sample.
#ifndef WEXAAUDIO_UNITS_H
#define WEXAAUDIO_UNITS_H

#include <cstdint>

constexpr int64_t kUnits = 10'000'000;                   // per second
constexpr int64_t kMaxSamples = INT64_MAX / kUnits / 4;  // far beyond any file; products stay exact

// The first time at which sample (>= 0, sample frames) is the current one: rounded up.
int64_t units_from_samples(int64_t sample, int32_t rate);

// The sample reached by a seek to a time in a stream of end samples: the first that begins at or
// after it. The end itself when the time is after the last sample's start.
int64_t seek_target(int64_t units, int64_t end, int32_t rate);

// A stream's duration: past its last sample by less than half a microsecond, rounded up to a
// multiple of four units, so that a quarter of it still holds a quarter of the samples.
int64_t units_of_duration(int64_t samples, int32_t rate);

#endif
