// FLAC's stream information block and frame headers (RFC 9639).
#ifndef WEXAAUDIO_FLAC_HEADER_H
#define WEXAAUDIO_FLAC_HEADER_H

#include <cstdint>

constexpr int32_t kFlacInfoBytes = 34;    // of the stream information block
constexpr int32_t kFlacMaxHeader = 16;    // bytes of a frame header
constexpr int32_t kFlacMinFrame = 10;     // bytes: header, one constant subframe, check sum
constexpr int32_t kFlacMaxBits = 24;      // more is not decoded by the library underneath
constexpr int32_t kFlacMaxBlock = 65535;  // sample frames

struct flac_info {
    int32_t max_block;  // sample frames of the longest block
    int32_t rate;       // Hz, 0 not stated
    int32_t channels;   // 1 to 8
    int32_t bits;       // 4 to 24
    int64_t total;      // sample frames, 0 not stated
};

struct flac_header {
    bool variable;   // number counts sample frames instead of blocks
    int64_t number;  // of the first sample frame or of the block
    int32_t block;   // sample frames
    int32_t rate;    // Hz
    int32_t channels;
    int32_t bits;
    int32_t bytes;  // of the header
};

// p holds kFlacInfoBytes bytes. False when the values cannot be.
bool flac_parse_info(const uint8_t *p, flac_info *info);

// The frame header at p, of which got bytes can be read; its check sum is verified. info supplies
// what a header may leave out.
bool flac_parse(const uint8_t *p, int32_t got, const flac_info *info, flac_header *h);

// Upper bound of the frame's size: every sample stored as it is.
int32_t flac_max_bytes(int32_t block, int32_t channels, int32_t bits);

// The frame check sum continued over n more bytes; over a whole frame from 0 it is 0.
uint16_t flac_crc16(uint16_t crc, const uint8_t *p, int64_t n);

#endif
