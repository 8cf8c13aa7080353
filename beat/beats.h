// Stages 4 to 6: the beats and the tempo of the analysis signal.
//
// Input: TAVO_CTX with ana, ana_len, ana_rate. Output: TAVO_ONSET_CTX bpm, beat_count, beat_times
// (ms from the start of the signal). Follows pcm/resample.h; precedes the callback.
#ifndef TAVO_BEAT_BEATS_H
#define TAVO_BEAT_BEATS_H

#include "common/tavo_ctx.h"

extern "C" {

// Returns the number of beats and sets the state to finished. If a check before the onset
// envelope or after the tempo finds a stop request, returns 0 and leaves the state unchanged.
int32_t getBeatPosition(TAVO_CTX *ctx);

// Releases the beats and the record itself. Null is ignored.
void clearOnsetCtx(TAVO_ONSET_CTX *onset);
}

#endif
