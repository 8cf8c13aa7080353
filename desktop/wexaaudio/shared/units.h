// Converts between samples and 100-ns units. A time computed from a sample count converts back to
// the same count, rounded down or to nearest, so a reported position is exact.
#ifndef WEXAAUDIO_UNITS_H
#define WEXAAUDIO_UNITS_H

#include <cstdint>

constexpr int64_t kUnits = 10'000'000;                   // per second
constexpr int64_t kMaxSamples = INT64_MAX / kUnits / 4;  // products of them cannot overflow

// Start of a sample (>= 0, sample frames) in 100-ns units, rounded up.
int64_t units_from_samples(int64_t sample, int32_t rate);

// The sample that a seek to a time reaches in a stream of `end` samples: the first that begins at
// or after that time, or `end` if the time is after the start of the last sample.
int64_t seek_target(int64_t units, int64_t end, int32_t rate);

// Duration of a stream, rounded up to a multiple of four units, so that a quarter of the duration
// contains a quarter of the samples.
int64_t units_of_duration(int64_t samples, int32_t rate);

#endif
