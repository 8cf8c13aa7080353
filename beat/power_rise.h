// Stage 4, parallel to the onset envelope: finds where the music becomes loud after at least a
// second of relative quiet.
//
// In: the analysis signal. Out: the samples where rises start. After: beat/candidates.h.
#ifndef TAVO_BEAT_POWER_RISE_H
#define TAVO_BEAT_POWER_RISE_H

#include "beat/beat_ctx.h"

extern "C" {

// Sets flags[i] of the zeroed flags[n] to 1 at each sample where a rise starts. Returns the number
// of rises; TAVO_ERR_MEMORY, with no flag set.
int32_t detectPowerVariation(const double *signal, int32_t *flags, int64_t n);
}

// The body of detectPowerVariation for the n samples of a view. *samples is the ascending list of
// rises, or null; the caller frees it in any case. Returns the number of rises; TAVO_ERR_MEMORY.
int32_t find_power_rises(sample_view view, int64_t n, int64_t **samples);

#endif
