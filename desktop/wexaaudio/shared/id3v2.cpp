#include "desktop/wexaaudio/shared/id3v2.h"

#include <cstring>

int64_t id3v2_bytes(const uint8_t *p) {
    if (memcmp(p, "ID3", 3) != 0 || p[3] < 2 || p[3] > 4 || p[4] == 0xFF) return 0;
    const int64_t size =
        (p[6] & 0x7F) << 21 | (p[7] & 0x7F) << 14 | (p[8] & 0x7F) << 7 | (p[9] & 0x7F);
    const bool footer = (p[5] & 0x10) != 0;
    return kId3v2Head + size + (footer ? kId3v2Head : 0);
}

int64_t id3v2_end(io_file *file) {
    int64_t offset = 0;
    int64_t tag = 1;
    while (tag > 0) {
        const uint8_t *p = io_file_bytes(file, offset, kId3v2Head);
        tag = p != nullptr ? id3v2_bytes(p) : 0;
        offset += tag;
    }
    return offset;
}
