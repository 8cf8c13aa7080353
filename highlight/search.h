// Stage 7b: searches the loudness curve for the coarse highlight start.
//
// Input: a TAVO_HL_CTX with its loudness curve. Output: a time in milliseconds, a multiple of 2000.
// Follows highlight/power_envelope.h and precedes highlight/tune.h.
#pragma once

#include "common/tavo_ctx.h"

extern "C" {

// Returns the coarse start in milliseconds, or 0 if nothing is found. duration_s is the length of
// the song in whole seconds.
uint32_t _get_HL_simple(TAVO_HL_CTX *hl, int32_t duration_s);
}
