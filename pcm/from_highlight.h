// Mode 2: computes the analysis signal from the highlight on.
//
// Input: TAVO_CTX.pcm and a start in milliseconds. Output: ana and ana_len, and in hl.hl_pos the
// start that was actually used. `pcm` is always released. The PCM is cut at the position that a
// seek to the start reaches. If that position cannot be found in the PCM, the stream is decoded
// again from that position. Follows highlight/position.h and precedes beat/beats.h.
#pragma once

#include "pcm/decode.h"

extern "C" {

// Computes the analysis signal from `pos` (milliseconds) on. Returns 0, or the error code of the
// conversion. If the stream must be decoded again but the decoding cannot be planned, returns
// TAVO_ERR_MEMORY. Reads from the first segment's source; a second decoding reads from all sources.
int32_t tavo_get_from_here(TAVO_CTX *ctx, int64_t pos);

// Looks in `pcm` for the audio that the segment's source delivers next. On entry, *off is the byte
// offset where that audio is expected. If it is found, sets *off to its offset and returns 0;
// otherwise returns -1. Reads only src, fmt, start and duration from the record. The last three
// determine the size of `pcm`; if duration is 0, the size is not checked.
int32_t _compare_decoded(TAVO_DECSEG *seg, const int16_t *pcm, int64_t *off);
}

// Same as tavo_get_from_here, but `pages` determines what happens to the segments' buffers after a
// second decoding.
int32_t continue_from_highlight(TAVO_CTX *ctx, int64_t pos, segment_pages pages);
