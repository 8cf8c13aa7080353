#include "desktop/wexaaudio/ogg/ogg_scan.h"

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>

namespace {

constexpr int32_t kNameBytes = 7;               // packet type and "vorbis"
constexpr int32_t kIdBytes = 30;                // of the identification packet
constexpr int32_t kChannelsAt = 11;             // in it
constexpr int32_t kRateAt = 12;                 // likewise; 32-bit, little endian
constexpr int32_t kMaxCodebooks = 1 << 20;      // bytes; usual ones have 3 to 10 thousand
constexpr int64_t kMaxGranule = INT64_MAX / 2;  // larger ones count as this: sums stay exact
constexpr int32_t kMaxPacket32 = 1 << 26;       // bytes; comments may hold pictures

// Replace the file's own comments, which no decoder needs and which may hold a picture.
constexpr uint8_t kNoComments[] = {3, 'v', 'o', 'r', 'b', 'i', 's', 0, 0, 0, 0, 0, 0, 0, 0, 1};
constexpr int32_t kPackHead = 3;  // the mark and the lengths of the first two packets, below 255

bool is_header(const uint8_t *packet, int32_t bytes, int32_t number) {
    return bytes >= kNameBytes && packet[0] == 2 * number + 1 &&
           memcmp(packet + 1, "vorbis", kNameBytes - 1) == 0;
}

bool read_packet(const ogg_scan *scan, int32_t number, uint8_t *packet) {
    const int32_t bytes = scan->header_bytes[number];
    return stream_copy(scan->file, scan->info, scan->header_at[number], packet, bytes) == bytes &&
           is_header(packet, bytes, number);
}

// Packs the identification and set-up packets into p. False when they are not Vorbis headers.
bool pack(const ogg_scan *scan, uint8_t *p) {
    p[0] = kVorbisSetupMark;
    p[1] = kIdBytes;
    p[2] = sizeof kNoComments;
    uint8_t *comments = p + kPackHead + kIdBytes;
    memcpy(comments, kNoComments, sizeof kNoComments);
    const uint8_t *id = p + kPackHead;
    if (!read_packet(scan, 0, p + kPackHead) ||
        !read_packet(scan, 2, comments + sizeof kNoComments)) {
        return false;
    }
    uint32_t rate = 0;
    for (int32_t i = 3; i >= 0; --i) rate = rate << 8 | id[kRateAt + i];
    scan->info->channels = id[kChannelsAt];
    scan->info->rate = rate <= INT32_MAX ? static_cast<int32_t>(rate) : 0;
    return scan->info->rate > 0 && scan->info->channels > 0;
}

// Prepares the stream once its three header packets are complete.
bool read_headers(ogg_scan *scan) {
    const int32_t books = scan->header_bytes[2];
    uint8_t name[kNameBytes];
    if (scan->header_bytes[0] != kIdBytes || books > kMaxCodebooks ||
        stream_copy(scan->file, scan->info, scan->header_at[1], name, kNameBytes) != kNameBytes ||
        !is_header(name, kNameBytes, 1)) {
        return false;
    }
    stream_info *info = scan->info;
    info->setup_bytes = kPackHead + kIdBytes + static_cast<int32_t>(sizeof kNoComments) + books;
    info->setup = static_cast<uint8_t *>(malloc(static_cast<size_t>(info->setup_bytes)));
    if (info->setup == nullptr || !pack(scan, info->setup)) return false;
    scan->parser = scan->library->parser_open(info->setup, info->setup_bytes);
    return scan->parser != nullptr;
}

// Adds a packet that is complete.
bool add_packet(ogg_scan *scan) {
    if (scan->headers < kVorbisHeaders) {
        if (scan->packet_bytes < kNameBytes) return false;
        scan->header_at[scan->headers] = scan->packet_at;
        scan->header_bytes[scan->headers] = scan->packet_bytes;
        ++scan->headers;
        return scan->headers < kVorbisHeaders || read_headers(scan);
    }
    if (scan->packet_bytes == 0) return true;
    const int32_t samples = scan->library->parser_samples(scan->parser, scan->packet_first);
    if (samples <= 0) return true;  // not an audio packet: not decoded
    // The first packet only primes the decoder for the next.
    frame_index *packets = &scan->info->frames;
    return frame_index_add(packets, scan->packet_at, scan->packet_bytes,
                           packets->count > 0 ? samples : 0);
}

// The first granule position states where the stream starts. More audio than it counts is cut off
// at the start, unless the stream also ends here, when it is cut at the end.
void apply_first_granule(ogg_scan *scan, int64_t granule, bool ends) {
    frame_index *packets = &scan->info->frames;
    const int64_t surplus = frame_index_end(packets) - granule;
    scan->has_base = true;
    scan->base = std::max<int64_t>(-surplus, 0);
    if (surplus <= 0 || ends) return;
    int64_t cut = surplus;
    for (int64_t i = 0; i < packets->count; ++i) {
        frame_entry &entry = packets->entry[i];
        const auto part = static_cast<int32_t>(std::min<int64_t>(cut, entry.samples));
        entry.first = std::max<int64_t>(entry.first - surplus, 0);
        entry.samples -= part;
        cut -= part;
        if (part > 0 && entry.samples > 0) {
            scan->info->cut_frame = i;
            scan->info->cut_samples = part;
        }
    }
}

// Reads the page's lacing values.
bool read_segments(ogg_scan *scan, const ogg_page *page, int64_t body_first) {
    const int32_t segments = page->header[26];
    const uint8_t *lacing = page->header + 27;
    int64_t at = 0;
    bool skipping = !scan->open && ogg_page_continued(page) != 0;
    for (int32_t i = 0; i < segments; ++i) {
        if (!scan->open && !skipping) {
            scan->open = true;
            scan->packet_at = body_first + at;
            scan->packet_bytes = 0;
            scan->packet_first = lacing[i] > 0 ? page->body[at] : 0;
        }
        at += lacing[i];
        if (scan->open) scan->packet_bytes += lacing[i];
        if (scan->packet_bytes > kMaxPacket32) return false;
        if (lacing[i] == 255) continue;
        const bool whole = scan->open;
        scan->open = false;
        skipping = false;
        if (whole && !add_packet(scan)) return false;
    }
    return true;
}

}  // namespace

bool ogg_scan_page(ogg_scan *scan, ogg_page *page, int64_t body_at) {
    frame_index *pages = &scan->info->pages;
    const frame_index *packets = &scan->info->frames;
    const int64_t body_first = frame_index_end(pages);
    const auto body_bytes = static_cast<int32_t>(page->body_len);
    if (body_bytes > 0 && !frame_index_add(pages, body_at, body_bytes, body_bytes)) return false;
    // A packet continues only in the next page, and only if that page states it; else it is lost.
    const long number = ogg_page_pageno(page);
    const bool missing = number != scan->next_page;
    if (missing || ogg_page_continued(page) == 0) scan->open = false;
    scan->gap = scan->gap || missing;
    scan->next_page = number + 1;
    const int64_t granule = std::min<int64_t>(ogg_page_granulepos(page), kMaxGranule);
    if (granule >= 0) scan->page_end = frame_index_end(packets);
    if (!read_segments(scan, page, body_first)) return false;
    if (granule < 0 || packets->count == 0) return true;
    if (!scan->has_base) {
        apply_first_granule(scan, granule, ogg_page_eos(page) != 0);
    } else if (scan->gap) {
        scan->base = granule - frame_index_end(packets);  // lost time is not filled
    }
    scan->gap = false;
    scan->last_end = granule - scan->base;
    return true;
}

bool ogg_scan_end(ogg_scan *scan) {
    frame_index *packets = &scan->info->frames;
    if (!scan->has_base) return packets->count > 0;
    // Never before the end of the page before the last: a smaller position is damage.
    const int64_t end = std::max(scan->last_end, scan->page_end);
    for (int64_t i = packets->count - 1; i >= 0 && frame_index_end(packets) > end; --i) {
        frame_entry &entry = packets->entry[i];
        entry.samples =
            static_cast<int32_t>(std::clamp<int64_t>(end - entry.first, 0, entry.samples));
        packets->count = entry.samples == 0 ? i : packets->count;
    }
    return packets->count > 0;
}
