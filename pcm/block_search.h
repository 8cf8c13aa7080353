// Finding the same audio in two decodings: both hold the same run of bytes.
//
// In: a block of 200 bytes and the places to look at. Out: a place. Called by pcm/stitch.h for the
// seams and by pcm/from_highlight.h for the landing point of a seek.
#ifndef TAVO_PCM_BLOCK_SEARCH_H
#define TAVO_PCM_BLOCK_SEARCH_H

#include <cstdint>

constexpr int64_t kBlockBytes = 200;
constexpr int64_t kNoPlace = -1;

// Byte offsets at which the block may begin, first to end - 1. All kBlockBytes bytes at each of
// them are readable.
struct place_range {
    int64_t first;
    int64_t end;
};

// The lowest or the highest place in the range where pcm holds the block's bytes; kNoPlace without
// one.
int64_t find_lowest(const uint8_t *pcm, place_range range, const uint8_t *block);
int64_t find_highest(const uint8_t *pcm, place_range range, const uint8_t *block);

#endif
