// Stage 3 for all other ratios: a windowed-sinc interpolator with 961 phases.
//
// Input: interleaved 16-bit PCM. Output: the same at the target rate. Called by pcm/resample.cpp.
#ifndef TAVO_PCM_RESAMPLE_SINC_H
#define TAVO_PCM_RESAMPLE_SINC_H

#include <cstddef>
#include <cstdint>

constexpr int32_t kResamplePhases = 961;  // fractional offsets -0.5 to 0.5 in steps of 1/960
constexpr int32_t kResampleRow = 25;      // capacity for the taps + 1 coefficients of a phase

struct dorn_resampler_state {
    int32_t taps;      // N: 20 for a ratio within 0.0001 of a whole number, else 19
    float ratio;       // source rate / target rate
    int32_t channels;  // of input and output, interleaved
    float coef[kResamplePhases][kResampleRow];  // each row uses its first taps + 1 entries
};

static_assert(offsetof(dorn_resampler_state, coef) == 12);

extern "C" {

// Fills a zeroed state. Returns 0, or -1 if the target rate is below 1 or the source rate is 0.
// With a negative source rate it fills a table that the conversion rejects.
int32_t dorn_resampler_prepare(dorn_resampler_state *state, int32_t source_rate,
                               int32_t target_rate, int32_t channels);

// Converts in_len samples, counted over all channels. Returns the samples written to out (0 if the
// input is too short for one), or -1 if an argument is missing or a phase is out of range.
int32_t dorn_resampler_convert(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                               int16_t *out);
}

// dorn_resampler_convert limited to max_frames output frames. On long inputs the single-precision
// position lags so far that the conversion would write more than the rates allow.
int64_t convert_frames(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                       int16_t *out, int64_t max_frames);

// Rounds the sum to the nearest integer, halves up, and returns its low 16 bits.
int16_t wrap_sample(float sum);

#endif
