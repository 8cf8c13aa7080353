// Finds the same audio in two decodings: the same bytes.
//
// In: a block of 200 bytes and the offsets to look at. Out: an offset. Called by pcm/stitch.cpp for
// the splices and by pcm/from_highlight.cpp for the position of a seek.
#ifndef TAVO_PCM_BLOCK_SEARCH_H
#define TAVO_PCM_BLOCK_SEARCH_H

#include <cstdint>

constexpr int64_t kBlockBytes = 200;
constexpr int64_t kNotFound = -1;

// Byte offsets at which the block may begin, first to end - 1. All kBlockBytes bytes at each of
// them are readable.
struct offset_range {
    int64_t first;
    int64_t end;
};

// Returns the lowest or the highest offset in the range at which pcm holds the block's bytes, or
// kNotFound.
int64_t find_lowest(const uint8_t *pcm, offset_range range, const uint8_t *block);
int64_t find_highest(const uint8_t *pcm, offset_range range, const uint8_t *block);

#endif
