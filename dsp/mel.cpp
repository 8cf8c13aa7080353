#include "dsp/mel.h"

#include <cmath>

namespace {

constexpr float kBreakHz = 1000.0f;
constexpr float kBreakMel = 15.0f;
constexpr float kHzPerMel = 66.6667f;             // below the break
constexpr double kLogStep = 0.06877952768077182;  // above it: ln of the frequency ratio per mel

}  // namespace

float Hz2Mel(float hz) {
    if (hz < kBreakHz) return hz / kHzPerMel;
    const auto log_ratio = static_cast<float>(log(static_cast<double>(hz) / 1000.0));
    return static_cast<float>(static_cast<double>(log_ratio) / kLogStep + 15.0);
}

float Mel2Hz(float mel) {
    if (mel < kBreakMel) return mel * kHzPerMel;
    const float steps = mel - kBreakMel;
    const auto ratio = static_cast<float>(exp(static_cast<double>(steps) * kLogStep));
    return ratio * kBreakHz;
}
