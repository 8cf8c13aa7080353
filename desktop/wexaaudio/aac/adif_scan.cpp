#include "desktop/wexaaudio/aac/adif_scan.h"

#include <algorithm>
#include <cstring>

namespace {

constexpr int32_t kHeadBytes = 4096;  // at most: 16 program configurations with comments
constexpr int32_t kCopyrightBits = 72;
constexpr int32_t kWindowBytes = 131072;  // decoded at a time
constexpr int32_t kWindowBlocks = 1024;   // likewise, at most
// A block that starts within this distance of a window's end may not lie in it whole: 768 bytes for
// each of 48 channels.
constexpr int32_t kMaxBlockBytes = 36864;

uint32_t bits_at(const uint8_t *p, int64_t at, int32_t count) {
    uint32_t value = 0;
    for (int32_t i = 0; i < count; ++i, ++at) {
        value = value << 1 | (static_cast<uint32_t>(p[at / 8]) >> (7 - at % 8) & 1U);
    }
    return value;
}

// Returns the header's length in bytes, 0 when it is none that can be used. The first program is
// the one that is decoded.
int32_t read_head(aac_config *config, const uint8_t *p, int32_t bytes) {
    if (bytes < 64 || memcmp(p, "ADIF", 4) != 0) return 0;
    int64_t at = 32;
    at += 1 + (bits_at(p, at, 1) != 0 ? kCopyrightBits : 0);
    at += 2;  // original, home
    const bool constant_rate = bits_at(p, at, 1) == 0;
    at += 1 + 23;  // and the bit rate
    const uint32_t programs = bits_at(p, at, 4) + 1;
    at += 4;
    for (uint32_t i = 0; i < programs; ++i) {
        at += constant_rate ? 20 : 0;  // buffer fullness
        if (at + 16 > static_cast<int64_t>(bytes) * 8) return 0;
        const auto object_type = static_cast<int32_t>(bits_at(p, at + 4, 2)) + 1;
        const auto rate_index = static_cast<int32_t>(bits_at(p, at + 6, 4));
        aac_config other;
        at = aac_config_from_program(i == 0 ? config : &other, p, bytes, at, object_type,
                                     rate_index);
        if (at < 0) return 0;
    }
    return static_cast<int32_t>((at + 7) / 8);
}

// Decodes a window of the file from offset on and adds the blocks whose end is known; of the last
// window, all. Returns the offset of the first block that was not added, the end of the file when
// there is none, -1 on failure.
int64_t add_blocks(io_file *file, const codec_library *library, av_decoder *d, int64_t offset,
                   frame_index *frames) {
    const auto bytes = static_cast<int32_t>(std::min<int64_t>(file->size - offset, kWindowBytes));
    uint8_t *packet = library->packet(d, bytes);
    if (packet == nullptr || io_file_read(file, offset, packet, bytes) != bytes) return -1;
    const bool last = offset + bytes == file->size;
    const int32_t whole = last ? bytes : bytes - kMaxBlockBytes;  // what starts before lies inside
    int32_t begin[kWindowBlocks];
    const int32_t count = library->split(d, whole, begin, kWindowBlocks);
    for (int32_t i = 0; i < count; ++i) {
        const bool is_last = i + 1 == count;
        if (begin[i] > whole || (is_last && count == kWindowBlocks)) return offset + begin[i];
        const int32_t end = is_last ? bytes : begin[i + 1];
        if (!frame_index_add(frames, offset + begin[i], end - begin[i], 0)) return -1;
    }
    return file->size;
}

}  // namespace

bool adif_scan(io_file *file, const codec_library *library, int64_t start, aac_config *config,
               frame_index *frames) {
    int32_t got = 0;
    const uint8_t *p = io_file_peek(file, start, kHeadBytes, &got);
    const int32_t head = p != nullptr ? read_head(config, p, got) : 0;
    av_decoder *d = head > 0 ? library->open("aac", config->bytes, config->size) : nullptr;
    int64_t offset = d != nullptr ? start + head : -1;
    while (offset >= 0 && offset < file->size) {
        offset = add_blocks(file, library, d, offset, frames);
    }
    library->close(d);
    return offset >= 0 && frames->count > 0;
}
