// Stage 4, beside the onset envelope: the places where the music becomes loud after at least a
// second of relative quiet.
//
// In: the analysis signal. Out: the samples where rises start. After: beat/candidates.h, which
// takes their frames.
#ifndef TAVO_BEAT_POWER_RISE_H
#define TAVO_BEAT_POWER_RISE_H

#include "beat/beat_ctx.h"

extern "C" {

// Sets flags[i] (n of them, zero before) to 1 at each sample where a rise starts. Returns how many;
// -2 out of memory, no flag set.
int32_t detectPowerVariation(const double *signal, int32_t *flags, int64_t n);
}

// The same rises among the n samples of a view, as *samples, ascending, to be freed by the caller
// whatever is returned. Returns how many; -2 out of memory.
int32_t find_power_rises(sample_view view, int64_t n, int64_t **samples);

// The loudest level of each half second, dB below full scale, from -30.31 to 0: db[n / 5512 + 1],
// the block that ends at sample 5512 b in db[b]; -150 where too few samples are left, and in db[0].
void measure_block_levels(sample_view view, int64_t n, double *db);

#endif
