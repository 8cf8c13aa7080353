#include <algorithm>
#include <cmath>
#include <cstring>

#include "pcm/resample_engines.h"

namespace {

constexpr double kPi = 3.141592653589793;
constexpr int32_t kTapsWhole = 20;  // for a ratio within kWholeRatio of a whole number
constexpr int32_t kTapsOther = 19;
constexpr double kWholeRatio = 0.0001;
constexpr double kEdgeDown = 0.9;             // cut-off as a part of the output's Nyquist frequency
constexpr double kEdgeUp = 0.99;              // upper limit, as a part of the input's
constexpr double kCentre = 1e-9;              // nearer to the sinc's centre: its limit value
constexpr double kPhaseSteps = 960.0;         // phases per input sample
constexpr double kMiddlePhase = 480.0;        // the phase without a fractional offset
constexpr double kFracLimit = 0.500001;       // half a sample and some rounding
constexpr float kRatioLimit = 2147483648.0f;  // no pair of rates reaches it

constexpr int32_t kLanes = 4;
constexpr float kSmallFloat = 1073741824.0f;  // 2^30: a little more still fits an int32_t
using vec_f32 = float __attribute__((vector_size(16)));
using vec_i16 = int16_t __attribute__((vector_size(16)));
using vec_i32 = int32_t __attribute__((vector_size(16)));
using vec_i64 = int64_t __attribute__((vector_size(16)));

// Coefficient of tap k for the fractional offset f, cut-off wc. Which steps are single precision
// and which double is part of the result.
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

// What one output frame reads: frames first to first + taps of the input, weighted by row.
struct frame_place {
    int64_t first;
    const float *row;
};

enum class placed { inside, past_end, bad_phase };

placed place_frame(const dorn_resampler_state &state, int64_t j, int32_t in_len,
                   frame_place *place) {
    const float half = static_cast<float>(state.taps) / 2.0f;
    const float pos = state.ratio * static_cast<float>(j);  // single precision on purpose
    const auto base = static_cast<float>(static_cast<int64_t>(pos));
    const float last = (half + base) * static_cast<float>(state.channels);
    if (static_cast<double>(last) >= static_cast<double>(in_len)) return placed::past_end;

    const double middle = static_cast<double>(base) + (state.taps % 2 != 0 ? 0.5 : 0.0);
    const auto frac = static_cast<float>(static_cast<double>(pos) - middle);
    if (std::fabs(static_cast<double>(frac)) > kFracLimit) return placed::bad_phase;
    const double phase = kPhaseSteps * static_cast<double>(frac) + kMiddlePhase + 0.5;

    place->first = static_cast<int64_t>(base) - static_cast<int64_t>(half);
    place->row = state.coef[static_cast<int32_t>(phase)];
    return placed::inside;
}

// The low 16 bits of the sum rounded to the nearest integer, halves up. A larger sum wraps.
int16_t wrap_sample(float acc) {
    constexpr double kInt64Limit = 9.2e18;
    const double value = static_cast<double>(acc) + 0.5;
    if (!(std::fabs(value) < kInt64Limit)) return 0;
    auto rounded = static_cast<int64_t>(value);
    rounded -= static_cast<double>(rounded) > value ? 1 : 0;  // toward minus infinity
    return static_cast<int16_t>(static_cast<uint16_t>(rounded));
}

// One frame, wherever it lies. Places outside the input count as 0.
void filter_frame(const dorn_resampler_state &state, const frame_place &place, const int16_t *in,
                  int32_t in_len, int16_t *out) {
    for (int32_t c = 0; c < state.channels; ++c) {
        float acc = 0.0f;
        for (int32_t k = 0; k <= state.taps; ++k) {
            const int64_t at = (place.first + k) * state.channels + c;
            const bool present = at >= 0 && at < in_len;
            acc += place.row[k] * static_cast<float>(present ? in[at] : 0);
        }
        out[c] = wrap_sample(acc);
    }
}

// Four taps of one frame: its samples as floats, weighted.
vec_f32 weigh_taps(const float *row, const int16_t *in) {
    int64_t four = 0;
    memcpy(&four, in, sizeof four);
    const auto packed = reinterpret_cast<vec_i16>(vec_i64{four, 0});
    const auto twice = __builtin_shufflevector(packed, packed, 0, 0, 1, 1, 2, 2, 3, 3);
    const vec_i32 samples = reinterpret_cast<vec_i32>(twice) >> 16;
    vec_f32 weights;
    memcpy(&weights, row, sizeof weights);
    return weights * __builtin_convertvector(samples, vec_f32);
}

// Whether a lane of the comparison's result is set.
bool any_lane(vec_i32 mask) {
    const auto halves = reinterpret_cast<vec_i64>(mask);
    return (halves[0] | halves[1]) != 0;
}

// wrap_sample of four sums. False, with nothing written, when one of them is too large.
bool wrap_four(vec_f32 acc, int16_t *out) {
    if (any_lane(~((acc > -kSmallFloat) & (acc < kSmallFloat)))) return false;
    vec_i32 rounded = __builtin_convertvector(acc, vec_i32);
    const vec_f32 rest = acc - __builtin_convertvector(rounded, vec_f32);
    rounded += (rest < -0.5f) - (rest >= 0.5f);  // a comparison that holds is -1
    const auto halves = reinterpret_cast<vec_i16>(rounded);
    const auto low =
        reinterpret_cast<vec_i64>(__builtin_shufflevector(halves, halves, 0, 2, 4, 6, 0, 2, 4, 6));
    const int64_t four = low[0];
    memcpy(out, &four, sizeof four);
    return true;
}

// The sums of four mono frames wholly inside the input, side by side. Each lane takes the taps of
// its frame in their order, so it has the bits of filter_frame.
vec_f32 sum_four(int32_t taps, const float *const *row, const int16_t *const *in) {
    vec_f32 acc = {};
    int32_t k = 0;
    for (; k + kLanes <= taps + 1; k += kLanes) {
        const vec_f32 a = weigh_taps(row[0] + k, in[0] + k);
        const vec_f32 b = weigh_taps(row[1] + k, in[1] + k);
        const vec_f32 c = weigh_taps(row[2] + k, in[2] + k);
        const vec_f32 d = weigh_taps(row[3] + k, in[3] + k);
        // From four taps of a frame in a vector to four frames of a tap in a vector.
        const vec_f32 ab_low = __builtin_shufflevector(a, b, 0, 4, 1, 5);
        const vec_f32 ab_high = __builtin_shufflevector(a, b, 2, 6, 3, 7);
        const vec_f32 cd_low = __builtin_shufflevector(c, d, 0, 4, 1, 5);
        const vec_f32 cd_high = __builtin_shufflevector(c, d, 2, 6, 3, 7);
        acc += __builtin_shufflevector(ab_low, cd_low, 0, 1, 4, 5);
        acc += __builtin_shufflevector(ab_low, cd_low, 2, 3, 6, 7);
        acc += __builtin_shufflevector(ab_high, cd_high, 0, 1, 4, 5);
        acc += __builtin_shufflevector(ab_high, cd_high, 2, 3, 6, 7);
    }
    for (; k <= taps; ++k) {
        const vec_i32 samples = {in[0][k], in[1][k], in[2][k], in[3][k]};
        const vec_f32 weights = {row[0][k], row[1][k], row[2][k], row[3][k]};
        acc += weights * __builtin_convertvector(samples, vec_f32);
    }
    return acc;
}

// What four frames from j on read: places and phases as place_frame finds them, in fewer steps.
// False when a frame is not wholly inside the input or its phase may be out of range.
bool place_four(const dorn_resampler_state &state, int64_t j, int32_t in_len, vec_i32 *first,
                vec_i32 *phase) {
    const float last = state.ratio * static_cast<float>(j + kLanes - 1);
    if (j > INT32_MAX - kLanes || last >= kSmallFloat) return false;
    const auto lane0 = static_cast<int32_t>(j);
    const vec_i32 frame = {lane0, lane0 + 1, lane0 + 2, lane0 + 3};
    const vec_f32 pos = state.ratio * __builtin_convertvector(frame, vec_f32);
    const vec_i32 base = __builtin_convertvector(pos, vec_i32);
    const vec_f32 whole = __builtin_convertvector(base, vec_f32);

    // Places ascend: the first and the last speak for all.
    const float half = static_cast<float>(state.taps) / 2.0f;
    *first = base - static_cast<int32_t>(half);
    if ((*first)[0] < 1 || (*first)[3] + state.taps >= in_len) return false;
    if (static_cast<double>(half + whole[3]) >= static_cast<double>(in_len)) return false;

    // Places of 1 and more have at most 23 fractional bits, so the differences are exact, and
    // floor(960 * frac + 480.5) is too when it is worked out in units of 2^-17.
    const vec_f32 frac = pos - whole - (state.taps % 2 != 0 ? 0.5f : 0.0f);
    if (any_lane(frac > 0.5f)) return false;
    const vec_i32 bits = __builtin_convertvector(frac * 8388608.0f, vec_i32);
    *phase = (bits * 15 + (961 << 16)) >> 17;
    return true;
}

// Four mono frames from j on, with the bits of filter_frame. False, with nothing written, when
// place_four cannot place them.
bool filter_four(const dorn_resampler_state &state, int64_t j, const int16_t *in, int32_t in_len,
                 int16_t *out) {
    vec_i32 first;
    vec_i32 phase;
    if (!place_four(state, j, in_len, &first, &phase)) return false;
    const float *const row[kLanes] = {state.coef[phase[0]], state.coef[phase[1]],
                                      state.coef[phase[2]], state.coef[phase[3]]};
    const int16_t *const from[kLanes] = {in + first[0], in + first[1], in + first[2],
                                         in + first[3]};
    const vec_f32 acc = sum_four(state.taps, row, from);
    if (!wrap_four(acc, out)) {
        for (int32_t lane = 0; lane < kLanes; ++lane) out[lane] = wrap_sample(acc[lane]);
    }
    return true;
}

bool usable(const dorn_resampler_state &state) {
    return state.taps >= 0 && state.taps < kResampleRow && state.channels > 0 &&
           state.ratio > 0.0f && state.ratio < kRatioLimit;
}

}  // namespace

int64_t convert_frames(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                       int16_t *out, int64_t max_frames) {
    if (state == nullptr || in == nullptr || out == nullptr || !usable(*state)) return -1;

    const int32_t channels = state->channels;
    placed status = placed::inside;
    int64_t j = 0;
    while (j < max_frames && status == placed::inside) {
        // Near the ends and with several channels, frame by frame.
        if (channels == 1 && j + kLanes <= max_frames &&
            filter_four(*state, j, in, in_len, out + j)) {
            j += kLanes;
            continue;
        }
        frame_place place;
        status = place_frame(*state, j, in_len, &place);
        if (status != placed::inside) break;
        filter_frame(*state, place, in, in_len, out + j * channels);
        ++j;
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
