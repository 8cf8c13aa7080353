// Stage 3 for ratios other than 1, 2, 3 and 4: interpolates with a windowed sinc in 961 phases.
//
// Input: interleaved 16-bit PCM. Output: the same, at the target rate. Called by pcm/resample.cpp.
#pragma once

#include <cstddef>
#include <cstdint>

constexpr int32_t kResamplePhases = 961;  // fractional offsets from -0.5 to 0.5 in steps of 1/960
constexpr int32_t kResampleRow = 25;      // capacity of a row, which holds taps + 1 coefficients

struct dorn_resampler_state {
    int32_t taps;      // 20 if the ratio is within 0.0001 of a whole number, otherwise 19
    float ratio;       // source rate / target rate
    int32_t channels;  // channels of input and output, interleaved
    float coef[kResamplePhases][kResampleRow];  // each row uses its first taps + 1 entries
};

static_assert(offsetof(dorn_resampler_state, coef) == 12);

extern "C" {

// Fills a zeroed state. Returns 0, or -1 if the target rate is below 1 or the source rate is 0.
// Accepts a negative source rate, but the conversion rejects the resulting state.
int32_t dorn_resampler_prepare(dorn_resampler_state *state, int32_t source_rate,
                               int32_t target_rate, int32_t channels);

// Converts in_len samples, counted over all channels. Returns the number of samples written to
// `out`, or -1 if a pointer is null, the state is invalid or a phase is out of range. Writes
// nothing if the input is too short for one output frame.
int32_t dorn_resampler_convert(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                               int16_t *out);
}

// Same as dorn_resampler_convert, but writes at most max_frames output frames. On long inputs, the
// single-precision position falls behind the exact one, so without this limit the conversion would
// write more frames than the rates allow.
int64_t convert_frames(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                       int16_t *out, int64_t max_frames);

// Rounds `sum` to the nearest integer, with halves rounded up. Returns the low 16 bits of the
// result.
int16_t wrap_sample(float sum);
