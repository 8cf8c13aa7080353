// The two engines of the conversion, as pcm/resample.cpp runs them.
#ifndef TAVO_PCM_RESAMPLE_ENGINES_H
#define TAVO_PCM_RESAMPLE_ENGINES_H

#include "pcm/resample.h"

constexpr int32_t kMaxWholeRatio = 4;  // whole ratios up to here are block-averaged

// The ratio as a whole number from 1 to kMaxWholeRatio; 0 for any other.
int32_t whole_ratio(float ratio);

// The number of outputs, from 0 on, whose block is exactly whole samples long. Beyond it, places in
// single precision are rounded.
int64_t exact_blocks(int32_t whole);

// The block average of count samples on four threads, under the lock that ext_mutex_resample names.
// out may be the memory of in at ratio 4, up to exact_blocks(4) outputs. Returns false, with out as
// it was, when memory runs out.
bool average_on_threads(const int16_t *in, int64_t count, float ratio, double *out, int64_t n);

// The outputs of the block average at ratio 4 from exact_blocks(4) to n. out may be the memory of
// in: blocks that begin before their output are read ahead of it.
void average_behind_exact(const int16_t *in, int64_t count, double *out, int64_t n);

// dorn_resampler_convert that stops after max_frames frames. On long inputs the single-precision
// position lags far enough for the conversion to give more frames than the rates say.
int64_t convert_frames(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                       int16_t *out, int64_t max_frames);

#endif
