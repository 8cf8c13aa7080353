// Stage 7b: searches the loudness curve for the coarse highlight start.
//
// Input: TAVO_HL_CTX with power filled. Output: a time in milliseconds, a multiple of 2000. Follows
// highlight/power_envelope.h; precedes highlight/tune.h.
#ifndef TAVO_HIGHLIGHT_SEARCH_H
#define TAVO_HIGHLIGHT_SEARCH_H

#include "common/tavo_ctx.h"

extern "C" {

// duration_s: the song's length in whole seconds. Returns milliseconds, or 0 if nothing is found.
uint32_t _get_HL_simple(TAVO_HL_CTX *hl, int32_t duration_s);
}

#endif
