#include "desktop/wexaaudio/shared/units.h"

int64_t units_from_samples(int64_t sample, int32_t rate) {
    const int64_t whole = sample / rate;
    const int64_t part = sample % rate;
    return whole * kUnits + (part * kUnits + rate - 1) / rate;
}

int64_t seek_target(int64_t units, int64_t end, int32_t rate) {
    if (units <= 0) return 0;
    if (units >= units_from_samples(end, rate)) return end;
    // The time of a sample is rounded up, so the wanted sample is the first one that starts after
    // the time units - 1.
    const int64_t before = units - 1;
    return before / kUnits * rate + before % kUnits * rate / kUnits + 1;
}

int64_t units_of_duration(int64_t samples, int32_t rate) {
    return (units_from_samples(samples, rate) + 3) / 4 * 4;
}
