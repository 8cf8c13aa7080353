// Stage 3: converts source-rate PCM to the analysis signal.
//
// Input: 16-bit mono PCM at the stream's rate. Output: doubles on the 16-bit scale at the analysis
// rate. Follows pcm/decode.h; precedes beat/beats.h.
#ifndef TAVO_PCM_RESAMPLE_H
#define TAVO_PCM_RESAMPLE_H

#include "pcm/resample_block.h"
#include "pcm/resample_sinc.h"

extern "C" {

// Converts bytes / 2 samples. On success *out is a new array of *out_len doubles, followed by 64
// zero bytes; the caller frees it. Returns 0; TAVO_ERR_MEMORY, with *out null and *out_len 0, if
// memory runs out or the sizes and rates give no valid length. The interpolator ignores input past
// 2^31 - 1 samples; its part of the output is 0.
int32_t dorn_resampler_run(const int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                           int64_t *out_len, double **out);
}

// dorn_resampler_run that also frees pcm, even on failure. pcm comes from malloc or is null. The
// output may reuse its memory.
int32_t convert_and_free(int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                         int64_t *out_len, double **out);

#endif
