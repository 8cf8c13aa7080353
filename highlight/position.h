// Stage 7: finds the start of the highlight in a decoded song.
//
// Input: a TAVO_CTX with pcm, pcm_bytes, fmt and duration. Output: hl.hl_pos in milliseconds.
// Follows pcm/decode.h and precedes the callback or, in mode 2, pcm/from_highlight.h.
#pragma once

#include "common/tavo_ctx.h"

extern "C" {

// Stores the start of the highlight (ms) in hl.hl_pos and returns it. The start is 0 if the PCM is
// shorter than 6 s.
uint32_t getHLPosition(TAVO_CTX *ctx);

// Releases the loudness curve and the context itself. Null is ignored.
void clearHighlgihtCtx(TAVO_HL_CTX *hl);
}
