// AAC in ADTS or ADIF form behind an optional ID3v2 tag.
//
// In: mtsrc_io. Out: bundles for aac_decoder.cpp, the information record. One scan of the frame
// headers at open finds every frame.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/aac/aac_stream.h"
#include "desktop/wexaaudio/aac/adif_scan.h"
#include "desktop/wexaaudio/mpeg/mpeg_scan.h"
#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/tags.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kHeaderBytes = 7;
constexpr int32_t kCrcBytes = 2;
constexpr int32_t kMaxFrameBytes = 8191;  // 13 bits
constexpr int32_t kId3Header = 10;
constexpr int64_t kMaxTag = 1 << 24;     // bytes of an ID3v2 tag that is read for its text
constexpr uint32_t kProgramElement = 5;  // identifier of a program configuration in a raw block

struct adts_header {
    int32_t object_type;
    int32_t rate_index;
    int32_t channels;
    int32_t head;   // bytes before the raw block
    int32_t bytes;  // of the frame
};

struct aac_reader {
    io_file file;
    aac_stream stream;
    wexa_tags *tags;  // owned
};

// False when the bytes are no header, or one of several raw blocks, which have no lengths.
bool parse_header(const uint8_t *p, adts_header *h) {
    if (p[0] != 0xFF || (p[1] & 0xF6) != 0xF0) {
        return false;
    }
    h->object_type = (p[2] >> 6) + 1;
    h->rate_index = p[2] >> 2 & 15;
    h->channels = (p[2] & 1) << 2 | p[3] >> 6;
    h->head = kHeaderBytes + ((p[1] & 1) != 0 ? 0 : kCrcBytes);
    h->bytes = (p[3] & 3) << 11 | p[4] << 3 | p[5] >> 5;
    return h->bytes >= h->head && aac_rate_of_index(h->rate_index) > 0 && (p[6] & 3) == 0;
}

bool header_at(io_file *f, int64_t offset, adts_header *h) {
    int32_t got = 0;
    const uint8_t *p = io_file_peek(f, offset, kHeaderBytes, &got);
    return p != nullptr && got >= kHeaderBytes && parse_header(p, h);
}

// Channels may change within a stream (a broadcast's do); the decoder follows.
bool same_stream(const adts_header &a, const adts_header &b) {
    return a.object_type == b.object_type && a.rate_index == b.rate_index;
}

// The next frame of the stream at or after offset, vouched for by a second one or the end of the
// file right behind it. With like null any stream will do. Returns its offset, -1 when none.
int64_t find_frame(io_file *f, int64_t offset, const adts_header *like, adts_header *h) {
    for (;; ++offset) {
        int32_t got = 0;  // the frame and the header behind it are in the buffer, whatever it says
        const uint8_t *p = io_file_peek(f, offset, kMaxFrameBytes + kHeaderBytes, &got);
        if (p == nullptr) {
            return -1;
        }
        const void *sync = memchr(p, 0xFF, static_cast<size_t>(got));
        if (sync == nullptr) {
            offset += got - 1;
            continue;
        }
        offset += static_cast<const uint8_t *>(sync) - p;
        adts_header after = {};
        if (header_at(f, offset, h) && (like == nullptr || same_stream(*h, *like)) &&
            (offset + h->bytes == f->size ||
             (header_at(f, offset + h->bytes, &after) && same_stream(*h, after)))) {
            return offset;
        }
    }
}

// Finds every whole frame. *first receives the first one's header.
bool scan_frames(io_file *f, int64_t offset, frame_index *index, adts_header *first) {
    adts_header h = {};
    offset = find_frame(f, offset, nullptr, first);
    for (h = *first; offset >= 0 && offset + h.bytes <= f->size;) {
        if (!frame_index_add(index, {offset + h.head, -1, h.bytes - h.head, 0})) {
            return false;
        }
        const int64_t end = offset + h.bytes;
        adts_header next = {};
        if (header_at(f, end, &next) && same_stream(next, *first)) {
            offset = end;
        } else {
            // Damage: the header sought may also lie within a frame whose stated length is wrong.
            offset = find_frame(f, offset + h.head, first, &next);
            frame_entry &last = index->entry[index->count - 1];
            if (offset >= 0 && offset < end) {
                last.bytes = static_cast<int32_t>(offset - last.offset);
            }
        }
        h = next;
    }
    return index->count > 0 && !f->failed;
}

// The configuration from the first frame's header, and from its raw block when the channels are
// given there.
bool make_config(aac_stream *s, const adts_header &first) {
    if (first.channels != 0) {
        aac_config_make(&s->config, first.object_type, first.rate_index, first.channels);
        return true;
    }
    const frame_entry entry = s->index.entry[0];
    int32_t got = 0;
    const uint8_t *p = io_file_peek(s->file, entry.offset, entry.bytes, &got);
    return p != nullptr && got >= entry.bytes && entry.bytes > 0 && p[0] >> 5 == kProgramElement &&
           aac_config_from_program(&s->config, p, entry.bytes, 3, first.object_type,
                                   first.rate_index) >= 0;
}

// Reads the tags at the front of the file. Returns the offset behind them, -1 when out of memory.
int64_t read_tags(aac_reader *r) {
    int64_t offset = 0;
    for (;;) {
        int32_t got = 0;
        const uint8_t *p = io_file_peek(&r->file, offset, kId3Header, &got);
        const int64_t bytes = p != nullptr && got >= kId3Header ? id3v2_bytes(p) : 0;
        if (bytes <= 0) {
            return offset;
        }
        uint8_t *tag =
            bytes <= kMaxTag ? static_cast<uint8_t *>(malloc(static_cast<size_t>(bytes))) : nullptr;
        if (tag != nullptr) {
            const int64_t read = io_file_read(&r->file, offset, tag, bytes);
            if (read > 0) {
                tags_from_id3v2(r->tags, tag, static_cast<size_t>(read));
            }
        }
        free(tag);
        offset += bytes;
    }
}

bool open_stream(aac_reader *r) {
    aac_stream *s = &r->stream;
    s->file = &r->file;
    const int64_t offset = read_tags(r);
    char start[4] = {};
    if (io_file_read(&r->file, offset, start, sizeof start) != sizeof start) {
        return false;
    }
    if (memcmp(start, "ADIF", sizeof start) == 0) {
        return adif_scan(s, offset) && aac_stream_learn(s);
    }
    adts_header first = {};
    return scan_frames(&r->file, offset, &s->index, &first) && make_config(s, first) &&
           aac_stream_learn(s);
}

}  // namespace

void *xaacfd_create(const mtsrc_io *io, int64_t * /*word*/, xaac_info *info, void * /*reserved*/) {
    av_prepare();
    aac_reader *r = static_cast<aac_reader *>(calloc(1, sizeof(aac_reader)));
    if (r == nullptr || info == nullptr) {
        free(r);
        return nullptr;
    }
    r->tags = tags_create();
    if (r->tags == nullptr || !io_file_open(&r->file, io) || !open_stream(r)) {
        xaacfd_delete(r);
        return nullptr;
    }
    info->sample_rate = r->stream.sample_rate;
    info->channels = r->stream.channels;
    info->duration = aac_stream_duration(&r->stream);
    info->tags = r->tags;
    return r;
}

int32_t xaacfd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                       int64_t *second) {
    aac_reader *r = static_cast<aac_reader *>(reader);
    if (r == nullptr || buf == nullptr || bytes == nullptr || first == nullptr ||
        second == nullptr) {
        return -1;
    }
    return aac_stream_read(&r->stream, buf, size, bytes, first, second);
}

int32_t xaacfd_seek(void *reader, const int64_t *position, int64_t *reached) {
    aac_reader *r = static_cast<aac_reader *>(reader);
    if (r == nullptr || position == nullptr || reached == nullptr) {
        return -1;
    }
    return aac_stream_seek(&r->stream, *position, reached);
}

void xaacfd_delete(void *reader) {
    aac_reader *r = static_cast<aac_reader *>(reader);
    if (r != nullptr) {
        aac_stream_free(&r->stream);
        io_file_close(&r->file);
        tags_delete(r->tags);
        free(r);
    }
}
