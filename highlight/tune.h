// Stage 7d: moves the coarse highlight start to the sharpest rise near it.
//
// Input: 16-bit mono PCM at the source rate and a start in milliseconds. Output: the tuned start,
// on a grid of 400 ms. Follows highlight/search.h and precedes highlight/position.h.
#pragma once

#include <cstdint>

extern "C" {

// Returns the time (ms) of the sharpest rise between 3 s before and 7 s after start_ms, or start_ms
// if no rise is sharp enough. `pcm` must have at least tune_end samples.
uint32_t _tune_HL_simple(const int16_t *pcm, int32_t rate, uint32_t start_ms, uint32_t duration_s);
}

// Returns the number of samples, from the start of the song, that _tune_HL_simple needs for
// start_ms.
int64_t tune_end(int32_t rate, uint32_t start_ms);
