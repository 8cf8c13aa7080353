#include "pcm/resample_sinc.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double kPi = 3.141592653589793;
constexpr int32_t kTapsWhole = 20;  // ratio within kWholeRatio of a whole number
constexpr int32_t kTapsOther = 19;
constexpr double kWholeRatio = 0.0001;
constexpr double kEdgeDown = 0.9;             // cut-off, of the output's Nyquist frequency
constexpr double kEdgeUp = 0.99;              // cut-off limit, of the input's Nyquist frequency
constexpr double kCentre = 1e-9;              // nearer to the sinc's centre: its limit value
constexpr double kPhaseSteps = 960.0;         // phases per input sample
constexpr double kMiddlePhase = 480.0;        // the phase without a fractional offset
constexpr double kFracLimit = 0.500001;       // half a sample and rounding
constexpr float kRatioLimit = 2147483648.0F;  // no rate reaches it
constexpr int32_t kLanes = 4;                 // outputs summed side by side, each in tap order

// Coefficient of tap k for the fractional offset f, cut-off wc. Which steps are single precision
// and which double is part of the result.
float tap_coefficient(int32_t taps, int32_t k, float f, float wc) {
    const auto span = static_cast<float>(taps);
    const float t = std::clamp(static_cast<float>(k) - f, 0.0F, span);
    const float x = t - span / 2.0F;
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

// What one output frame reads: frames first to first + taps of the input, weighted by row.
struct frame_place {
    int64_t first;
    const float *row;
};

enum class placed { inside, past_end, bad_phase };

placed place_frame(const dorn_resampler_state &state, int64_t j, int32_t in_len,
                   frame_place *place) {
    const float half = static_cast<float>(state.taps) / 2.0F;
    const float pos = state.ratio * static_cast<float>(j);  // single precision by design
    const auto base = static_cast<float>(std::floor(static_cast<double>(pos)));
    const float last = (half + base) * static_cast<float>(state.channels);
    if (static_cast<double>(last) >= static_cast<double>(in_len)) return placed::past_end;

    const double middle = static_cast<double>(base) + (state.taps % 2 != 0 ? 0.5 : 0.0);
    const auto frac = static_cast<float>(static_cast<double>(pos) - middle);
    if (std::fabs(static_cast<double>(frac)) > kFracLimit) return placed::bad_phase;
    const double phase = std::floor(kPhaseSteps * static_cast<double>(frac) + kMiddlePhase + 0.5);

    place->first = static_cast<int64_t>(base) - static_cast<int64_t>(half);
    place->row = state.coef[static_cast<int32_t>(phase)];
    return placed::inside;
}

// The low 16 bits of the rounded sum: a sum beyond 16 bits wraps.
int16_t wrap_sample(float acc) {
    constexpr double kInt64Limit = 9.2e18;
    const double rounded = std::floor(static_cast<double>(acc) + 0.5);
    if (!(std::fabs(rounded) < kInt64Limit)) return 0;
    return static_cast<int16_t>(static_cast<uint16_t>(static_cast<int64_t>(rounded)));
}

// Any frame: places outside the input count as 0.
void filter_edge(const dorn_resampler_state &state, const frame_place &place, const int16_t *in,
                 int32_t in_len, int16_t *out) {
    for (int32_t c = 0; c < state.channels; ++c) {
        float acc = 0.0F;
        for (int32_t k = 0; k <= state.taps; ++k) {
            const int64_t at = (place.first + k) * state.channels + c;
            const bool present = at >= 0 && at < in_len;
            acc += place.row[k] * static_cast<float>(present ? in[at] : 0);
        }
        out[c] = wrap_sample(acc);
    }
}

// kLanes mono frames wholly inside the input. A sum waits for the one before it at every tap: four
// of them in flight fill that time.
void filter_inside(int32_t taps, const frame_place *place, const int16_t *in, int16_t *out) {
    const int16_t *const in0 = in + place[0].first;
    const int16_t *const in1 = in + place[1].first;
    const int16_t *const in2 = in + place[2].first;
    const int16_t *const in3 = in + place[3].first;
    float acc0 = 0.0F;
    float acc1 = 0.0F;
    float acc2 = 0.0F;
    float acc3 = 0.0F;
    for (int32_t k = 0; k <= taps; ++k) {
        acc0 += place[0].row[k] * static_cast<float>(in0[k]);
        acc1 += place[1].row[k] * static_cast<float>(in1[k]);
        acc2 += place[2].row[k] * static_cast<float>(in2[k]);
        acc3 += place[3].row[k] * static_cast<float>(in3[k]);
    }
    out[0] = wrap_sample(acc0);
    out[1] = wrap_sample(acc1);
    out[2] = wrap_sample(acc2);
    out[3] = wrap_sample(acc3);
}

bool usable(const dorn_resampler_state &state) {
    return state.taps >= 0 && state.taps < kResampleRow && state.channels > 0 &&
           state.ratio > 0.0F && state.ratio < kRatioLimit;
}

}  // namespace

int64_t convert_frames(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                       int16_t *out, int64_t max_frames) {
    if (state == nullptr || in == nullptr || out == nullptr || !usable(*state)) return -1;

    const int32_t channels = state->channels;
    placed status = placed::inside;
    int64_t j = 0;
    while (j < max_frames && status == placed::inside) {
        frame_place place[kLanes];
        int32_t lanes = 0;
        while (lanes < kLanes && j + lanes < max_frames) {
            status = place_frame(*state, j + lanes, in_len, &place[lanes]);
            if (status != placed::inside) break;
            ++lanes;
        }
        // Places ascend, so the first and the last tell for all.
        if (channels == 1 && lanes == kLanes && place[0].first >= 0 &&
            place[kLanes - 1].first + state->taps < in_len) {
            filter_inside(state->taps, place, in, out + j);
        } else {
            for (int32_t lane = 0; lane < lanes; ++lane) {
                filter_edge(*state, place[lane], in, in_len, out + (j + lane) * channels);
            }
        }
        j += lanes;
    }
    return status == placed::bad_phase ? -1 : j * channels;
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
