// Converts libavcodec's planar float samples to 16-bit PCM. Samples are rounded to nearest and
// clipped, without dither; NaN becomes 0. Both functions write `count` sample frames.
#pragma once

#include <cstdint>

void pcm16_pair(const float *left, const float *right, int16_t *out, int32_t count);

// Writes the mean of the channels' 16-bit samples, rounded toward zero. The channels are in
// plane[channels]; the first `skip` samples of each are skipped.
void pcm16_mean(const uint8_t *const *plane, int32_t channels, int32_t skip, int16_t *out,
                int32_t count);
