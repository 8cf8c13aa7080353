// Stage 6, inside: weaker peaks put back into long gaps between beats.
// Before: beat/candidates.h, the only caller.
#ifndef TAVO_BEAT_GAP_FILL_H
#define TAVO_BEAT_GAP_FILL_H

#include "beat/beat_ctx.h"

constexpr int32_t kMaxAddedBeats = 50;  // put back into gaps, all together

// Peaks of the envelope as frames.
struct PEAK_LIST {
    int32_t *frames;
    int32_t count;
};

extern "C" {

// The peaks (ascending, npeaks of them) between frames a and b: all if at most maxn, else the maxn
// strongest, strongest first. Returns how many were written to dst (capacity maxn).
int32_t bringMoreBeat(int32_t a, int32_t b, int32_t *dst, const int32_t *peaks, int32_t npeaks,
                      int32_t maxn, const double *env);
}

// Puts up to five peaks (ascending) back into each gap longer than three spans or from six seconds
// on between the count ascending beats in out, seconds, and appends them. Returns how many.
int32_t fill_gaps(const TAVO_BEAT_CTX *beat, const PEAK_LIST *peaks, float span, float *out,
                  int32_t count);

#endif
