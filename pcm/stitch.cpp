#include "pcm/stitch.h"

#include <algorithm>
#include <cstring>

#include "pcm/block_search.h"

namespace {

// Bytes copied at a time before their pages are released. Chunks end at huge-page boundaries.
constexpr int64_t kChunkBytes = 2 << 20;

// Returns the offset in dst[total] at which the segment's data belongs: the last offset above 0
// where its first block occurs, or `total` if the block does not occur.
int64_t find_splice(const uint8_t *dst, int64_t total, const uint8_t *data, int64_t avail) {
    if (avail < kBlockBytes) return total;
    const int64_t splice = find_highest(dst, {1, total - kBlockBytes + 1}, data);
    return splice == kNotFound ? total : splice;
}

// Copies `bytes` bytes from `data`, which points into the segment's buffer. Releases each chunk
// after copying it so that only one chunk is in memory twice.
void move_pages(const TAVO_DECSEG *seg, uint8_t *dst, const uint8_t *data, int64_t bytes) {
    const uint8_t *done = seg->buf;  // everything before this is released
    int64_t at = 0;
    while (at < bytes) {
        const auto in_chunk =
            static_cast<int64_t>(reinterpret_cast<uintptr_t>(data + at) % kChunkBytes);
        const int64_t chunk = std::min(bytes - at, kChunkBytes - in_chunk);
        memcpy(dst + at, data + at, static_cast<size_t>(chunk));
        at += chunk;
        done = release_pages(done, data + at);
    }
    release_pages(done, seg->buf + seg->got);
}

}  // namespace

int64_t stitch_segments(const TAVO_DECSEG *seg, int32_t count, int32_t rate, uint8_t *dst,
                        int64_t capacity, segment_pages pages) {
    const int64_t skip = second_bytes(rate);
    if (dst == nullptr || capacity < 1 || skip < 1) return 0;

    int64_t total = 0;
    for (int32_t k = 0; k < count; ++k) {
        if (seg[k].buf == nullptr || seg[k].got < 1) return 0;
        const int64_t drop = k == 0 ? 0 : skip;
        const int64_t avail = seg[k].got - drop;
        if (avail < 1) return 0;

        const uint8_t *data = seg[k].buf + drop;
        if (k > 0) total = find_splice(dst, total, data, avail);
        const int64_t bytes = std::min(capacity - total, avail);
        if (bytes < 1) return 0;
        if (pages == segment_pages::released && seg[k].cap >= kLargeBytes) {
            move_pages(&seg[k], dst + total, data, bytes);
        } else {
            memcpy(dst + total, data, static_cast<size_t>(bytes));
        }
        total += bytes;
    }
    return total;
}

void stereo2mono(int16_t *dst, const int16_t *src, int32_t frames) {
    for (int64_t i = 0; i < frames; ++i) {
        dst[i] = static_cast<int16_t>((src[2 * i] + src[2 * i + 1]) / 2);
    }
}
