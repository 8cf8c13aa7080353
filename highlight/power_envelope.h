// Stage 7a: the coarse loudness curve of the song.
//
// In: 16-bit mono PCM at the source rate. Out: TAVO_HL_CTX.power, one float per 2 s, each over a
// window of 6 s: 10 log10(mean square + 1), 0 for silence, about 3.01 for full scale. After:
// highlight/search.h.
#ifndef TAVO_HIGHLIGHT_POWER_ENVELOPE_H
#define TAVO_HIGHLIGHT_POWER_ENVELOPE_H

#include "common/tavo_ctx.h"

constexpr int32_t kPowerWindowSeconds = 6;  // of one value
constexpr int32_t kPowerHopSeconds = 2;     // from one value to the next

extern "C" {

// Fills power and power_count (0 and nothing allocated below 6 s). Returns the count. A curve
// that the record already has is not released.
int32_t _calc_power_level(const int16_t *pcm, int64_t sample_count, int32_t rate, TAVO_HL_CTX *hl);
}

// x / 32767.0 as x * kInverseHead + x * kInverseTail: the quotient's binary digits repeat every 15,
// the head product is exact, and the sum rounds once: bit-identical to the quotient for every
// 16-bit x.
constexpr double kInverseHead = 0x1p-15 + 0x1p-30 + 0x1p-45;
constexpr double kInverseTail = 0x1p-60 + 0x1p-75;

// 10 log10(mean square + 1) of window samples; sum in double, the rest in single precision.
float window_power(const int16_t *pcm, int64_t window);

// The same for count windows of 3 hop samples, each one hop after the one before: out[count].
// pcm: [(count + 2) hop].
void overlapping_powers(const int16_t *pcm, int64_t hop, int64_t count, float *out);

#endif
