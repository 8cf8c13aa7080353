// Stage 5: estimates the tempo by autocorrelation of up to a minute of the onset envelope. Before:
// beat/onset_envelope.h. After: beat/candidates.h.
#ifndef TAVO_BEAT_TEMPO_H
#define TAVO_BEAT_TEMPO_H

#include "beat/beat_ctx.h"

// Returned by calc_bpm_acf without a dominant period. Greater than every tempo.
constexpr int32_t kNoPeriodBpm = INT32_MAX;

extern "C" {

// x: [L] excerpt of the onset envelope; nfft: a power of two, at least L; D: number of lags, in
// analysis frames; hop: seconds per analysis frame. Returns beats per minute; kNoPeriodBpm;
// TAVO_ERR_MEMORY.
int32_t calc_bpm_acf(const double *x, int64_t nfft, int32_t D, int32_t L, double hop);
}

// Returns the tempo of the context's envelope, 30 to 200 BPM, or 90 if it has no dominant period;
// TAVO_ERR_MEMORY.
int32_t estimate_tempo(const TAVO_BEAT_CTX *beat);

#endif
