// Joins the decoded segments into one signal.
//
// Input: segments with their buffers, 16-bit mono PCM. Output: one buffer of PCM. Called by
// pcm/decode.cpp. Precedes highlight/position.h and pcm/resample.h.
#ifndef TAVO_PCM_STITCH_H
#define TAVO_PCM_STITCH_H

#include "common/alloc.h"
#include "pcm/decode_plan.h"

extern "C" {

// dst[i] = (left + right) / 2 of sample frame i of interleaved stereo, rounded toward zero. For
// direct calls only.
void stereo2mono(int16_t *dst, const int16_t *src, int32_t frames);
}

// What happens to a segment's buffer once it is stitched. It stays allocated in any case. kept:
// unchanged. released: the pages of a large buffer go back to the system, and it reads as zeros.
enum class segment_pages { kept, released };

// Bytes of one second of PCM. Every segment but the first drops its first second, because a decoder
// may need that long to settle after a seek.
inline int64_t second_bytes(int32_t rate) {
    return rate * kBytesPerSample;
}

// Copies the `count` decoded segments to dst (capacity bytes). Each is placed where the output
// already has the same bytes, or at the end of the output. Returns the number of bytes written; 0
// if any segment is empty.
int64_t stitch_segments(const TAVO_DECSEG *seg, int32_t count, int32_t rate, uint8_t *dst,
                        int64_t capacity, segment_pages pages);

#endif
