#include "pcm/block_search.h"

#include <cstring>

namespace {

// Loads eight bytes from any address. Comparing a block's first eight rules out most offsets.
uint64_t load_head(const uint8_t *bytes) {
    uint64_t head = 0;
    memcpy(&head, bytes, sizeof head);
    return head;
}

bool is_block(const uint8_t *bytes, const uint8_t *block, uint64_t head) {
    return load_head(bytes) == head && memcmp(bytes, block, kBlockBytes) == 0;
}

}  // namespace

int64_t find_lowest(const uint8_t *pcm, offset_range range, const uint8_t *block) {
    const uint64_t head = load_head(block);
    for (int64_t offset = range.first; offset < range.end; ++offset) {
        if (is_block(pcm + offset, block, head)) return offset;
    }
    return kNotFound;
}

int64_t find_highest(const uint8_t *pcm, offset_range range, const uint8_t *block) {
    const uint64_t head = load_head(block);
    for (int64_t offset = range.end - 1; offset >= range.first; --offset) {
        if (is_block(pcm + offset, block, head)) return offset;
    }
    return kNotFound;
}
