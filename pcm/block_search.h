// Finds a block of 200 bytes in a buffer of PCM, to locate the same audio in two decodings.
//
// Input: the block and the offsets to test. Output: an offset. Called by pcm/stitch.cpp for the
// splice points and by pcm/from_highlight.cpp for the position of a seek.
#ifndef TAVO_PCM_BLOCK_SEARCH_H
#define TAVO_PCM_BLOCK_SEARCH_H

#include <cstdint>

constexpr int64_t kBlockBytes = 200;
constexpr int64_t kNotFound = -1;

// Byte offsets at which the block may begin, `first` to `end` - 1. kBlockBytes bytes can be read at
// each of them.
struct offset_range {
    int64_t first;
    int64_t end;
};

// Returns the lowest (highest) offset in the range at which pcm holds the block, or kNotFound.
int64_t find_lowest(const uint8_t *pcm, offset_range range, const uint8_t *block);
int64_t find_highest(const uint8_t *pcm, offset_range range, const uint8_t *block);

#endif
