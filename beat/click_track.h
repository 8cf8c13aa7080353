// Diagnostic: writes the analysed signal with a blip at every beat as a mono 16-bit WAV file. The
// public global fnamedec (include/tavo.h) is its path. Follows beat/beats.h.
#ifndef TAVO_BEAT_CLICK_TRACK_H
#define TAVO_BEAT_CLICK_TRACK_H

#include <cstdint>
#include <cstdio>

#include "common/tavo_ctx.h"

extern "C" {

// Writes the 44-byte header of a file of `n` samples. Returns the headers written, 1 or 0.
int32_t makeWaveHeader(uint32_t n, FILE *stream);

// Adds a 100 ms blip to the zeroed track[n] at each of beats[count] (ms).
void makeBlipTrack(const float *beats, int32_t count, int32_t sr, int64_t n, float *track);
}

// Writes the click track of the instance's analysis signal and beats, if fnamedec can be created.
void write_click_track(const TAVO_CTX *ctx);

#endif
