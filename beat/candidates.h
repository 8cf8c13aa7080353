// Stage 6: beats chosen among the peaks of the onset envelope, and the weaker ones put back into
// gaps. Before: beat/tempo.h, beat/power_rise.h. After: beat/beats.h.
#ifndef TAVO_BEAT_CANDIDATES_H
#define TAVO_BEAT_CANDIDATES_H

#include "beat/beat_ctx.h"

extern "C" {

// Fills out with beat times, milliseconds, ascending, and returns their number; 0 when memory runs
// out. out has candidate_capacity entries.
int32_t getBeatCandi_MT(TAVO_BEAT_CTX *beat, TAVO_ONSET_CTX *onset, float *out);
}

// Entries that getBeatCandi_MT may write at most: every peak, every rise, the added beats.
int64_t candidate_capacity(const TAVO_BEAT_CTX *beat);

#endif
