#include "desktop/wexaaudio/ogg/ogg_scan.h"

#include <algorithm>
#include <climits>
#include <cstdlib>

#include "desktop/wexaaudio/shared/tags.h"

extern "C" {
#include <libavcodec/vorbis_parser.h>
}

namespace {

constexpr int32_t kNameBytes = 7;         // packet type and "vorbis"
constexpr int64_t kMaxHeader = 1 << 26;   // bytes of one header packet; comments may hold pictures
constexpr int64_t kMaxHoleSeconds = 600;  // a longer one is a damaged granule position

uint8_t *copy_header(const ogg_scan *scan, int32_t number) {
    const int32_t bytes = scan->header_bytes[number];
    uint8_t *data = static_cast<uint8_t *>(malloc(static_cast<size_t>(bytes)));
    if (data != nullptr &&
        !ogg_index_copy(scan->index, scan->file, scan->header_at[number], data, bytes)) {
        free(data);
        return nullptr;
    }
    return data;
}

// With the three header packets in place.
bool use_headers(ogg_scan *scan) {
    uint8_t *packet[kVorbisHeaders] = {};
    bool ok = true;
    for (int32_t i = 0; i < kVorbisHeaders && ok; ++i) {
        packet[i] = copy_header(scan, i);
        ok = packet[i] != nullptr && vorbis_is_header(packet[i], scan->header_bytes[i], i);
    }
    ogg_index *index = scan->index;
    if (ok) {
        tags_from_vorbis(scan->tags, packet[1] + kNameBytes,
                         static_cast<size_t>(scan->header_bytes[1] - kNameBytes));
        ok = vorbis_setup_pack(&index->setup, packet[0], scan->header_bytes[0], packet[2],
                               scan->header_bytes[2]);
    }
    for (uint8_t *data : packet) {
        free(data);
    }
    scan->parser = ok ? av_vorbis_parse_init(index->setup.data, index->setup.bytes) : nullptr;
    return scan->parser != nullptr;
}

bool add_header(ogg_scan *scan) {
    if (scan->packet_bytes < kNameBytes) {
        return false;
    }
    scan->header_at[scan->headers] = scan->packet_at;
    scan->header_bytes[scan->headers] = scan->packet_bytes;
    ++scan->headers;
    return scan->headers < kVorbisHeaders || use_headers(scan);
}

// A whole packet has been passed.
bool add_packet(ogg_scan *scan) {
    if (scan->headers < kVorbisHeaders) {
        return add_header(scan);
    }
    const int32_t samples =
        av_vorbis_parse_frame(scan->parser, &scan->packet_first, std::min(scan->packet_bytes, 1));
    if (samples <= 0) {
        return true;  // no audio packet: the decoder is not troubled with it
    }
    const bool primed = scan->primed;
    scan->primed = true;
    return frame_index_add(&scan->index->packets,
                           {scan->packet_at, -1, scan->packet_bytes, primed ? samples : 0});
}

// Pages are missing before this one: what has begun is lost, and the time that passed meanwhile is
// known at the next granule position.
bool pass_hole(ogg_scan *scan) {
    scan->open = false;
    if (scan->headers < kVorbisHeaders) {
        return false;
    }
    scan->primed = false;
    if (scan->hole >= 0 || !scan->has_base) {
        return true;
    }
    scan->hole = scan->index->packets.count;
    return frame_index_add(&scan->index->packets, {0, -1, 0, 0});
}

// Gives the hole before this page the length that makes the audio end where the page says.
void fill_hole(ogg_scan *scan, int64_t granule) {
    frame_index *packets = &scan->index->packets;
    const int64_t missing = granule - scan->base - frame_index_end(packets);
    const int64_t most =
        std::min<int64_t>(kMaxHoleSeconds * scan->index->setup.sample_rate, INT32_MAX);
    if (missing > 0 && missing <= most) {
        packets->entry[scan->hole].samples = static_cast<int32_t>(missing);
        for (int64_t i = scan->hole + 1; i < packets->count; ++i) {
            packets->entry[i].first += missing;
        }
    }
    scan->hole = -1;
}

// The first granule position says where the stream starts. More audio than it counts is cut off at
// the front, unless the stream also ends here, when it is cut at the end.
void use_first_granule(ogg_scan *scan, int64_t granule, bool ends) {
    frame_index *packets = &scan->index->packets;
    const int64_t surplus = frame_index_end(packets) - granule;
    scan->has_base = true;
    scan->base = std::max<int64_t>(-surplus, 0);
    if (surplus <= 0 || ends) {
        return;
    }
    int64_t cut = surplus;
    for (int64_t i = 0; i < packets->count; ++i) {
        frame_entry &entry = packets->entry[i];
        const int32_t part = static_cast<int32_t>(std::min<int64_t>(cut, entry.samples));
        entry.first = std::max<int64_t>(entry.first - surplus, 0);
        entry.samples -= part;
        cut -= part;
        if (part > 0 && entry.samples > 0) {
            scan->index->cut_packet = i;
            scan->index->cut_samples = part;
        }
    }
}

void use_granule(ogg_scan *scan, int64_t granule, bool ends) {
    if (granule < 0 || scan->index->packets.count == 0) {
        return;
    }
    if (!scan->has_base) {
        use_first_granule(scan, granule, ends);
    } else if (scan->hole >= 0) {
        fill_hole(scan, granule);
    }
    scan->last_end = granule - scan->base;
}

// Walks the page's lacing values.
bool take_segments(ogg_scan *scan, const ogg_page *page, int64_t body_first) {
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
        if (scan->open) {
            scan->packet_bytes += lacing[i];
            if (scan->packet_bytes > kMaxHeader) {
                return false;
            }
        }
        if (lacing[i] < 255) {
            const bool whole = scan->open;
            scan->open = false;
            skipping = false;
            if (whole && !add_packet(scan)) {
                return false;
            }
        }
    }
    return true;
}

}  // namespace

void ogg_scan_start(ogg_scan *scan, ogg_index *index, io_file *file, wexa_tags *tags) {
    *scan = {};
    scan->index = index;
    scan->file = file;
    scan->tags = tags;
    scan->page_number = -1;
    scan->hole = -1;
    index->cut_packet = -1;
}

bool ogg_scan_page(ogg_scan *scan, ogg_page *page, int64_t body_at) {
    const int64_t number = ogg_page_pageno(page) & INT64_C(0xFFFFFFFF);
    const bool continued = ogg_page_continued(page) != 0;
    const bool missing = scan->page_number >= 0 && number != scan->page_number + 1;
    scan->page_number = number;
    frame_index *pages = &scan->index->pages;
    const int64_t body_first = frame_index_end(pages);
    const int32_t body_bytes = static_cast<int32_t>(page->body_len);
    if (body_bytes > 0 && !frame_index_add(pages, {body_at, -1, body_bytes, body_bytes})) {
        return false;
    }
    if ((missing || scan->open != continued) && !pass_hole(scan)) {
        return false;
    }
    if (ogg_page_granulepos(page) >= 0) {
        scan->page_end = frame_index_end(&scan->index->packets);
    }
    if (!take_segments(scan, page, body_first)) {
        return false;
    }
    use_granule(scan, ogg_page_granulepos(page), ogg_page_eos(page) != 0);
    return true;
}

bool ogg_scan_end(ogg_scan *scan) {
    frame_index *packets = &scan->index->packets;
    if (!scan->has_base) {
        return packets->count > 0;
    }
    // Never below what ended before the last page: a smaller position is damage.
    const int64_t end = std::max(scan->last_end, scan->page_end);
    for (int64_t i = packets->count - 1; i >= 0 && frame_index_end(packets) > end; --i) {
        frame_entry &entry = packets->entry[i];
        entry.samples =
            static_cast<int32_t>(std::clamp<int64_t>(end - entry.first, 0, entry.samples));
        packets->count = entry.samples == 0 ? i : packets->count;
    }
    return packets->count > 0;
}

void ogg_scan_free(ogg_scan *scan) {
    av_vorbis_parse_free(&scan->parser);
}
