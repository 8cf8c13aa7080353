// Stage 4, before the onset envelope: the places where the music becomes loud after at least a
// second of relative quiet.
// In: TAVO_BEAT_CTX.signal. Out: rise_flags, rise_frames, rise_count. After: beat/candidates.h.
#ifndef TAVO_BEAT_POWER_RISE_H
#define TAVO_BEAT_POWER_RISE_H

#include "beat/beat_ctx.h"

extern "C" {

// Sets flags[i] (n of them, zero before) to 1 at each sample where a rise starts. Returns how many;
// -2 out of memory, no flag set.
int32_t detectPowerVariation(const double *signal, int32_t *flags, int64_t n);
}

// Turns the count rises flagged among n samples into rise_frames and rise_count. Returns 0; -2 out
// of memory.
int32_t collect_rise_frames(TAVO_BEAT_CTX *beat, int64_t n, int32_t hop_size, int32_t count);

#endif
