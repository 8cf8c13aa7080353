#include "pcm/block_search.h"

#include <cstring>

namespace {

// The first bytes of a place, whose address may be odd. They rule out nearly every place.
uint64_t load_head(const uint8_t *bytes) {
    uint64_t head = 0;
    memcpy(&head, bytes, sizeof head);
    return head;
}

bool is_block(const uint8_t *place, const uint8_t *block, uint64_t head) {
    return load_head(place) == head && memcmp(place, block, kBlockBytes) == 0;
}

}  // namespace

int64_t find_lowest(const uint8_t *pcm, place_range range, const uint8_t *block) {
    const uint64_t head = load_head(block);
    for (int64_t place = range.first; place < range.end; ++place) {
        if (is_block(pcm + place, block, head)) return place;
    }
    return kNoPlace;
}

int64_t find_highest(const uint8_t *pcm, place_range range, const uint8_t *block) {
    const uint64_t head = load_head(block);
    for (int64_t place = range.end - 1; place >= range.first; --place) {
        if (is_block(pcm + place, block, head)) return place;
    }
    return kNoPlace;
}
