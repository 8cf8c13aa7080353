// Joins the decoded segments into one signal.
//
// In: segments with their buffers, 16-bit mono PCM. Out: one buffer of PCM. Called by
// pcm/decode.cpp. After: highlight/position.h, pcm/resample.h.
#ifndef TAVO_PCM_STITCH_H
#define TAVO_PCM_STITCH_H

#include "common/alloc.h"
#include "pcm/decode_plan.h"

extern "C" {

// dst[i] = (left + right) / 2 of frame i of interleaved stereo src, toward zero. For direct use.
void stereo2mono(int16_t *dst, const int16_t *src, int32_t frames);
}

// A segment's buffer stays allocated once it is stitched. kept: with its bytes. released: the pages
// of a large buffer go back to the system, and it reads as zeros.
enum class segment_pages { kept, released };

// One second of PCM, bytes. Every segment but the first drops it, because a decoder that has just
// been positioned may not yet deliver what it delivers in mid-stream.
inline int64_t second_bytes(int32_t rate) {
    return rate * kBytesPerSample;
}

// Copies the count decoded segments to dst (capacity bytes), each to where the output already
// holds the same bytes, or to its end. Returns the bytes written, 0 if a segment has nothing to
// give.
int64_t stitch_segments(const TAVO_DECSEG *seg, int32_t count, int32_t rate, uint8_t *dst,
                        int64_t capacity, segment_pages pages);

#endif
