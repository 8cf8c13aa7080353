// Stage 7a: computes the loudness curve of the song.
//
// Input: 16-bit mono PCM at the source rate. Output: TAVO_HL_CTX.power, one float every 2 s, each
// measured over a window of 6 s. A value is 10 log10(mean square + 1): 0 for silence, about 3.01
// for full scale. Precedes highlight/search.h.
#pragma once

#include "common/tavo_ctx.h"

constexpr int32_t kPowerWindowSeconds = 6;  // length of the window that a value covers
constexpr int32_t kPowerHopSeconds = 2;     // distance between successive values

extern "C" {

// Fills power and power_count and returns the count. For PCM shorter than 6 s the count is 0 and
// nothing is allocated. Does not release a curve that the record already holds.
int32_t _calc_power_level(const int16_t *pcm, int64_t sample_count, int32_t rate, TAVO_HL_CTX *hl);
}

// For every 16-bit x, x * kInverseHead + x * kInverseTail is bit-identical to x / 32767.0: the
// binary digits of 1 / 32767 repeat every 15 places, the first product is exact, and the sum is
// rounded once.
constexpr double kInverseHead = 0x1p-15 + 0x1p-30 + 0x1p-45;
constexpr double kInverseTail = 0x1p-60 + 0x1p-75;

// Returns 10 log10(mean square + 1) of `window` samples. The sum is computed in double precision,
// the rest in single precision.
float window_power(const int16_t *pcm, int64_t window);

// Computes window_power for `count` windows of 3 * `hop` samples that start one hop apart, and
// stores the values in out[count]. `pcm` has (`count` + 2) * `hop` samples.
void overlapping_powers(const int16_t *pcm, int64_t hop, int64_t count, float *out);
