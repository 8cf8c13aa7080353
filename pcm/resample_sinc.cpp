#include "pcm/resample_sinc.h"

#include <algorithm>
#include <cmath>

#include "pcm/sinc_quad.h"

namespace {

constexpr double kPi = 3.141592653589793;
constexpr int32_t kTapsWhole = 20;  // for a ratio within kWholeRatio of a whole number
constexpr int32_t kTapsOther = 19;
constexpr double kWholeRatio = 0.0001;
constexpr double kEdgeDown = 0.9;        // cut-off relative to the output's Nyquist frequency
constexpr double kEdgeUp = 0.99;         // cut-off limit relative to the input's Nyquist frequency
constexpr double kCentre = 1e-9;         // below this distance, the sinc takes its limit value
constexpr double kPhaseSteps = 960.0;    // phases per input sample
constexpr double kMiddlePhase = 480.0;   // the phase whose fractional offset is 0
constexpr double kFracLimit = 0.500001;  // half a sample, with a margin for rounding
constexpr float kRatioLimit = 2147483648.0f;  // far above the ratio of any real rates

// Returns the coefficient of tap `k` for the fractional offset `f` and the cut-off `wc`. The mix of
// single and double precision is part of the result.
float tap_coefficient(int32_t taps, int32_t k, float f, float wc) {
    const auto span = static_cast<float>(taps);
    const float t = std::clamp(static_cast<float>(k) - f, 0.0f, span);
    const float x = t - span / 2.0f;
    if (std::fabs(static_cast<double>(x)) < kCentre) {
        return static_cast<float>(static_cast<double>(wc) / kPi);
    }
    const auto td = static_cast<double>(t);
    const auto xd = static_cast<double>(x);
    const auto w = static_cast<float>(0.42 - 0.5 * std::cos(2.0 * kPi * td / taps) +
                                      0.08 * std::cos(4.0 * kPi * td / taps));
    const double sinc = std::sin(xd * static_cast<double>(wc)) / (kPi * xd);
    return static_cast<float>(sinc * static_cast<double>(w));
}

// The input of one output frame: input frames `first` to `first` + taps, weighted by `row`.
struct frame_input {
    int64_t first;
    const float *row;
};

enum class status { inside, past_end, bad_phase };

status find_input(const dorn_resampler_state &state, int64_t j, int32_t in_len,
                  frame_input *input) {
    const float half = static_cast<float>(state.taps) / 2.0f;
    const float pos = state.ratio * static_cast<float>(j);  // single precision on purpose
    const auto base = static_cast<float>(static_cast<int64_t>(pos));
    const float last = (half + base) * static_cast<float>(state.channels);
    if (static_cast<double>(last) >= static_cast<double>(in_len)) return status::past_end;

    const double middle = static_cast<double>(base) + (state.taps % 2 != 0 ? 0.5 : 0.0);
    const auto frac = static_cast<float>(static_cast<double>(pos) - middle);
    if (std::fabs(static_cast<double>(frac)) > kFracLimit) return status::bad_phase;
    const double phase = kPhaseSteps * static_cast<double>(frac) + kMiddlePhase + 0.5;

    input->first = static_cast<int64_t>(base) - static_cast<int64_t>(half);
    input->row = state.coef[static_cast<int32_t>(phase)];
    return status::inside;
}

// Computes one output frame. Samples outside the input count as 0.
void filter_frame(const dorn_resampler_state &state, const frame_input &input, const int16_t *in,
                  int32_t in_len, int16_t *out) {
    for (int32_t c = 0; c < state.channels; ++c) {
        float acc = 0.0f;
        for (int32_t k = 0; k <= state.taps; ++k) {
            const int64_t index = (input.first + k) * state.channels + c;
            const bool present = index >= 0 && index < in_len;
            acc += input.row[k] * static_cast<float>(present ? in[index] : 0);
        }
        out[c] = wrap_sample(acc);
    }
}

bool is_usable(const dorn_resampler_state &state) {
    return state.taps >= 0 && state.taps < kResampleRow && state.channels > 0 &&
           state.ratio > 0.0f && state.ratio < kRatioLimit;
}

}  // namespace

int16_t wrap_sample(float sum) {
    constexpr double kInt64Limit = 9.2e18;
    const double value = static_cast<double>(sum) + 0.5;
    if (!(std::fabs(value) < kInt64Limit)) return 0;
    auto rounded = static_cast<int64_t>(value);
    rounded -= static_cast<double>(rounded) > value ? 1 : 0;  // round toward minus infinity
    return static_cast<int16_t>(static_cast<uint16_t>(rounded));
}

int64_t convert_frames(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                       int16_t *out, int64_t max_frames) {
    if (state == nullptr || in == nullptr || out == nullptr || !is_usable(*state)) return -1;

    const int32_t channels = state->channels;
    status found = status::inside;
    int64_t j = 0;
    while (j < max_frames) {
        // Near the ends, and with several channels, output frames are computed one at a time.
        if (channels == 1 && j + kQuad <= max_frames &&
            filter_quad(*state, j, in, in_len, out + j)) {
            j += kQuad;
            continue;
        }
        frame_input input;
        found = find_input(*state, j, in_len, &input);
        if (found != status::inside) break;
        filter_frame(*state, input, in, in_len, out + j * channels);
        ++j;
    }
    return found == status::bad_phase ? -1 : j * channels;
}

int32_t dorn_resampler_prepare(dorn_resampler_state *state, int32_t source_rate,
                               int32_t target_rate, int32_t channels) {
    if (state == nullptr || target_rate < 1) return -1;
    const float ratio = static_cast<float>(source_rate) / static_cast<float>(target_rate);
    state->ratio = ratio;
    if (ratio == 0.0f) return -1;

    const auto r = static_cast<double>(ratio);
    const bool whole = std::fabs(r - std::floor(r + 0.5)) < kWholeRatio;
    state->taps = whole ? kTapsWhole : kTapsOther;
    state->channels = channels;
    const auto fc = static_cast<float>(std::min(kEdgeDown / r, kEdgeUp));
    const auto wc = static_cast<float>(static_cast<double>(fc) * kPi);
    for (int32_t p = 0; p < kResamplePhases; ++p) {
        const auto f = static_cast<float>((p - kMiddlePhase) / kPhaseSteps);
        for (int32_t k = 0; k <= state->taps; ++k) {
            state->coef[p][k] = tap_coefficient(state->taps, k, f, wc);
        }
    }
    return 0;
}

int32_t dorn_resampler_convert(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                               int16_t *out) {
    if (state == nullptr || state->channels < 1) return -1;
    return static_cast<int32_t>(
        convert_frames(state, in, in_len, out, INT32_MAX / state->channels));
}
