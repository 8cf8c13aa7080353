#include "desktop/wexaaudio/mpeg/mpeg_scan.h"

#include <algorithm>
#include <cstring>

namespace {

constexpr int32_t kId3v2Head = 10;  // bytes, also of the footer
constexpr int32_t kId3v1Bytes = 128;
constexpr int32_t kApeFooter = 32;            // bytes, also of the header
constexpr int32_t kLook = 4 * kMpegMaxFrame;  // bytes looked at to believe a header
constexpr int32_t kFirstChain = 3;            // headers in a row that start the stream
constexpr int32_t kResyncChain = 2;           // and that continue it after garbage
constexpr int64_t kMaxLost = 64;  // frames; a longer gap is no damage but something else

struct scan {
    io_file *file;
    mpeg_stream *stream;
    int64_t end;   // of the audio: where the tags at the file's end begin
    int64_t at;    // offset
    int64_t tags;  // bytes of the tags that the last search passed inside the stream
    bool started;  // stream->head is known
};

// Where the audio ends: before any ID3v1 and APE tags.
int64_t find_end(io_file *file) {
    int64_t end = file->size;
    for (int32_t i = 0; i < 4; ++i) {
        uint8_t p[kApeFooter];
        if (end >= kId3v1Bytes && io_file_read(file, end - kId3v1Bytes, p, 3) == 3 &&
            memcmp(p, "TAG", 3) == 0) {
            end -= kId3v1Bytes;
        }
        if (end < kApeFooter || io_file_read(file, end - kApeFooter, p, kApeFooter) != kApeFooter ||
            memcmp(p, "APETAGEX", 8) != 0) {
            break;
        }
        const int64_t size = static_cast<int64_t>(p[12]) | p[13] << 8 | p[14] << 16 |
                             static_cast<int64_t>(p[15]) << 24;
        const int64_t whole = size + ((p[23] & 0x80) != 0 ? kApeFooter : 0);
        if (size < kApeFooter || whole > end) {
            break;
        }
        end -= whole;
    }
    return end;
}

// Whether p (got bytes, at offset) starts a chain of headers of one stream, or one that ends
// exactly with the audio. like: the stream's header once it is known.
bool starts_chain(const uint8_t *p, int32_t got, int64_t to_end, const mpeg_header *like,
                  int32_t links, mpeg_header *first) {
    mpeg_header h = {};
    int64_t at = 0;
    for (int32_t i = 0; i < links; ++i) {
        if (at == to_end) {
            return i > 0;
        }
        if (at + kMpegHeaderBytes > std::min<int64_t>(got, to_end) || !mpeg_parse(p + at, &h) ||
            (like != nullptr && !mpeg_same_stream(&h, like))) {
            return false;
        }
        if (i == 0) {
            *first = h;
            like = like != nullptr ? like : first;
        }
        at += h.bytes;
    }
    return true;
}

// The next place at or after s->at where the stream starts or goes on. Skips ID3v2 tags whole.
// False at the end.
bool find_chain(scan *s, mpeg_header *first) {
    const mpeg_header *like = s->started ? &s->stream->head : nullptr;
    s->tags = 0;
    const int32_t links = s->started ? kResyncChain : kFirstChain;
    while (s->at < s->end) {
        int32_t got = 0;
        const uint8_t *p = io_file_peek(s->file, s->at, kLook, &got);
        if (p == nullptr || got < kMpegHeaderBytes) {
            return false;
        }
        // Only the last block of the file is looked at to its end.
        const int32_t sure = s->at + got >= s->end ? got : got - kLook + 1;
        int32_t i = 0;
        for (; i < sure; ++i) {
            if (got - i >= kId3v2Head && p[i] == 'I') {
                const int64_t tag = id3v2_bytes(p + i);
                if (tag > 0) {
                    s->at += i + tag;
                    s->tags += tag;
                    break;
                }
            }
            if (p[i] == 0xFF &&
                starts_chain(p + i, got - i, s->end - s->at - i, like, links, first)) {
                s->at += i;
                return true;
            }
        }
        s->at += i == sure ? sure : 0;
    }
    return false;
}

bool add(scan *s, int64_t offset, int32_t bytes) {
    return frame_index_add(&s->stream->index, {offset, -1, bytes, s->stream->head.samples});
}

// A gap as long as whole frames were, give or take their padding, is damage: the frames' time is
// kept. Anything else was never part of the stream.
bool add_lost(scan *s, int64_t gap_at, int64_t gap, int32_t frame_bytes) {
    const int64_t lost = (gap + frame_bytes / 2) / frame_bytes;
    const int64_t off = gap - lost * frame_bytes;
    if (lost < 1 || lost > kMaxLost || off > lost || off < -lost) {
        return true;
    }
    for (int64_t i = 0; i < lost; ++i) {
        if (!add(s, gap_at, 0)) {
            return false;
        }
    }
    return true;
}

bool find_start(scan *s) {
    mpeg_header first = {};
    if (!find_chain(s, &first)) {
        return false;
    }
    int32_t got = 0;
    const uint8_t *p = io_file_peek(s->file, s->at, kMpegMaxFrame, &got);
    s->stream->head = first;
    s->started = true;
    if (p != nullptr && mpeg_is_info_frame(&first, p, std::min(got, first.bytes))) {
        s->at += first.bytes;
        return find_chain(s, &s->stream->head);
    }
    return p != nullptr;
}

// Frame after frame from s->at to the end. False on a read error or when out of memory.
bool walk(scan *s) {
    int32_t last_bytes = s->stream->head.bytes;
    while (s->end - s->at >= kMpegHeaderBytes) {
        int32_t got = 0;
        const uint8_t *p = io_file_peek(s->file, s->at, kMpegHeaderBytes, &got);
        if (p == nullptr || got < kMpegHeaderBytes) {
            break;
        }
        mpeg_header h = {};
        if (!mpeg_parse(p, &h) || !mpeg_same_stream(&h, &s->stream->head)) {
            const int64_t gap_at = s->at;
            if (!find_chain(s, &h)) {
                break;
            }
            if (!add_lost(s, gap_at, s->at - gap_at - s->tags, last_bytes)) {
                return false;
            }
        }
        if (h.bytes > s->end - s->at) {
            break;  // cut by the end of the file: not there
        }
        if (!add(s, s->at, h.bytes)) {
            return false;
        }
        last_bytes = h.bytes;
        s->at += h.bytes;
    }
    return !s->file->failed;
}

}  // namespace

int64_t id3v2_bytes(const uint8_t *p) {
    if (memcmp(p, "ID3", 3) != 0 || p[3] < 2 || p[3] > 4 || p[4] == 0xFF) {
        return 0;
    }
    const int64_t size =
        (p[6] & 0x7F) << 21 | (p[7] & 0x7F) << 14 | (p[8] & 0x7F) << 7 | (p[9] & 0x7F);
    const bool footer = (p[5] & 0x10) != 0;
    return kId3v2Head + size + (footer ? kId3v2Head : 0);
}

bool mpeg_scan(io_file *file, mpeg_stream *stream) {
    *stream = {};
    stream->tag = -1;
    scan s = {file, stream, find_end(file), 0, 0, false};
    int32_t got = 0;
    const uint8_t *p = io_file_peek(file, 0, kId3v2Head, &got);
    if (p != nullptr && got >= kId3v2Head && id3v2_bytes(p) > 0) {
        stream->tag = 0;
        stream->tag_bytes = id3v2_bytes(p);
    }
    if (find_start(&s) && walk(&s) && stream->index.count > 0) {
        return true;
    }
    frame_index_free(&stream->index);
    return false;
}
