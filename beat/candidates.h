// Stage 6: selects the beats from the peaks of the onset envelope. Follows beat/tempo.h,
// beat/power_rise.h and beat/threshold.h, and precedes beat/beats.h.
#pragma once

#include "beat/beat_ctx.h"

extern "C" {

// Writes the beat times (ms, ascending) to `out`, which must have candidate_capacity entries.
// Returns the number of beats, or 0 if memory runs out.
int32_t getBeatCandi_MT(TAVO_BEAT_CTX *beat, TAVO_ONSET_CTX *onset, float *out);
}

// Returns an upper limit on the number of beats, which include those added in gaps.
int64_t candidate_capacity(const TAVO_BEAT_CTX *beat);
