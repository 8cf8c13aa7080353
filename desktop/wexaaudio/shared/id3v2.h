// Detects ID3v2 tags, which may come before any bare stream and, in MPEG audio, inside it.
#pragma once

#include <cstdint>
#include <cstring>

constexpr int32_t kId3v2Head = 10;  // bytes; a footer is as long

// Returns the length in bytes of the tag that starts at `p`, including any footer, or 0 if no tag
// starts there. `p` has kId3v2Head bytes or is null.
inline int64_t id3v2_bytes(const uint8_t *p) {
    if (p == nullptr || memcmp(p, "ID3", 3) != 0 || p[3] < 2 || p[3] > 4 || p[4] == 0xFF) return 0;
    const int64_t size =
        (p[6] & 0x7F) << 21 | (p[7] & 0x7F) << 14 | (p[8] & 0x7F) << 7 | (p[9] & 0x7F);
    const bool footer = (p[5] & 0x10) != 0;
    return kId3v2Head + size + (footer ? kId3v2Head : 0);
}
