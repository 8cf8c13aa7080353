// Segment buffers become one run of PCM.
//
// In: decoded segments, 16-bit mono PCM. Out: one run of PCM. Called by pcm/decode_run.cpp. After:
// highlight/position.h, pcm/resample.h.
#ifndef TAVO_PCM_STITCH_H
#define TAVO_PCM_STITCH_H

#include "common/alloc.h"
#include "pcm/decode.h"

// One second of PCM, bytes. Every segment but the first drops it, because a decoder that has just
// been positioned may not yet deliver what it delivers in mid-stream. Also the unit of the search
// for a landing point.
inline int64_t second_bytes(int32_t rate) {
    return rate * kBytesPerSample;
}

// Moves the count decoded segments to dst (capacity bytes), each to the place where the output
// already holds the same bytes, or to its end. dst may be the memory of the segments' buffers, if
// these lie in it in order. Returns the bytes written, 0 when a segment has nothing to give.
int64_t stitch_segments(const TAVO_DECSEG *seg, int32_t count, int32_t rate, uint8_t *dst,
                        int64_t capacity);

#endif
