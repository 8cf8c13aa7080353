// Joins the decoded segments into one signal.
//
// Input: the segments, whose buffers hold 16-bit mono PCM. Output: one buffer of PCM. Called by
// pcm/decode.cpp. Precedes highlight/position.h and pcm/resample.h.
#pragma once

#include "common/alloc.h"
#include "pcm/decode_plan.h"

extern "C" {

// Downmixes interleaved stereo: every output sample is the mean of left and right, rounded toward
// zero. Exported for direct callers; the library does not use it.
void stereo2mono(int16_t *dst, const int16_t *src, int32_t frames);
}

// Selects what happens to a segment's buffer once it is stitched. `kept` leaves the buffer
// unchanged. `released` gives the pages of a large buffer back to the system, together with the
// unused pages of its source's queue. The buffer stays allocated and reads as zeros.
enum class segment_pages { kept, released };

// Returns the number of bytes in one second of PCM. Every segment except the first drops its first
// second, because a decoder may need that long to settle after a seek.
inline int64_t second_bytes(int32_t rate) {
    return rate * kBytesPerSample;
}

// Copies the `count` decoded segments to `dst`, which has `capacity` bytes. Each segment is placed
// where its first bytes already occur in the output, or at the end if they do not occur. Returns
// the number of bytes written, or 0 if any segment is empty.
int64_t stitch_segments(const TAVO_DECSEG *seg, int32_t count, int32_t rate, uint8_t *dst,
                        int64_t capacity, segment_pages pages);
