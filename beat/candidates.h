// Stage 6: selects beats among the peaks of the onset envelope. Before: beat/tempo.h,
// beat/power_rise.h. After: beat/beats.h.
#ifndef TAVO_BEAT_CANDIDATES_H
#define TAVO_BEAT_CANDIDATES_H

#include "beat/beat_ctx.h"

extern "C" {

// Fills out with beat times, milliseconds, ascending, and returns their number; 0 if memory runs
// out. out has candidate_capacity entries.
int32_t getBeatCandi_MT(TAVO_BEAT_CTX *beat, TAVO_ONSET_CTX *onset, float *out);
}

// Most entries that getBeatCandi_MT writes: every peak, every rise, the added beats.
int64_t candidate_capacity(const TAVO_BEAT_CTX *beat);

#endif
