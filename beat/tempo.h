// Stage 5: the tempo, from the autocorrelation of at most a minute of the onset envelope.
// Before: beat/onset_envelope.h. After: beat/candidates.h.
#ifndef TAVO_BEAT_TEMPO_H
#define TAVO_BEAT_TEMPO_H

#include "beat/beat_ctx.h"

// Returned by calc_bpm_acf if there is no dominant period; above every tempo.
constexpr int32_t kNoPeriodBpm = INT32_MAX;

extern "C" {

// x: [L] the excerpt; nfft: a power of two not below L; D: lags used, frames; hop: seconds per
// frame. Returns beats per minute; kNoPeriodBpm; TAVO_ERR_MEMORY.
int32_t calc_bpm_acf(const double *x, int64_t nfft, int32_t D, int32_t L, double hop);
}

// Returns the tempo of the context's envelope, 30 to 200, or 90 if there is none; TAVO_ERR_MEMORY.
int32_t estimate_tempo(const TAVO_BEAT_CTX *beat);

#endif
