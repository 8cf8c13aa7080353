// Mode 2: the analysis signal from the highlight on.
//
// In: TAVO_CTX.pcm and a start in milliseconds. Out: ana, ana_len, and hl.hl_pos, the start that
// was used; pcm is always released. The PCM is cut at the position that a seek to the start
// reaches, or decoded again from there if that position cannot be found in it. Before:
// highlight/position.h. After: beat/beats.h.
#ifndef TAVO_PCM_FROM_HIGHLIGHT_H
#define TAVO_PCM_FROM_HIGHLIGHT_H

#include "pcm/decode.h"

extern "C" {

// pos: milliseconds. Returns 0; TAVO_ERR_MEMORY if the second decoding cannot be planned; else the
// conversion's code. Reads the source of the first segment, and all segments to decode again.
int32_t tavo_get_from_here(TAVO_CTX *ctx, int64_t pos);

// Looks in pcm for the audio that the segment's source delivers next. *off: bytes, in the expected
// offset of that audio, out the offset found. Reads src, fmt, start and duration of the record; the
// last two give the size of pcm, which is unknown if duration is 0. Returns 0 found; -1 not found,
// with *off unchanged.
int32_t _compare_decoded(TAVO_DECSEG *seg, const int16_t *pcm, int64_t *off);
}

// tavo_get_from_here, with a choice for the segments' buffers of a second decoding.
int32_t continue_from_highlight(TAVO_CTX *ctx, int64_t pos, segment_pages pages);

#endif
