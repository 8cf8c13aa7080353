// Finds a 200-byte block in a buffer of PCM, to locate the same audio in two decodings.
//
// Input: the block and the offsets to test. Output: an offset. Called by pcm/stitch.cpp to find
// splice points and by pcm/from_highlight.cpp to find the position that a seek reached.
#pragma once

#include <cstdint>

constexpr int64_t kBlockBytes = 200;
constexpr int64_t kNotFound = -1;

// Byte offsets at which the block may begin, from `first` to `end` - 1. kBlockBytes bytes must be
// readable at each of them.
struct offset_range {
    int64_t first;
    int64_t end;
};

// Return the lowest and the highest offset in the range, respectively, at which `pcm` contains the
// block, or kNotFound if there is none.
int64_t find_lowest(const uint8_t *pcm, offset_range range, const uint8_t *block);
int64_t find_highest(const uint8_t *pcm, offset_range range, const uint8_t *block);
