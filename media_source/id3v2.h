// Length of an ID3v2 tag. Tags occur before and inside audio streams. Used by the probes.
#pragma once

#include <cstdint>

constexpr int32_t kId3HeaderBytes = 10;

// Returns the length in bytes of the tag that starts with the 10 bytes of `header`, without any
// footer. The header stores the size as four groups of 7 bits.
inline int64_t id3v2_length(const uint8_t *header) {
    return kId3HeaderBytes + ((header[6] & 0x7F) << 21) + ((header[7] & 0x7F) << 14) +
           ((header[8] & 0x7F) << 7) + (header[9] & 0x7F);
}
