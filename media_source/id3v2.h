// Length of an ID3v2 tag, which may come before or inside an audio stream. Used by the probes.
#ifndef TAVO_MEDIA_SOURCE_ID3V2_H
#define TAVO_MEDIA_SOURCE_ID3V2_H

#include <cstdint>

constexpr int32_t kId3HeaderBytes = 10;

// header: the tag's first 10 bytes. Returns the bytes from the start of the tag to its end, not
// counting a footer. The header stores the size as four groups of 7 bits.
inline int64_t id3v2_length(const uint8_t *header) {
    return kId3HeaderBytes + ((header[6] & 0x7F) << 21) + ((header[7] & 0x7F) << 14) +
           ((header[8] & 0x7F) << 7) + (header[9] & 0x7F);
}

#endif
