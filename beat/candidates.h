// Stage 6: beats chosen among the peaks of the onset envelope, and the weaker ones put back into
// gaps. Before: beat/tempo.h, beat/power_rise.h. After: beat/beats.h.
#ifndef TAVO_BEAT_CANDIDATES_H
#define TAVO_BEAT_CANDIDATES_H

#include "beat/beat_ctx.h"

constexpr int32_t kMaxAddedBeats = 50;  // put back into gaps, all together

// Peaks of the envelope as frames: room for every peak and every rise.
struct PEAK_LIST {
    int32_t *frames;
    int32_t count;
};

extern "C" {

// Fills out with beat times, milliseconds, ascending, and returns their number; 0 when memory runs
// out. out has room for candidate_room entries.
int32_t getBeatCandi_MT(TAVO_BEAT_CTX *beat, TAVO_ONSET_CTX *onset, float *out);

// The peaks (ascending, npeaks of them) between frames a and b: all when at most maxn, else the
// maxn strongest, strongest first. Returns how many were written to dst (room for maxn).
int32_t bringMoreBeat(int32_t a, int32_t b, int32_t *dst, const int32_t *peaks, int32_t npeaks,
                      int32_t maxn, const double *env);
}

// Entries that getBeatCandi_MT may write at most: every peak, every rise, the added beats.
int64_t candidate_room(const TAVO_BEAT_CTX *beat);

// Puts up to five peaks (ascending) back into each gap longer than three spans or from six seconds
// on between the count ascending beats in out, seconds, and appends them. Returns how many.
int32_t fill_gaps(const TAVO_BEAT_CTX *beat, const PEAK_LIST *peaks, float span, float *out,
                  int32_t count);

#endif
