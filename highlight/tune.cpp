#include "highlight/tune.h"

#include "highlight/power_envelope.h"

namespace {

constexpr double kWindowSeconds = 1.2;
constexpr double kHopSeconds = 0.4;
constexpr int64_t kSpanSeconds = 12;   // from the start of the first window to the end of the last
constexpr int64_t kBeforeMs = 3000;    // the first window starts this long before the coarse start
constexpr int64_t kMinAfterMs = 9000;  // audio required after the coarse start
constexpr int64_t kEarliest = -999;    // minimum of begin_ms * rate: less than one sample before 0
constexpr int64_t kMaxFrames = 64;     // windows: 27 at the usual rates, at most 44 at any rate
constexpr int64_t kRiseFrames = 5;     // windows averaged after the start of a rise
constexpr float kMinRise = 0.13f;

// Loudness windows around the coarse start.
struct frame_plan {
    int64_t first;   // sample where window 0 starts
    int64_t window;  // samples
    int64_t hop;     // samples
    int64_t count;
};

frame_plan plan_frames(int32_t rate, uint32_t start_ms) {
    frame_plan frames = {};
    frames.first = (static_cast<int64_t>(start_ms) - kBeforeMs) * rate / 1000;
    frames.window = static_cast<int64_t>(kWindowSeconds * rate);
    frames.hop = static_cast<int64_t>(kHopSeconds * rate);
    if (frames.hop > 0) frames.count = (kSpanSeconds * rate - frames.window) / frames.hop;
    if (frames.count > kMaxFrames) frames.count = 0;
    return frames;
}

void measure_frames(const int16_t *pcm, const frame_plan *frames, float *power) {
    const int16_t *first = pcm + frames->first;
    if (frames->window == 3 * frames->hop) {
        overlapping_powers(first, frames->hop, frames->count, power);
        return;
    }
    for (int64_t k = 0; k < frames->count; ++k) {
        power[k] = window_power(first + k * frames->hop, frames->window);
    }
}

// Returns the index of the window before the largest rise, or before the first of several equal
// ones. Returns -1 if no rise exceeds kMinRise.
int64_t largest_rise(const float *power, int64_t count) {
    int64_t best = -1;
    float best_rise = kMinRise;
    for (int64_t i = 0; i + kRiseFrames < count; ++i) {
        const float *e = power + i;
        const float rise = (e[1] + e[2] + e[3] + e[4] + e[5]) / 5.0f - e[0];
        if (rise > best_rise) {
            best_rise = rise;
            best = i;
        }
    }
    return best;
}

// Returns the index of the smallest of the kRiseFrames steps from `frame` on, the first if several
// are equal.
int64_t smallest_step(const float *power, int64_t frame) {
    int64_t best = frame;
    float best_step = power[frame + 1] - power[frame];
    for (int64_t j = frame + 1; j < frame + kRiseFrames; ++j) {
        const float step = power[j + 1] - power[j];
        if (step < best_step) {
            best_step = step;
            best = j;
        }
    }
    return best;
}

}  // namespace

uint32_t _tune_HL_simple(const int16_t *pcm, int32_t rate, uint32_t start_ms, uint32_t duration_s) {
    const auto begin_ms = static_cast<int64_t>(start_ms) - kBeforeMs;
    if (rate <= 0 || begin_ms * rate < kEarliest) return start_ms;
    if (static_cast<int64_t>(duration_s) * 1000 - start_ms < kMinAfterMs) return start_ms;
    const frame_plan frames = plan_frames(rate, start_ms);
    if (frames.count - kRiseFrames < 1) return start_ms;

    float power[kMaxFrames];
    measure_frames(pcm, &frames, power);
    const int64_t rise = largest_rise(power, frames.count);
    if (rise < 0) return start_ms;
    const int64_t j = smallest_step(power, rise);
    const auto tuned =
        static_cast<double>(j) * kHopSeconds * 1000.0 + static_cast<double>(begin_ms);
    return static_cast<uint32_t>(static_cast<int64_t>(tuned));
}

int64_t tune_end(int32_t rate, uint32_t start_ms) {
    const frame_plan frames = plan_frames(rate, start_ms);
    if (frames.count < 1) return 0;
    return frames.first + (frames.count - 1) * frames.hop + frames.window;
}
