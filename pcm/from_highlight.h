// Mode 2: the analysis signal from the highlight on.
//
// In: TAVO_CTX.pcm and a start in milliseconds. Out: ana, ana_len, and hl.hl_pos, the start really
// used; pcm is always released. The PCM is cut where a seek to the start lands, or decoded again
// from there when the landing point cannot be found in it. Before: highlight/position.h. After:
// beat/beats.h.
#ifndef TAVO_PCM_FROM_HIGHLIGHT_H
#define TAVO_PCM_FROM_HIGHLIGHT_H

#include "pcm/decode.h"

extern "C" {

// pos: milliseconds. Returns 0; -2 when the second decoding cannot be planned; else the
// conversion's code. Of the segments it needs the source of the first, and all of them to decode
// again.
int32_t tavo_get_from_here(TAVO_CTX *ctx, int64_t pos);

// Looks in pcm for the audio that the segment's source delivers next. *off: bytes, in the expected
// offset of that audio, out the offset found. Of the record it reads src, fmt, start and duration;
// the last two tell the size of pcm, which a duration of 0 leaves unknown. Returns 0 found, -1 not,
// with *off unchanged.
int32_t _compare_decoded(TAVO_DECSEG *seg, const int16_t *pcm, int64_t *off);
}

#endif
