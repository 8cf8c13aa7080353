// The interpolator's inside: the conversion with a limit to what it may write.
#ifndef TAVO_PCM_RESAMPLE_SINC_H
#define TAVO_PCM_RESAMPLE_SINC_H

#include "pcm/resample.h"

// dorn_resampler_convert that stops after max_frames frames. On long inputs the single-precision
// position lags far enough for the conversion to give more frames than the rates say.
int64_t convert_frames(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                       int16_t *out, int64_t max_frames);

#endif
