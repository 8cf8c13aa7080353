// Stage 3: converts source-rate PCM to the analysis signal.
//
// In: 16-bit mono PCM at the stream's rate. Out: doubles on the 16-bit scale at the analysis rate.
// Before: pcm/decode.h. After: beat/beats.h.
#ifndef TAVO_PCM_RESAMPLE_H
#define TAVO_PCM_RESAMPLE_H

#include "pcm/resample_block.h"
#include "pcm/resample_sinc.h"

extern "C" {

// Converts bytes / 2 samples. On success *out is a new array of *out_len doubles (64 cleared bytes
// follow them), the caller's to free. Returns 0; TAVO_ERR_MEMORY out of memory, or sizes or a
// source rate that give no length, with *out null and *out_len 0. The interpolator ignores input
// beyond 2^31 - 1 samples: its part of the output is 0.
int32_t dorn_resampler_run(const int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                           int64_t *out_len, double **out);
}

// The same, and frees pcm in any case. pcm comes from malloc, or is null; the output may be in its
// memory.
int32_t convert_and_free(int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                         int64_t *out_len, double **out);

#endif
