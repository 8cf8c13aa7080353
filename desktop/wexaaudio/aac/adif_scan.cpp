#include "desktop/wexaaudio/aac/adif_scan.h"

#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/shared/av_decoder.h"

extern "C" {
#include <libavcodec/avcodec.h>
}

namespace {

constexpr int32_t kHeadBytes = 4096;      // at most: 16 program configurations with comments
constexpr int32_t kCopyrightBits = 72;    //
constexpr int32_t kWindowBytes = 131072;  // decoded at a time
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
    if (bytes < 64 || memcmp(p, "ADIF", 4) != 0) {
        return 0;
    }
    int64_t at = 32;
    at += 1 + (bits_at(p, at, 1) != 0 ? kCopyrightBits : 0);
    at += 2;  // original, home
    const bool constant_rate = bits_at(p, at, 1) == 0;
    at += 1 + 23;  // and the bit rate
    const uint32_t programs = bits_at(p, at, 4) + 1;
    at += 4;
    for (uint32_t i = 0; i < programs; ++i) {
        at += constant_rate ? 20 : 0;  // buffer fullness
        if (at + 16 > static_cast<int64_t>(bytes) * 8) {
            return 0;
        }
        const int32_t object_type = static_cast<int32_t>(bits_at(p, at + 4, 2)) + 1;
        const int32_t rate_index = static_cast<int32_t>(bits_at(p, at + 6, 4));
        aac_config other;
        at = aac_config_from_program(i == 0 ? config : &other, p, bytes, at, object_type,
                                     rate_index);
        if (at < 0) {
            return 0;
        }
    }
    return static_cast<int32_t>((at + 7) / 8);
}

struct window {
    uint8_t *data;   // [kWindowBytes]
    int64_t offset;  // of data[0] in the file
    int32_t bytes;
    bool last;  // it reaches the end of the file
};

// Decodes the window's blocks and adds those whose end is known, or all of the last window's.
// *next receives the offset of the first block that was not added, -1 when there is no more.
// libavcodec states, with each frame, how much of its packet was left when the frame was begun.
bool add_blocks(aac_stream *s, av_decoder *d, const window &w, int64_t *next) {
    *next = -1;
    if (av_new_packet(d->packet, w.bytes) != 0) {
        return false;
    }
    memcpy(d->packet->data, w.data, static_cast<size_t>(w.bytes));
    const int sent = avcodec_send_packet(d->ctx, d->packet);
    av_packet_unref(d->packet);
    int32_t begun = -1;
    while (sent == 0 && avcodec_receive_frame(d->ctx, d->frame) == 0) {
        const int32_t begin = w.bytes - d->frame->pkt_size;
        if (begin <= begun || begin >= w.bytes) {
            return false;
        }
        if (begun >= 0 && !frame_index_add(&s->index, {w.offset + begun, -1, begin - begun, 0})) {
            return false;
        }
        begun = begin;
        if (!w.last && begin > w.bytes - kMaxBlockBytes) {
            *next = w.offset + begin;
            return true;
        }
    }
    return begun < 0 || frame_index_add(&s->index, {w.offset + begun, -1, w.bytes - begun, 0});
}

bool scan_blocks(aac_stream *s, av_decoder *d, uint8_t *data, int64_t offset) {
    bool ok = true;
    while (ok && offset >= 0 && offset < s->file->size) {
        const int64_t got = io_file_read(s->file, offset, data, kWindowBytes);
        const window w = {data, offset, static_cast<int32_t>(got), offset + got >= s->file->size};
        ok = got > 0 && add_blocks(s, d, w, &offset);
        av_decoder_flush(d);  // drops what the window held beyond
    }
    return ok && s->index.count > 0;
}

}  // namespace

bool adif_scan(aac_stream *s, int64_t start) {
    int32_t got = 0;
    const uint8_t *p = io_file_peek(s->file, start, kHeadBytes, &got);
    const int32_t head = p != nullptr ? read_head(&s->config, p, got) : 0;
    if (head == 0) {
        return false;
    }
    av_decoder d = {};
    av_setup setup = {};
    setup.extra = s->config.bytes;
    setup.extra_bytes = s->config.size;
    uint8_t *data = static_cast<uint8_t *>(malloc(kWindowBytes));
    const bool ok = data != nullptr && av_decoder_open(&d, "aac", &setup) &&
                    scan_blocks(s, &d, data, start + head);
    free(data);
    av_decoder_close(&d);
    return ok;
}
