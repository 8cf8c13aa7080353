// Stage 7: the highlight start of a decoded song.
//
// In: TAVO_CTX with pcm, pcm_bytes, fmt, duration. Out: hl.hl_pos, milliseconds.
// Before: pcm/decode.h. After: the callback, or pcm/from_highlight.h in mode 2.
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
