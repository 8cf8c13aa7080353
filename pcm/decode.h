// Stage 2: decodes the file into one buffer of 16-bit mono PCM at the stream's own rate.
//
// Input: a plan of pcm/decode_plan.h. Output: TAVO_CTX.pcm, pcm_bytes bytes. The segments are
// decoded in parallel and joined where their overlaps hold the same bytes (pcm/stitch.h). Precedes
// highlight/position.h and pcm/resample.h.
#ifndef TAVO_PCM_DECODE_H
#define TAVO_PCM_DECODE_H

#include "pcm/decode_plan.h"
#include "pcm/stitch.h"

extern "C" {

// Decodes the planned segments in parallel and stitches them into dst (dst_capacity bytes). Leaves
// their buffers unchanged. Returns the bytes written; 0 if any segment is empty.
int64_t DecodePcmMT(TAVO_CTX *ctx, void *dst, int64_t dst_capacity);

// Thread entry of one segment and its completion handler. The argument is the TAVO_DECSEG.
void *_tavo_mtproc_decoding(void *seg);
void thd_cleanup(void *seg);
}

// DecodePcmMT with a choice of what happens to the segments' buffers. Jobs release their pages.
int64_t decode_segments(TAVO_CTX *ctx, void *dst, int64_t dst_capacity, segment_pages pages);

#endif
