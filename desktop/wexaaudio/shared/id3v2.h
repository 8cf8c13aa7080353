// ID3v2 tags, which may precede any bare stream and, in MPEG audio, interrupt it.
#ifndef WEXAAUDIO_ID3V2_H
#define WEXAAUDIO_ID3V2_H

#include "desktop/wexaaudio/shared/io_file.h"

constexpr int32_t kId3v2Head = 10;  // bytes, also of the footer

// Total bytes of the tag that starts with these kId3v2Head bytes, footer included; 0 if it is not a
// tag.
int64_t id3v2_bytes(const uint8_t *p);

// Offset of what follows the tags at the start of the file.
int64_t id3v2_end(io_file *file);

#endif
