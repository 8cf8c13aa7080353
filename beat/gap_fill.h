// Part of stage 6: adds weaker peaks to long gaps between beats. Called by beat/candidates.h.
#ifndef TAVO_BEAT_GAP_FILL_H
#define TAVO_BEAT_GAP_FILL_H

#include "beat/beat_ctx.h"

constexpr int32_t kMaxAddedBeats = 50;  // in all gaps together

// Peaks of the onset envelope.
struct PEAK_LIST {
    int32_t *frames;  // [count] analysis frames, ascending
    int32_t count;
};

extern "C" {

// Writes the peaks between frames `a` and `b` to dst[maxn]: all if there are at most `maxn`, else
// the `maxn` strongest, strongest first. peaks[npeaks] ascends. Returns how many it wrote.
int32_t bringMoreBeat(int32_t a, int32_t b, int32_t *dst, const int32_t *peaks, int32_t npeaks,
                      int32_t maxn, const double *env);
}

// Fills the gaps between the beats out[count] (seconds, ascending) that are longer than three spans
// or at least six seconds long. Appends up to five peaks per gap to `out`. `peaks` is in ascending
// order. Returns how many it added.
int32_t fill_gaps(const TAVO_BEAT_CTX *beat, const PEAK_LIST *peaks, float span, float *out,
                  int32_t count);

#endif
