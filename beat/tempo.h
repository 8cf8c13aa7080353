// Stage 5: estimates the tempo by autocorrelation of up to a minute of the onset envelope. Follows
// beat/onset_envelope.h; precedes beat/candidates.h.
#ifndef TAVO_BEAT_TEMPO_H
#define TAVO_BEAT_TEMPO_H

#include "beat/beat_ctx.h"

// Returned by calc_bpm_acf if there is no dominant period. Greater than every tempo.
constexpr int32_t kNoPeriodBpm = INT32_MAX;

extern "C" {

// x: [L] excerpt of the onset envelope; nfft: a power of two, at least L; D: number of lags, in
// analysis frames; hop: seconds per analysis frame. Returns beats per minute, kNoPeriodBpm if there
// is no dominant period, or TAVO_ERR_MEMORY if memory runs out.
int32_t calc_bpm_acf(const double *x, int64_t nfft, int32_t D, int32_t L, double hop);
}

// Returns the tempo of the context's envelope, 30 to 200 BPM; 90 if it has no dominant period; or
// TAVO_ERR_MEMORY if memory runs out.
int32_t estimate_tempo(const TAVO_BEAT_CTX *beat);

#endif
