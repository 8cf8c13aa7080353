#include "desktop/wexaaudio/mpeg/mpeg_header.h"

#include <cstring>
#include <initializer_list>

namespace {

constexpr int32_t kVersionReserved = 1;
constexpr int32_t kVersion1 = 3;
constexpr int32_t kVersion25 = 0;
constexpr int32_t kModeMono = 3;
constexpr int32_t kVbriAt = 36;  // bytes after the frame's start, for any size of side information

// MPEG-1 sample rates in Hz. MPEG-2 rates are half of these, and MPEG-2.5 rates are a quarter.
constexpr int32_t kRates[3] = {44100, 48000, 32000};

// Bitrates in kbit/s, indexed by [0 for MPEG-1, 1 for others][layer - 1][bitrate index].
constexpr int32_t kBitrates[2][3][15] = {
    {{0, 32, 64, 96, 128, 160, 192, 224, 256, 288, 320, 352, 384, 416, 448},
     {0, 32, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320, 384},
     {0, 32, 40, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320}},
    {{0, 32, 48, 56, 64, 80, 96, 112, 128, 144, 160, 176, 192, 224, 256},
     {0, 8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160},
     {0, 8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160}}};

int32_t frame_bytes(const mpeg_header &h, int32_t kbits, int32_t padding) {
    const int32_t bits = kbits * 1000;
    if (h.layer == 1) return 4 * (12 * bits / h.rate + padding);
    const int32_t factor = h.layer == 3 && h.version != 1 ? 72 : 144;
    return factor * bits / h.rate + padding;
}

// Returns the number of bytes from the start of a Layer III frame to its main data.
int32_t main_data_at(const mpeg_header *h) {
    const int32_t side =
        h->version == 1 ? (h->channels == 1 ? 17 : 32) : (h->channels == 1 ? 9 : 17);
    return kMpegHeaderBytes + (h->has_crc ? 2 : 0) + side;
}

}  // namespace

bool mpeg_parse(const uint8_t *p, mpeg_header *h) {
    const int32_t version = p[1] >> 3 & 3;
    const int32_t layer = 4 - (p[1] >> 1 & 3);
    const int32_t bitrate = p[2] >> 4;
    const int32_t rate = p[2] >> 2 & 3;
    if (p[0] != 0xFF || (p[1] & 0xE0) != 0xE0 || version == kVersionReserved || layer == 4 ||
        bitrate == 0 || bitrate == 15 || rate == 3) {
        return false;
    }
    h->version = version == kVersion1 ? 1 : version == kVersion25 ? 25 : 2;
    if (h->version == 25 && layer != 3) return false;
    h->layer = layer;
    h->rate = kRates[rate] / (h->version == 1 ? 1 : h->version == 2 ? 2 : 4);
    h->channels = p[3] >> 6 == kModeMono ? 1 : 2;
    h->samples = layer == 1 ? 384 : layer == 3 && h->version != 1 ? 576 : 1152;
    h->has_crc = (p[1] & 1) == 0;
    h->bytes =
        frame_bytes(*h, kBitrates[h->version == 1 ? 0 : 1][layer - 1][bitrate], p[2] >> 1 & 1);
    return true;
}

bool mpeg_same_stream(const mpeg_header *a, const mpeg_header *b) {
    return a->version == b->version && a->layer == b->layer && a->rate == b->rate;
}

bool mpeg_is_info_frame(const mpeg_header *h, const uint8_t *p, int32_t bytes) {
    if (h->layer != 3) return false;
    // Some encoders place the info tag as if there were no checksum.
    const int32_t at = main_data_at(h);
    for (const int32_t place : {at, h->has_crc ? at - 2 : at}) {
        if (place + 4 <= bytes &&
            (memcmp(p + place, "Xing", 4) == 0 || memcmp(p + place, "Info", 4) == 0)) {
            return true;
        }
    }
    return kVbriAt + 4 <= bytes && memcmp(p + kVbriAt, "VBRI", 4) == 0;
}

void mpeg_describe(const mpeg_header *head, stream_info *info) {
    info->codec = "mp3float";  // all three layers
    info->rate = head->rate;
    info->channels = head->channels;
    info->out_channels = head->channels;
    // The filter bank's memory spans at most two frames (in Layer I and in Layer III of MPEG-2).
    // The third frame is a cheap margin.
    info->preroll = 3;
    info->reservoir = head->layer == 3 ? kMpegMaxBackstep : 0;
    info->overhead = main_data_at(head);
}
