// Stage 7: the highlight start of a decoded song.
//
// Input: TAVO_CTX with pcm, pcm_bytes, fmt, duration. Output: hl.hl_pos, milliseconds. Follows
// pcm/decode.h; precedes the callback, or pcm/from_highlight.h in mode 2.
#ifndef TAVO_HIGHLIGHT_POSITION_H
#define TAVO_HIGHLIGHT_POSITION_H

#include "common/tavo_ctx.h"

extern "C" {

// Returns the start in milliseconds and stores it in hl.hl_pos. 0 if the PCM is shorter than 6 s.
uint32_t getHLPosition(TAVO_CTX *ctx);

// Releases the loudness curve and the context itself. Null is ignored.
void clearHighlgihtCtx(TAVO_HL_CTX *hl);
}

#endif
