// Stages 4 to 6: finds the beats and the tempo of the analysis signal.
//
// Input: a TAVO_CTX with ana, ana_len, ana_rate and onset. Output: bpm, beat_count and beat_times
// (ms from the start of the signal) in its TAVO_ONSET_CTX. Follows pcm/resample.h and precedes the
// callback.
#pragma once

#include "common/tavo_ctx.h"

extern "C" {

// Finds the beats, sets the state to finished and returns the number of beats. If a stop is
// requested before the tempo has been computed, or if memory runs out, returns 0 and leaves the
// state unchanged.
int32_t getBeatPosition(TAVO_CTX *ctx);

// Releases the beats and the record itself. Null is ignored.
void clearOnsetCtx(TAVO_ONSET_CTX *onset);
}
