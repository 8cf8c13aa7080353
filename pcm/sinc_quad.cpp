#include "pcm/sinc_quad.h"

#include "common/lanes.h"

namespace {

constexpr float kSmallFloat = 1073741824.0f;  // 2^30; rounded values below it fit an int32_t

// Converts four input samples of one output frame to floats and multiplies them by their weights.
float_quad weigh_taps(const float *row, const int16_t *in) {
    int64_t four = 0;
    memcpy(&four, in, sizeof four);
    const auto packed = reinterpret_cast<int16_octet>(int64_pair{four, 0});
    const auto twice = __builtin_shufflevector(packed, packed, 0, 0, 1, 1, 2, 2, 3, 3);
    const int_quad samples = reinterpret_cast<int_quad>(twice) >> 16;
    float_quad weights;
    memcpy(&weights, row, sizeof weights);
    return weights * __builtin_convertvector(samples, float_quad);
}

// True if any lane of a comparison's result is set.
bool any_lane(int_quad mask) {
    const auto halves = reinterpret_cast<int64_pair>(mask);
    return (halves[0] | halves[1]) != 0;
}

// Applies wrap_sample to four sums. Returns false and writes nothing if any of them is too large.
bool wrap_quad(float_quad acc, int16_t *out) {
    if (any_lane(~((acc > -kSmallFloat) & (acc < kSmallFloat)))) return false;
    int_quad rounded = __builtin_convertvector(acc, int_quad);
    const float_quad rest = acc - __builtin_convertvector(rounded, float_quad);
    rounded += (rest < -0.5f) - (rest >= 0.5f);  // in a vector, true is -1
    const auto halves = reinterpret_cast<int16_octet>(rounded);
    const auto low = reinterpret_cast<int64_pair>(
        __builtin_shufflevector(halves, halves, 0, 2, 4, 6, 0, 2, 4, 6));
    const int64_t four = low[0];
    memcpy(out, &four, sizeof four);
    return true;
}

// Computes the sums of four output frames, one in each lane. A lane adds the taps of its frame in
// the same order as filter_frame. The taps of a frame are adjacent in memory, so each step of four
// taps is transposed:
//
//      loaded             interleaved              added to acc in turn
//   a  a0 a1 a2 a3   ab_low   a0 b0 a1 b1   tap 0  a0 b0 c0 d0
//   b  b0 b1 b2 b3   ab_high  a2 b2 a3 b3   tap 1  a1 b1 c1 d1
//   c  c0 c1 c2 c3   cd_low   c0 d0 c1 d1   tap 2  a2 b2 c2 d2
//   d  d0 d1 d2 d3   cd_high  c2 d2 c3 d3   tap 3  a3 b3 c3 d3
//
float_quad sum_quad(int32_t taps, const float *const *row, const int16_t *const *in) {
    float_quad acc = {};
    int32_t k = 0;
    for (; k + kQuad <= taps + 1; k += kQuad) {
        const float_quad a = weigh_taps(row[0] + k, in[0] + k);
        const float_quad b = weigh_taps(row[1] + k, in[1] + k);
        const float_quad c = weigh_taps(row[2] + k, in[2] + k);
        const float_quad d = weigh_taps(row[3] + k, in[3] + k);
        const float_quad ab_low = __builtin_shufflevector(a, b, 0, 4, 1, 5);
        const float_quad ab_high = __builtin_shufflevector(a, b, 2, 6, 3, 7);
        const float_quad cd_low = __builtin_shufflevector(c, d, 0, 4, 1, 5);
        const float_quad cd_high = __builtin_shufflevector(c, d, 2, 6, 3, 7);
        acc += __builtin_shufflevector(ab_low, cd_low, 0, 1, 4, 5);
        acc += __builtin_shufflevector(ab_low, cd_low, 2, 3, 6, 7);
        acc += __builtin_shufflevector(ab_high, cd_high, 0, 1, 4, 5);
        acc += __builtin_shufflevector(ab_high, cd_high, 2, 3, 6, 7);
    }
    for (; k <= taps; ++k) {
        const int_quad samples = {in[0][k], in[1][k], in[2][k], in[3][k]};
        const float_quad weights = {row[0][k], row[1][k], row[2][k], row[3][k]};
        acc += weights * __builtin_convertvector(samples, float_quad);
    }
    return acc;
}

// Finds the first input sample and the phase of output frames `j` to `j` + 3, as find_input does
// for one frame. Returns false if a frame needs samples outside the input or if its phase may be
// out of range.
bool find_inputs(const dorn_resampler_state &state, int64_t j, int32_t in_len, int_quad *first,
                 int_quad *phase) {
    const float last = state.ratio * static_cast<float>(j + kQuad - 1);
    if (j > INT32_MAX - kQuad || last >= kSmallFloat) return false;
    const auto lane0 = static_cast<int32_t>(j);
    const int_quad frame = {lane0, lane0 + 1, lane0 + 2, lane0 + 3};
    const float_quad pos = state.ratio * __builtin_convertvector(frame, float_quad);
    const int_quad base = __builtin_convertvector(pos, int_quad);
    const float_quad whole = __builtin_convertvector(base, float_quad);

    // Positions ascend, so checking the first and the last is enough.
    const float half = static_cast<float>(state.taps) / 2.0f;
    *first = base - static_cast<int32_t>(half);
    if ((*first)[0] < 1 || (*first)[3] + state.taps >= in_len) return false;
    if (static_cast<double>(half + whole[3]) >= static_cast<double>(in_len)) return false;

    // Positions of 1 or more have at most 23 fractional bits, so the differences are exact. The
    // phase, floor(960 * frac + 480.5), is computed in units of 2^-17 and is exact too.
    const float_quad frac = pos - whole - (state.taps % 2 != 0 ? 0.5f : 0.0f);
    if (any_lane(frac > 0.5f)) return false;
    const int_quad bits = __builtin_convertvector(frac * 8388608.0f, int_quad);
    *phase = (bits * 15 + (961 << 16)) >> 17;
    return true;
}

}  // namespace

bool filter_quad(const dorn_resampler_state &state, int64_t j, const int16_t *in, int32_t in_len,
                 int16_t *out) {
    int_quad first;
    int_quad phase;
    if (!find_inputs(state, j, in_len, &first, &phase)) return false;
    const float *const row[kQuad] = {state.coef[phase[0]], state.coef[phase[1]],
                                     state.coef[phase[2]], state.coef[phase[3]]};
    const int16_t *const samples[kQuad] = {in + first[0], in + first[1], in + first[2],
                                           in + first[3]};
    const float_quad acc = sum_quad(state.taps, row, samples);
    if (!wrap_quad(acc, out)) {
        for (int32_t lane = 0; lane < kQuad; ++lane) out[lane] = wrap_sample(acc[lane]);
    }
    return true;
}
