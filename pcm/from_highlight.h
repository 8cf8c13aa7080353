// Mode 2: computes the analysis signal from the highlight on.
//
// Input: TAVO_CTX.pcm and a start in milliseconds. Output: ana, ana_len, and hl.hl_pos, the start
// that was used; pcm is always released. The PCM is cut at the position that a seek to the start
// reaches. If that position cannot be found in the PCM, the stream is decoded again from there.
// Follows highlight/position.h; precedes beat/beats.h.
#ifndef TAVO_PCM_FROM_HIGHLIGHT_H
#define TAVO_PCM_FROM_HIGHLIGHT_H

#include "pcm/decode.h"

extern "C" {

// pos: milliseconds. Returns 0; TAVO_ERR_MEMORY if the second decoding cannot be planned; otherwise
// the conversion's code. Reads from the source of the first segment; a second decoding reads from
// all of them.
int32_t tavo_get_from_here(TAVO_CTX *ctx, int64_t pos);

// Finds in `pcm` the audio that the segment's source delivers next. *off is its expected byte
// offset on entry and the offset found on return. Reads src, fmt, start and duration of the record;
// the last two determine the size of pcm, which is not checked if duration is 0. Returns 0 if
// found; -1 if not, with *off unchanged.
int32_t _compare_decoded(TAVO_DECSEG *seg, const int16_t *pcm, int64_t *off);
}

// tavo_get_from_here with a choice of what happens to the segments' buffers after a second
// decoding.
int32_t continue_from_highlight(TAVO_CTX *ctx, int64_t pos, segment_pages pages);

#endif
