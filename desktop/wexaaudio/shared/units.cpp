#include "desktop/wexaaudio/shared/units.h"

namespace {

// The sample that is current at a time (>= 0): rounded down.
int64_t samples_from_units(int64_t units, int32_t rate) {
    return units / kUnits * rate + units % kUnits * rate / kUnits;
}

}  // namespace

int64_t units_from_samples(int64_t sample, int32_t rate) {
    const int64_t whole = sample / rate;
    const int64_t part = sample % rate;
    return whole * kUnits + (part * kUnits + rate - 1) / rate;
}

int64_t seek_target(int64_t units, int64_t end, int32_t rate) {
    if (units <= 0) return 0;
    if (units >= units_from_samples(end, rate)) return end;
    const int64_t sample = samples_from_units(units, rate);
    return units_from_samples(sample, rate) < units ? sample + 1 : sample;
}

int64_t units_of_duration(int64_t samples, int32_t rate) {
    return (units_from_samples(samples, rate) + 3) / 4 * 4;
}
