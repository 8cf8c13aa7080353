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

// The sample that a seek to a time lands on in a stream of end samples: the first that begins at or
// after it, so that the last of several equal parts of a stream never loses its end. The end itself
// when the time lies behind the last sample's start.
inline int64_t seek_target(int64_t units, int64_t end, int32_t rate) {
    if (units <= 0) {
        return 0;
    }
    if (units >= units_from_samples(end, rate)) {
        return end;
    }
    const int64_t sample = samples_from_units(units, rate);
    return units_from_samples(sample, rate) < units ? sample + 1 : sample;
}

// A stream's duration: past its last sample by less than half a microsecond, rounded up to a
// multiple of four units. A stream is decoded in four parts of a quarter of that each, and a
// quarter rounded down must still hold a quarter of the samples.
inline int64_t units_of_duration(int64_t samples, int32_t rate) {
    return (units_from_samples(samples, rate) + 3) / 4 * 4;
}

#endif
