#include "desktop/wexaaudio/flac/flac_scan.h"

#include <algorithm>
#include <cstring>

#include "desktop/wexaaudio/mpeg/mpeg_scan.h"

namespace {

constexpr int32_t kId3v2Head = 10;  // bytes
constexpr int32_t kBlockHead = 4;   // bytes of a metadata block's header
constexpr int32_t kBlockInfo = 0;   // metadata block types
constexpr int32_t kBlockComment = 4;
constexpr int32_t kMaxBlocks = 4096;  // metadata blocks of one file
constexpr int32_t kId3v1Bytes = 128;  // a tag that some programs append

// Bytes that may be looked at more than once, so that a file made of false headers ends the scan
// instead of holding it up.
constexpr int64_t kWorkBase = 64 << 20;
constexpr int64_t kWorkPerByte = 16;

struct scan {
    io_file *file;
    flac_stream *stream;
    int64_t end;   // of the audio, offset
    int64_t work;  // bytes of kWork* left
    bool known;    // stream->first is set
};

struct place {
    int64_t at;  // offset
    flac_header head;
};

enum follow {
    kFollows,  // *next is where the frame ends
    kLast,     // nothing follows up to the end of the audio
    kNothing,  // no header that belongs, within the longest frame
    kDamage,   // *next starts a run of its own behind damage
};

bool same_stream(const scan *s, const flac_header &h) {
    const flac_header &like = s->stream->first;
    return !s->known ? h.bits == s->stream->info.bits
                     : h.rate == like.rate && h.channels == like.channels && h.bits == like.bits &&
                           h.variable == like.variable;
}

bool continues(const flac_header &before, const flac_header &h) {
    return h.number == before.number + (before.variable ? before.block : 1);
}

int32_t longest(const flac_header &h) {
    return flac_max_bytes(h.block, h.channels, h.bits);
}

// The first header of the stream in p[from, to); -1 without one.
int32_t find_header(const scan *s, const uint8_t *p, int32_t from, int32_t to, int32_t got,
                    flac_header *h) {
    while (from < to) {
        const void *hit = memchr(p + from, 0xFF, static_cast<size_t>(to - from));
        if (hit == nullptr) {
            return -1;
        }
        from = static_cast<int32_t>(static_cast<const uint8_t *>(hit) - p);
        if (flac_parse(p + from, got - from, &s->stream->info, h) && same_stream(s, *h)) {
            return from;
        }
        ++from;
    }
    return -1;
}

// Bytes of the audio that can be seen at offset, and how far a frame that starts there may reach.
const uint8_t *look(scan *s, const place &frame, int32_t *got, int32_t *reach) {
    const int32_t most = longest(frame.head);
    const uint8_t *p = io_file_peek(s->file, frame.at, most + kFlacMaxHeader, got);
    *got = static_cast<int32_t>(std::min<int64_t>(*got, s->end - frame.at));
    *reach = std::min(*got, most + 1);
    return *got > 0 ? p : nullptr;
}

// Whether a run starts here: a header that continues it follows, or its check sum holds up to the
// end of the audio.
bool starts_run(scan *s, const place &frame) {
    int32_t got = 0;
    int32_t reach = 0;
    const uint8_t *p = look(s, frame, &got, &reach);
    flac_header h = {};
    int32_t i = frame.head.bytes;
    while (p != nullptr && (i = find_header(s, p, i, reach, got, &h)) >= 0) {
        if (continues(frame.head, h)) {
            s->work -= i;
            return true;
        }
        ++i;
    }
    s->work -= 2 * static_cast<int64_t>(reach);
    return p != nullptr && frame.at + got == s->end && reach == got && flac_crc16(0, p, got) == 0;
}

// Where the frame ends, or how the stream goes on if that cannot be told.
follow find_next(scan *s, const place &frame, place *next) {
    int32_t got = 0;
    int32_t reach = 0;
    const uint8_t *p = look(s, frame, &got, &reach);
    if (p == nullptr) {
        return kLast;
    }
    const bool to_end = reach == got && frame.at + got == s->end;
    int64_t stray = -1;  // offset of the first header out of order
    int32_t summed = 0;
    uint16_t sum = 0;
    int32_t i = frame.head.bytes;
    while ((i = find_header(s, p, i, reach, got, &next->head)) >= 0) {
        next->at = frame.at + i;
        if (continues(frame.head, next->head)) {
            return kFollows;
        }
        s->work -= i - summed;
        sum = flac_crc16(sum, p + summed, i - summed);
        summed = i;
        if (sum == 0) {
            return kFollows;
        }
        stray = stray < 0 ? next->at : stray;
        ++i;
    }
    if (stray < 0) {
        return to_end ? kLast : kNothing;
    }
    s->work -= reach;
    next->at = stray;
    return kDamage;
}

// The next run that starts at or after offset. False at the end of the audio.
bool find_run(scan *s, int64_t offset, place *next) {
    while (s->work > 0 && s->end - offset >= kFlacMinFrame) {
        int32_t got = 0;
        const uint8_t *p = io_file_peek(s->file, offset, kFlacMaxHeader, &got);
        if (p == nullptr) {
            return false;
        }
        got = static_cast<int32_t>(std::min<int64_t>(got, s->end - offset));
        const bool to_end = offset + got == s->end;
        const int32_t sure = to_end ? got : got - kFlacMaxHeader + 1;
        const int32_t i = find_header(s, p, 0, sure, got, &next->head);
        if (i < 0) {
            offset += sure;
            continue;
        }
        next->at = offset + i;
        if (starts_run(s, *next)) {
            return true;
        }
        offset = next->at + 1;
    }
    return false;
}

bool add(scan *s, int64_t offset, int64_t bytes, int32_t samples) {
    const flac_header &first = s->stream->first;
    const int64_t most = flac_max_bytes(samples, first.channels, first.bits) + kFlacMaxHeader;
    const int32_t held = static_cast<int32_t>(std::min(bytes, most));
    return frame_index_add(&s->stream->index, {offset, -1, held, samples});
}

// Sample frames from the end of one frame to the start of another, by their numbers; 0 where the
// numbers tell nothing or more than the bytes between them can have held.
int64_t lost_between(const scan *s, const place &before, const place &after) {
    const int64_t block = before.head.variable ? 1 : s->stream->first.block;
    const int64_t numbers = after.head.number - before.head.number;
    if (numbers <= 0 || numbers > (int64_t{1} << 36)) {
        return 0;
    }
    const int64_t lost = numbers * block - before.head.block;
    const int64_t most = (after.at - before.at) / kFlacMinFrame * s->stream->info.max_block;
    return lost > 0 && lost <= most ? lost : 0;
}

bool add_lost(scan *s, const place &before, const place &after) {
    for (int64_t lost = lost_between(s, before, after); lost > 0;) {
        const int32_t piece =
            static_cast<int32_t>(std::min<int64_t>(lost, s->stream->info.max_block));
        if (!add(s, after.at, 0, piece)) {
            return false;
        }
        lost -= piece;
    }
    return true;
}

// Whether the last frame's check sum holds to the end of the audio.
bool last_is_whole(scan *s, const place &frame) {
    int32_t got = 0;
    int32_t reach = 0;
    const uint8_t *p = look(s, frame, &got, &reach);
    return p != nullptr && reach == got && flac_crc16(0, p, got) == 0;
}

// Frame after frame. False on a read error or when out of memory.
bool walk(scan *s, place frame) {
    bool more = true;
    while (more) {
        place next = {};
        follow how = find_next(s, frame, &next);
        if (how == kDamage || how == kNothing) {
            const int64_t from = how == kDamage ? next.at : frame.at + frame.head.bytes;
            how = find_run(s, from, &next) ? kDamage : kLast;
            if (how == kLast) {
                next.at = s->end;
            }
        } else if (how == kLast) {
            next.at = s->end;
        }
        more = how != kLast;
        s->stream->last_unsure = !more && !last_is_whole(s, frame);
        if (!add(s, frame.at, next.at - frame.at, frame.head.block) ||
            (how == kDamage && !add_lost(s, frame, next))) {
            return false;
        }
        frame = next;
    }
    return !s->file->failed;
}

// Reads the metadata blocks. Returns the offset of the first frame, -1 when there is no stream.
int64_t read_blocks(io_file *f, flac_stream *stream) {
    int64_t at = 0;
    int32_t got = 0;
    const uint8_t *p = io_file_peek(f, 0, kId3v2Head, &got);
    while (p != nullptr && got >= kId3v2Head && id3v2_bytes(p) > 0) {
        at += id3v2_bytes(p);
        p = io_file_peek(f, at, kId3v2Head, &got);
    }
    if (p == nullptr || got < 4 || memcmp(p, "fLaC", 4) != 0) {
        return -1;
    }
    at += 4;
    bool last = false;
    bool informed = false;
    for (int32_t i = 0; i < kMaxBlocks && !last; ++i) {
        p = io_file_peek(f, at, kBlockHead + kFlacInfoBytes, &got);
        if (p == nullptr || got < kBlockHead) {
            return -1;
        }
        const int64_t bytes = p[1] << 16 | p[2] << 8 | p[3];
        const int32_t type = p[0] & 0x7F;
        last = (p[0] & 0x80) != 0;
        at += kBlockHead;
        if (type == kBlockInfo && !informed && got >= kBlockHead + kFlacInfoBytes) {
            memcpy(stream->raw_info, p + kBlockHead, kFlacInfoBytes);
            informed = flac_parse_info(stream->raw_info, &stream->info);
        } else if (type == kBlockComment) {
            stream->comment = at;
            stream->comment_bytes = bytes;
        }
        at += bytes;
    }
    return informed ? at : -1;
}

// A tag of the older kind behind the audio is no part of the last frame.
int64_t find_end(io_file *f) {
    uint8_t p[3];
    const int64_t at = f->size - kId3v1Bytes;
    const bool tag =
        at > 0 && io_file_read(f, at, p, sizeof p) == sizeof p && memcmp(p, "TAG", 3) == 0;
    return tag ? at : f->size;
}

}  // namespace

bool flac_scan(io_file *file, flac_stream *stream) {
    *stream = {};
    stream->comment = -1;
    const int64_t at = read_blocks(file, stream);
    const flac_info &info = stream->info;
    const int32_t most = flac_max_bytes(info.max_block, info.channels, info.bits);
    if (at < 0 || !io_file_widen(file, most + kFlacMaxHeader)) {
        return false;
    }
    scan s = {file, stream, find_end(file), kWorkBase + kWorkPerByte * file->size, false};
    place first = {};
    if (!find_run(&s, at, &first) || first.head.rate <= 0) {
        return false;
    }
    stream->first = first.head;
    s.known = true;
    if (walk(&s, first)) {
        return true;
    }
    frame_index_free(&stream->index);
    return false;
}
