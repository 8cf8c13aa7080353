// Reads AAC in ADTS form, which may follow ID3v2 tags. Opening a file scans all frame headers.
//
// Input: mtsrc_io. Output: PCM and the information record. Precedes copy_decoder.cpp.
#include <cstring>

#include "desktop/wexaaudio/aac/aac_stream.h"
#include "desktop/wexaaudio/shared/id3v2.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kHeaderBytes = 7;
constexpr int32_t kCrcBytes = 2;
constexpr int32_t kMaxFrameBytes = 8191;  // the length field has 13 bits
constexpr uint32_t kProgramElement = 5;   // identifier of a program configuration element

struct adts_header {
    int32_t object_type;
    int32_t rate_index;
    int32_t channels;
    int32_t head;   // bytes before the raw block
    int32_t bytes;  // of the compressed frame
};

// Parses the header at `offset`. Returns false if it is invalid or announces several raw blocks.
bool header_at(io_file *file, int64_t offset, adts_header *h) {
    const uint8_t *p = io_file_bytes(file, offset, kHeaderBytes);
    if (p == nullptr || p[0] != 0xFF || (p[1] & 0xF6) != 0xF0) return false;
    h->object_type = (p[2] >> 6) + 1;
    h->rate_index = p[2] >> 2 & 15;
    h->channels = (p[2] & 1) << 2 | p[3] >> 6;
    h->head = kHeaderBytes + ((p[1] & 1) != 0 ? 0 : kCrcBytes);
    h->bytes = (p[3] & 3) << 11 | p[4] << 3 | p[5] >> 5;
    return h->bytes >= h->head && aac_rate_of_index(h->rate_index) > 0 && (p[6] & 3) == 0;
}

// True if both frames may belong to the same stream. The channel count may change within a stream,
// for example in a broadcast; the decoder adapts to it.
bool same_stream(const adts_header &a, const adts_header &b) {
    return a.object_type == b.object_type && a.rate_index == b.rate_index;
}

// Returns the offset of the next frame at or after `offset`, or -1. Another frame or the end of the
// file must follow it immediately. `reference` is a frame of the wanted stream, or null for any
// stream.
int64_t find_frame(io_file *file, int64_t offset, const adts_header *reference, adts_header *h) {
    for (;; ++offset) {
        int32_t got = 0;
        const uint8_t *p = io_file_peek(file, offset, kMaxFrameBytes + kHeaderBytes, &got);
        if (p == nullptr) return -1;
        const void *sync = memchr(p, 0xFF, static_cast<size_t>(got));
        if (sync == nullptr) {
            offset += got - 1;
            continue;
        }
        offset += static_cast<const uint8_t *>(sync) - p;
        adts_header after = {};
        if (header_at(file, offset, h) && (reference == nullptr || same_stream(*h, *reference)) &&
            (offset + h->bytes == file->size ||
             (header_at(file, offset + h->bytes, &after) && same_stream(*h, after)))) {
            return offset;
        }
    }
}

// Adds every complete frame to the index and stores the header of the first one in *first.
bool scan_frames(io_file *file, int64_t offset, frame_index *frames, adts_header *first) {
    offset = find_frame(file, offset, nullptr, first);
    adts_header h = *first;
    while (offset >= 0 && offset + h.bytes <= file->size) {
        if (!frame_index_add(frames, offset + h.head, h.bytes - h.head, 0)) return false;
        const int64_t end = offset + h.bytes;
        adts_header next = {};
        if (header_at(file, end, &next) && same_stream(next, *first)) {
            offset = end;
        } else {
            // The file ends or is damaged. If the length is wrong, the next header may be inside
            // this frame.
            offset = find_frame(file, offset + h.head, first, &next);
            frame_entry &last = frames->entry[frames->count - 1];
            if (offset >= 0 && offset < end) {
                last.bytes = static_cast<int32_t>(offset - last.offset);
            }
        }
        h = next;
    }
    return frames->count > 0 && !file->failed;
}

// Builds the configuration from the first frame's header and, if the header does not specify the
// channels, from the frame's raw block.
bool make_config(io_file *file, const adts_header &first, const frame_entry &entry,
                 aac_config *config) {
    aac_config_make(config, first.object_type, first.rate_index, first.channels);
    if (first.channels != 0) return true;
    const uint8_t *p = io_file_bytes(file, entry.offset, entry.bytes);
    return p != nullptr && entry.bytes > 0 && p[0] >> 5 == kProgramElement &&
           aac_config_add_program(config, p, entry.bytes);
}

bool scan_file(io_file *file, stream_info *info) {
    int64_t start = 0;
    for (int64_t tag = 1; tag > 0; start += tag) {
        tag = id3v2_bytes(io_file_bytes(file, start, kId3v2Head));
    }
    aac_config config = {};
    adts_header first = {};
    return scan_frames(file, start, &info->frames, &first) &&
           make_config(file, first, info->frames.entry[0], &config) &&
           aac_stream_complete(file, &config, info);
}

}  // namespace

void *xaacfd_create(const mtsrc_io *io, int64_t * /*word*/, xaac_info *info, void * /*reserved*/) {
    stream_reader *r = stream_open(io, scan_file, &info->duration);
    if (r == nullptr) return nullptr;
    info->sample_rate = r->info->rate;
    info->channels = r->info->channels;
    return r;
}
