// Stage 7d: the coarse highlight start moved to the sharpest rise near it.
//
// In: 16-bit mono PCM at the source rate, a start in milliseconds. Out: the start on a grid of
// 400 ms. Before: highlight/search.h. After: highlight/position.h.
#ifndef TAVO_HIGHLIGHT_TUNE_H
#define TAVO_HIGHLIGHT_TUNE_H

#include <cstdint>

extern "C" {

// Moves a coarse start (ms) to the sharpest rise between 3 s before and 7 s after it. pcm must
// reach to tune_end. Returns milliseconds, start_ms when nothing rises.
uint32_t _tune_HL_simple(const int16_t *pcm, int32_t rate, uint32_t start_ms, uint32_t duration_s);
}

// Samples of the song, from its start, that the tuning of start_ms needs: it reads none from there
// on.
int64_t tune_end(int32_t rate, uint32_t start_ms);

#endif
