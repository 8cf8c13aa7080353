// Stage 3: converts source-rate PCM to the analysis signal.
//
// Input: 16-bit mono PCM at the stream's rate. Output: doubles on the 16-bit scale at the analysis
// rate. Follows pcm/decode.h and precedes beat/beats.h.
#pragma once

#include "pcm/resample_block.h"
#include "pcm/resample_sinc.h"

extern "C" {

// Converts `pcm`, which has bytes / 2 samples. On success, returns 0 and sets *out to a new array
// of *out_len doubles, followed by 64 zero bytes; the caller frees it. If memory runs out, a rate
// is not valid or a size overflows, returns TAVO_ERR_MEMORY and sets *out to null and *out_len to
// 0. The interpolator ignores input past 2^31 - 1 samples; the output for that input is 0.
int32_t dorn_resampler_run(const int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                           int64_t *out_len, double **out);
}

// Same as dorn_resampler_run, but also frees `pcm`, even on failure. `pcm` must come from malloc or
// be null. The output may reuse its memory.
int32_t convert_and_free(int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                         int64_t *out_len, double **out);
