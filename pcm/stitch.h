// Segment buffers become one run of PCM. After: highlight/position.h, pcm/resample.h.
#ifndef TAVO_PCM_STITCH_H
#define TAVO_PCM_STITCH_H

#include <cstring>

#include "pcm/decode.h"

constexpr int64_t kMatchBytes = 200;  // block compared to find the same audio in two decodings

// The block sought, with its first bytes at hand: they turn down nearly every place.
struct match_block {
    const uint8_t *bytes;  // [kMatchBytes]
    uint64_t head;
};

inline uint64_t load_head(const uint8_t *bytes) {
    uint64_t head;
    memcpy(&head, bytes, sizeof(head));  // the address may be odd
    return head;
}

inline bool block_is_at(const match_block &block, const uint8_t *place) {
    return load_head(place) == block.head && memcmp(place, block.bytes, kMatchBytes) == 0;
}

// One second of PCM, bytes: what every segment but the first drops, since a decoder that has just
// been positioned may not yet deliver what it delivers in mid-stream.
inline int64_t segment_skip(int32_t rate) {
    return static_cast<int64_t>(rate) * 2;
}

// Lays the count decoded segments into dst, each from the place where the one before it holds the
// same bytes, or at its end. Returns the bytes written, 0 when a segment has nothing to give.
int64_t stitch_segments(const TAVO_DECSEG *seg, int32_t count, int32_t rate, uint8_t *dst,
                        int64_t capacity);

#endif
