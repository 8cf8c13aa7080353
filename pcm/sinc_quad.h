// Interpolates four output frames at once; the result is bit-identical to one frame at a time.
//
// Input and output: 16-bit mono PCM. Called by pcm/resample_sinc.cpp.
#pragma once

#include "pcm/resample_sinc.h"

constexpr int32_t kQuad = 4;

// Computes output frames `j` to `j` + 3 and stores them in out[4]. Returns false and writes nothing
// if any of them needs samples outside in[in_len] or if its phase may be out of range.
bool filter_quad(const dorn_resampler_state &state, int64_t j, const int16_t *in, int32_t in_len,
                 int16_t *out);
