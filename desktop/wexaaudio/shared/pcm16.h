// Samples of any of libavcodec's formats to interleaved 16-bit PCM: rounded to nearest, clipped, no
// dither.
#ifndef WEXAAUDIO_PCM16_H
#define WEXAAUDIO_PCM16_H

#include <cstddef>
#include <cstdint>

// Each writes count samples; in and out advance by their steps (in samples).
void pcm16_from_float(const float *in, ptrdiff_t in_step, int16_t *out, ptrdiff_t out_step,
                      int32_t count);
void pcm16_from_s32(const int32_t *in, ptrdiff_t in_step, int16_t *out, ptrdiff_t out_step,
                    int32_t count);
void pcm16_from_s16(const int16_t *in, ptrdiff_t in_step, int16_t *out, ptrdiff_t out_step,
                    int32_t count);

// Two planes, the common case: to interleaved pairs, or to the mean of the two 16-bit samples,
// toward zero.
void pcm16_pair_from_float(const float *left, const float *right, int16_t *out, int32_t count);
void pcm16_mean_from_float(const float *left, const float *right, int16_t *out, int32_t count);

#endif
