// Reads the first audio stream in an Ogg file's first group of streams; it must be Vorbis. A
// demuxer has only this stream, so the stream handle is the demuxer itself.
//
// Input: mtsrc_io. Output: PCM, the set-up data and the information records.
//
// A stream's pages are scattered over the file, and a packet may span several pages. A packet is
// therefore identified by its logical offset: the number of bytes before it in the page bodies.
#include <ogg/ogg.h>

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "desktop/wexaaudio/shared/stream.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kReadBytes = 65536;
constexpr int32_t kVorbis = 323;  // codec code

// The bytes with which each audio codec's first packet starts. Vorbis must be the first entry.
constexpr std::string_view kAudio[] = {"\x01vorbis", "OpusHead", "\177FLAC", "fLaC", "Speex   "};

constexpr int32_t kVorbisHeaders = 3;           // packets: identification, comments, set-up
constexpr int32_t kNameBytes = 7;               // packet type and "vorbis"
constexpr int32_t kIdBytes = 30;                // of the identification packet
constexpr int32_t kChannelsAt = 11;             // offset in the identification packet
constexpr int32_t kRateAt = 12;                 // offset in that packet; 32 bits, little-endian
constexpr int32_t kMaxCodebooks = 1 << 20;      // bytes; real ones have 3 to 10 thousand
constexpr int64_t kMaxGranule = INT64_MAX / 2;  // larger ones are clamped, so sums cannot overflow
constexpr int32_t kMaxPacket32 = 1 << 26;       // bytes; comments may contain pictures

// An empty comment packet. It replaces the file's own, which may contain a picture and which no
// decoder needs.
constexpr uint8_t kNoComments[] = {3, 'v', 'o', 'r', 'b', 'i', 's', 0, 0, 0, 0, 0, 0, 0, 0, 1};
constexpr int32_t kPackHead = 3;  // bytes: the mark and two packet lengths, each below 255

struct ogg_scan {
    io_file *file;
    const codec_library *library;
    stream_info *info;
    ogg_sync_state sync;    // finds pages
    int64_t read_at;        // file offset of the next byte to read
    int64_t parse_at;       // file offset of the next byte to parse
    vorbis_parser *parser;  // owned; null until the headers are complete
    int64_t header_at[kVorbisHeaders];
    int32_t header_bytes[kVorbisHeaders];
    int32_t headers;       // header packets found so far
    long next_page;        // expected number of the next page
    bool gap;              // pages are missing after the last granule position
    bool open;             // a packet has begun and not ended
    int64_t packet_at;     // logical offset of the open packet
    int32_t packet_bytes;  // size of the open packet so far
    uint8_t packet_first;  // first byte of the open packet
    bool has_base;
    int64_t base;      // granule position of sample 0; valid if has_base
    int64_t page_end;  // end of the audio before the last page with a granule position
    int64_t last_end;  // end of the audio at the last granule position, sample frames
};

// Copies the first `bytes` (at least kNameBytes) of a header. Returns false if it is not Vorbis.
bool read_header(const ogg_scan *scan, int32_t number, uint8_t *packet, int32_t bytes) {
    return stream_copy(scan->file, scan->info, scan->header_at[number], packet, bytes) == bytes &&
           packet[0] == 2 * number + 1 && memcmp(packet + 1, "vorbis", kNameBytes - 1) == 0;
}

// Packs the headers, with empty comments, into `p` and reads the rate and the channels from them.
// Returns false if they are not Vorbis headers.
bool pack(const ogg_scan *scan, uint8_t *p) {
    p[0] = kVorbisSetupMark;
    p[1] = kIdBytes;
    p[2] = sizeof kNoComments;
    uint8_t *id = p + kPackHead;
    uint8_t *comments = id + kIdBytes;
    memcpy(comments, kNoComments, sizeof kNoComments);
    if (!read_header(scan, 0, id, kIdBytes) ||
        !read_header(scan, 2, comments + sizeof kNoComments, scan->header_bytes[2])) {
        return false;
    }
    uint32_t rate = 0;
    for (int32_t i = 3; i >= 0; --i) rate = rate << 8 | id[kRateAt + i];
    scan->info->channels = id[kChannelsAt];
    scan->info->rate = rate <= INT32_MAX ? static_cast<int32_t>(rate) : 0;
    return scan->info->rate > 0 && scan->info->channels > 0;
}

// Creates the set-up data and the parser once the three header packets are complete.
bool read_headers(ogg_scan *scan) {
    const int32_t books = scan->header_bytes[2];
    uint8_t name[kNameBytes];
    if (scan->header_bytes[0] != kIdBytes || books > kMaxCodebooks ||
        !read_header(scan, 1, name, kNameBytes)) {
        return false;
    }
    stream_info *info = scan->info;
    info->setup_bytes = kPackHead + kIdBytes + static_cast<int32_t>(sizeof kNoComments) + books;
    info->setup = static_cast<uint8_t *>(malloc(static_cast<size_t>(info->setup_bytes)));
    if (info->setup == nullptr || !pack(scan, info->setup)) return false;
    scan->parser = scan->library->parser_open(info->setup, info->setup_bytes);
    return scan->parser != nullptr;
}

// Adds a complete packet, either a header or audio.
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
    if (samples <= 0) return true;  // not an audio packet, so it is skipped
    // The first packet has no output; it only prepares the decoder for the next.
    frame_index *packets = &scan->info->frames;
    return frame_index_add(packets, scan->packet_at, scan->packet_bytes,
                           packets->count > 0 ? samples : 0);
}

// Applies the first granule position, which determines where the stream starts. Surplus audio is
// cut off at the start; if the stream ends on this page, cut_end cuts it off at the end instead.
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

// Splits a page, whose body starts at the logical offset body_first, into packets.
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

// Adds the next page of the stream. Its body is at body_at in the file. Returns false if memory
// runs out or the stream is not Vorbis.
bool add_page(ogg_scan *scan, ogg_page *page, int64_t body_at) {
    frame_index *pages = &scan->info->pages;
    const frame_index *packets = &scan->info->frames;
    const int64_t body_first = frame_index_end(pages);
    const auto body_bytes = static_cast<int32_t>(page->body_len);
    if (body_bytes > 0 && !frame_index_add(pages, body_at, body_bytes, body_bytes)) return false;
    // An open packet is lost unless the next page follows immediately and is marked as its
    // continuation.
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
        scan->base = granule - frame_index_end(packets);  // lost audio is not replaced by silence
    }
    scan->gap = false;
    scan->last_end = granule - scan->base;
    return true;
}

// Cuts off the audio after the final granule position. Returns false if no audio is left.
bool cut_end(ogg_scan *scan) {
    frame_index *packets = &scan->info->frames;
    if (!scan->has_base) return packets->count > 0;
    // A final granule position before the last page's audio indicates damage and is ignored.
    const int64_t end = std::max(scan->last_end, scan->page_end);
    for (int64_t i = packets->count - 1; i >= 0 && frame_index_end(packets) > end; --i) {
        frame_entry &entry = packets->entry[i];
        entry.samples =
            static_cast<int32_t>(std::clamp<int64_t>(end - entry.first, 0, entry.samples));
        packets->count = entry.samples == 0 ? i : packets->count;
    }
    return packets->count > 0;
}

// Reads the next complete page with a correct checksum and stores its file offset. Returns false at
// the end of the file and on failure.
bool next_page(ogg_scan *scan, ogg_page *page, int64_t *offset) {
    io_file *file = scan->file;
    for (;;) {
        const long step = ogg_sync_pageseek(&scan->sync, page);
        *offset = scan->parse_at;
        scan->parse_at += std::abs(step);
        if (step > 0) return true;
        if (step < 0) continue;
        char *buf = ogg_sync_buffer(&scan->sync, kReadBytes);
        const int64_t got =
            buf != nullptr ? io_file_read(file, scan->read_at, buf, kReadBytes) : -1;
        file->failed = file->failed || got < 0;
        if (got <= 0) return false;
        scan->read_at += got;
        ogg_sync_wrote(&scan->sync, static_cast<long>(got));
    }
}

// Adds a stream, given its first page. The first audio stream is selected for reading.
void add_stream(stream_info *info, const ogg_page *page) {
    if (info->track_count >= kOggStreams) return;
    const int32_t i = info->track_count++;
    const std::string_view body(reinterpret_cast<const char *>(page->body),
                                static_cast<size_t>(page->body_len));
    for (const std::string_view &audio : kAudio) {
        if (body.substr(0, audio.size()) != audio) continue;
        info->kind[i] = kWexaKindAudio;
        if (info->track >= 0) return;
        info->track = i;
        info->codec = &audio == kAudio ? "vorbis" : nullptr;
    }
}

// Reads the pages of the first group of streams and ignores any other group. Returns false if the
// audio stream turns out not to be Vorbis.
bool read_pages(ogg_scan *scan) {
    stream_info *info = scan->info;
    ogg_page page;
    int64_t offset = 0;
    int serial = 0;
    bool in_heads = true;
    while (next_page(scan, &page, &offset)) {
        const bool head = ogg_page_bos(&page) != 0;
        if (head && !in_heads) return true;
        in_heads = head;
        const bool was_known = info->track >= 0;
        if (head) add_stream(info, &page);
        if (!was_known) serial = ogg_page_serialno(&page);
        if (!in_heads && info->codec == nullptr) return true;  // no supported audio stream
        if (info->codec != nullptr && serial == ogg_page_serialno(&page) &&
            !add_page(scan, &page, offset + page.header_len)) {
            return false;
        }
    }
    return true;
}

bool scan_file(io_file *file, stream_info *info) {
    ogg_scan scan = {};
    ogg_sync_init(&scan.sync);
    scan.file = file;
    scan.library = codec_library_get();
    scan.info = info;
    info->track = -1;
    info->out_channels = 1;
    info->preroll = 1;  // each packet overlaps the one before it
    const bool is_vorbis = read_pages(&scan) && info->codec != nullptr && cut_end(&scan);
    if (!is_vorbis) info->codec = nullptr;
    scan.library->parser_close(scan.parser);
    ogg_sync_clear(&scan.sync);
    return !file->failed && info->track_count > 0;
}

}  // namespace

void *xoggd_create(const mtsrc_io *io, int64_t * /*word*/, xogg_info *info, void * /*reserved*/) {
    stream_reader *r = stream_open(io, scan_file, &info->duration);
    if (r == nullptr) return nullptr;
    info->stream_count = r->info->track_count;
    memcpy(info->kind, r->info->kind, sizeof info->kind);
    return r;
}

void xoggds_close(void * /*stream*/) {}

int32_t xoggds_get_info_aud(void *stream, xogg_stream *info) {
    const auto *r = static_cast<stream_reader *>(stream);
    info->codec = r->info->codec != nullptr ? kVorbis : 0;
    info->sample_rate = r->info->rate;
    return 0;
}

int32_t xoggds_get_format(void *stream, void *buf, int32_t *length) {
    const stream_info *info = static_cast<stream_reader *>(stream)->info;
    if (info->codec == nullptr) return -1;
    *length = info->setup_bytes;
    if (buf != nullptr) memcpy(buf, info->setup, static_cast<size_t>(info->setup_bytes));
    return 0;
}
