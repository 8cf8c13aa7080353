// Parses the four-byte headers of MPEG audio frames (ISO/IEC 11172-3, 13818-3 and the 2.5
// extension) and the parts of a frame's body that the readers need.
#pragma once

#include <cstdint>

#include "desktop/wexaaudio/shared/scan_cache.h"

constexpr int32_t kMpegHeaderBytes = 4;
constexpr int32_t kMpegMaxFrame = 1732;    // bytes: Layer II, 384 kbit/s at 32 kHz, padded
constexpr int32_t kMpegMaxBackstep = 511;  // bytes of main data that may precede a Layer III frame

struct mpeg_header {
    int32_t version;   // 1, 2, or 25 for 2.5
    int32_t layer;     // 1 to 3
    int32_t rate;      // Hz
    int32_t channels;  // 1 or 2
    int32_t samples;   // sample frames
    int32_t bytes;     // of the compressed frame
    bool has_crc;      // two bytes follow the header
};

// Parses four bytes. Returns false if they are not a header or are a free-format header.
bool mpeg_parse(const uint8_t *p, mpeg_header *h);

// True if both frames may belong to the same stream: version, layer and rate are equal.
bool mpeg_same_stream(const mpeg_header *a, const mpeg_header *b);

// True if a stream's first frame is an encoder's info frame (Xing, Info, VBRI) instead of audio.
// `p` has the first `bytes` bytes of the frame.
bool mpeg_is_info_frame(const mpeg_header *h, const uint8_t *p, int32_t bytes);

// Sets the fields of `info` that determine how frames like `head` are decoded.
void mpeg_describe(const mpeg_header *head, stream_info *info);
