// Converts between samples and 100-ns units. A time computed from a sample count converts back to
// the same count, whether the result is rounded down or to nearest. Reported positions are exact.
#pragma once

#include <cstdint>

constexpr int64_t kUnits = 10'000'000;                   // per second
constexpr int64_t kMaxSamples = INT64_MAX / kUnits / 4;  // products with kUnits cannot overflow

// Returns the start time of a sample (>= 0) in 100-ns units, rounded up.
int64_t units_from_samples(int64_t sample, int32_t rate);

// Returns the sample that a seek to `units` reaches in a stream of `end` samples: the first one
// that starts at or after that time, or `end` if none does.
int64_t seek_target(int64_t units, int64_t end, int32_t rate);

// Returns the duration of a stream in 100-ns units, rounded up to a multiple of four so that a
// quarter of the duration contains a quarter of the samples.
int64_t units_of_duration(int64_t samples, int32_t rate);
