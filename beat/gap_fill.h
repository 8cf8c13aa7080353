// Part of stage 6: fills long gaps between beats with weaker peaks. Called by beat/candidates.h.
#pragma once

#include "beat/beat_ctx.h"

constexpr int32_t kMaxAddedBeats = 50;  // in all gaps together

// Peaks of the onset envelope.
struct PEAK_LIST {
    int32_t *frames;  // [count] analysis frames, ascending
    int32_t count;
};

extern "C" {

// Writes the peaks between analysis frames `a` and `b` to dst[maxn]: all of them if there are at
// most `maxn`, otherwise the `maxn` strongest, strongest first. peaks[npeaks] must be ascending.
// Returns the number of peaks written.
int32_t bringMoreBeat(int32_t a, int32_t b, int32_t *dst, const int32_t *peaks, int32_t npeaks,
                      int32_t maxn, const double *env);
}

// Fills long gaps between the beats out[count] (seconds, ascending): gaps of more than three times
// `span`, or of at least six seconds. Appends up to five peaks per gap to `out`. The list in
// `peaks` must be ascending. Returns the number of beats added.
int32_t fill_gaps(const TAVO_BEAT_CTX *beat, const PEAK_LIST *peaks, float span, float *out,
                  int32_t count);
