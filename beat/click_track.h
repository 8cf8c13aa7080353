// Writes the diagnostic click track: the analysed signal with a blip at every beat, as a mono
// 16-bit WAV file. The public global fnamedec (include/tavo.h) holds its path. Called by
// beat/beats.h.
#pragma once

#include <cstdint>
#include <cstdio>

#include "common/tavo_ctx.h"

extern "C" {

// Writes the 44-byte WAV header for `n` samples. Returns 1 on success, 0 on failure.
int32_t makeWaveHeader(uint32_t n, FILE *stream);

// Copies a 100 ms blip to the zeroed track[n] at each of the times in beats[count] (ms).
void makeBlipTrack(const float *beats, int32_t count, int32_t sr, int64_t n, float *track);
}

// Writes the click track of the instance to fnamedec. Does nothing if the path is empty, the file
// cannot be created or memory runs out.
void write_click_track(const TAVO_CTX *ctx);
