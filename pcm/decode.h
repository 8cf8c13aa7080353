// Stage 2: decodes the file into one buffer of 16-bit mono PCM at the stream's own rate.
//
// Input: a plan made by pcm/decode_plan.h. Output: pcm_bytes bytes in TAVO_CTX.pcm. The segments
// are decoded in parallel and joined where their overlaps contain the same bytes (pcm/stitch.h).
// Follows pcm/decode_plan.h and precedes highlight/position.h and pcm/resample.h.
#pragma once

#include "pcm/decode_plan.h"
#include "pcm/stitch.h"

extern "C" {

// Decodes the planned segments in parallel and stitches them together in `dst`, which has
// dst_capacity bytes. The segments' buffers keep the decoded data. Returns the number of bytes
// written, or 0 if any segment is empty.
int64_t DecodePcmMT(TAVO_CTX *ctx, void *dst, int64_t dst_capacity);

// The thread entry of a segment and its completion handler. Both receive the TAVO_DECSEG.
void *_tavo_mtproc_decoding(void *seg);
void thd_cleanup(void *seg);
}

// Same as DecodePcmMT, but `pages` determines what happens to the segments' buffers. Jobs pass
// segment_pages::released.
int64_t decode_segments(TAVO_CTX *ctx, void *dst, int64_t dst_capacity, segment_pages pages);
