// Stage 4, in parallel with the onset envelope: finds where the music becomes loud after at least a
// second of relative quiet.
//
// Input: the analysis signal. Output: the samples where rises start. Precedes beat/candidates.h.
#pragma once

#include "beat/beat_ctx.h"

extern "C" {

// Sets flags[i] to 1 for each sample i where a rise starts. flags[n] must be zeroed. Returns the
// number of rises. If memory runs out, sets no flag and returns TAVO_ERR_MEMORY.
int32_t detectPowerVariation(const double *signal, int32_t *flags, int64_t n);
}

// Implements detectPowerVariation. Stores in *samples an array of the samples where rises start,
// ascending, or null. The caller must always free it. Returns the number of rises, or
// TAVO_ERR_MEMORY if memory runs out.
int32_t find_power_rises(sample_view view, int64_t n, int64_t **samples);
