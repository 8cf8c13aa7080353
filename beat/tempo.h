// Stage 5: estimates the tempo by autocorrelating up to a minute of the onset envelope. Follows
// beat/onset_envelope.h and precedes beat/candidates.h.
#pragma once

#include "beat/beat_ctx.h"

// Returned by calc_bpm_acf if there is no dominant period. It is greater than any tempo.
constexpr int32_t kNoPeriodBpm = INT32_MAX;

extern "C" {

// Estimates the tempo of x[L], an excerpt of the onset envelope. `nfft` is a power of two, at least
// L; D is the number of lags; `hop` is in seconds. Returns beats per minute. If there is no
// dominant period, returns kNoPeriodBpm; if memory runs out, TAVO_ERR_MEMORY.
int32_t calc_bpm_acf(const double *x, int64_t nfft, int32_t D, int32_t L, double hop);
}

// Returns the tempo of the context's onset envelope, 30 to 200 BPM. If there is no dominant period,
// returns 90; if memory runs out, TAVO_ERR_MEMORY.
int32_t estimate_tempo(const TAVO_BEAT_CTX *beat);
