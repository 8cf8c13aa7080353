// libavcodec's planar float samples to interleaved 16-bit PCM: rounded to nearest, clipped, no
// dither; a sample that is not a number becomes silence. Each writes count sample frames.
#ifndef WEXAAUDIO_PCM16_H
#define WEXAAUDIO_PCM16_H

#include <cstdint>

void pcm16_pair(const float *left, const float *right, int16_t *out, int32_t count);

// The mean of the channels' 16-bit samples, toward zero. plane: [channels] pointers; skip: sample
// frames passed over in each.
void pcm16_mean(const uint8_t *const *plane, int32_t channels, int32_t skip, int16_t *out,
                int32_t count);

#endif
