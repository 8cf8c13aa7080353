// Stage 7b: the coarse highlight start, found on the loudness curve.
//
// In: TAVO_HL_CTX with power filled. Out: a time in milliseconds, a multiple of 2000.
// Before: highlight/power_envelope.h. After: highlight/tune.h.
#ifndef TAVO_HIGHLIGHT_SEARCH_H
#define TAVO_HIGHLIGHT_SEARCH_H

#include "common/tavo_ctx.h"

// Envelope points (2 s each) at the song's start and end where no rise is looked for.
constexpr int32_t kShortSongSeconds = 90;  // seconds; from here on the wider margins hold
constexpr int32_t kSearchSkip = 9;         // no edge is sought before this point; 0 in a short song
constexpr int32_t kSearchTail = 25;        // no edge is scored within this many points of the end
constexpr int32_t kShortSearchTail = 10;

extern "C" {

// duration_s: the song's length, whole seconds. Returns milliseconds; 0 when nothing is found.
uint32_t _get_HL_simple(TAVO_HL_CTX *hl, int32_t duration_s);

// Ends of the quiet stretches of values[n]: indexes into out (room for 15), ascending. mean and std
// are those of values, hop_s seconds per value. Returns how many were written; writes nothing
// beyond them.
int32_t tavo_find_valley(const float *values, int32_t n, int32_t *out, float mean, float std,
                         float hop_s);
}

#endif
