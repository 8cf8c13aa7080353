// Reads bare MPEG audio files, Layers I to III. One scan of the headers skips tags and garbage.
//
// Input: mtsrc_io. Output: PCM and the information record. Precedes copy_decoder.cpp.
#include <algorithm>
#include <cstring>

#include "desktop/wexaaudio/mpeg/mpeg_header.h"
#include "desktop/wexaaudio/shared/id3v2.h"
#include "desktop/wexaaudio/shared/stream.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kDropRate = 44100;  // Hz

constexpr int32_t kId3v1Bytes = 128;
constexpr int32_t kApeFooter = 32;            // bytes; an APE header is as long
constexpr int32_t kLook = 4 * kMpegMaxFrame;  // bytes read to confirm a header
constexpr int32_t kFirstChain = 3;   // consecutive headers that mark the start of the stream
constexpr int32_t kResyncChain = 2;  // consecutive headers that continue it after garbage

struct mpeg_scan {
    io_file *file;
    int64_t end;       // end of the audio, before the tags at the end of the file
    int64_t at;        // current offset in the file
    mpeg_header head;  // header of the first frame, once started
    bool started;
};

// Returns the size of the tag that ends at `end`, or 0. Tags are searched for backwards, so the
// buffer is filled with the bytes before `end`.
int64_t tag_before(io_file *file, int64_t end) {
    const bool buffered = end - kId3v1Bytes >= file->block_at;
    int32_t got = 0;
    if (!buffered) io_file_peek(file, std::max<int64_t>(end - kIoBlock, 0), 1, &got);
    const uint8_t *p = io_file_bytes(file, end - kId3v1Bytes, kId3v1Bytes);
    if (p == nullptr) return 0;
    if (memcmp(p, "TAG", 3) == 0) return kId3v1Bytes;
    p += kId3v1Bytes - kApeFooter;
    if (memcmp(p, "APETAGEX", 8) != 0) return 0;
    const int64_t size =
        static_cast<int64_t>(p[12]) | p[13] << 8 | p[14] << 16 | static_cast<int64_t>(p[15]) << 24;
    const int64_t whole = size + ((p[23] & 0x80) != 0 ? kApeFooter : 0);
    return size >= kApeFooter && whole <= end ? whole : 0;
}

// Finds the end of the audio, before any ID3v1 and APE tags.
int64_t find_end(io_file *file) {
    int64_t end = file->size;
    for (int64_t tag = -1; tag != 0; end -= tag) tag = tag_before(file, end);
    return end;
}

// True if a chain of consecutive headers of one stream starts at `p`. A short chain counts if it
// ends exactly where the audio ends. `p` has `got` bytes; the audio ends `to_end` bytes after `p`.
bool starts_chain(const mpeg_scan *s, const uint8_t *p, int32_t got, int64_t to_end,
                  mpeg_header *first) {
    const mpeg_header *reference = s->started ? &s->head : nullptr;
    const int32_t links = s->started ? kResyncChain : kFirstChain;
    mpeg_header h = {};
    int64_t at = 0;
    for (int32_t i = 0; i < links; ++i) {
        if (at == to_end) return i > 0;
        if (at + kMpegHeaderBytes > std::min<int64_t>(got, to_end) || !mpeg_parse(p + at, &h) ||
            (reference != nullptr && !mpeg_same_stream(&h, reference))) {
            return false;
        }
        if (i == 0) *first = h;
        if (reference == nullptr) reference = first;
        at += h.bytes;
    }
    return true;
}

// Moves s->at to the next offset where the stream starts or continues, skipping complete ID3v2
// tags. Returns false at the end of the audio.
bool find_chain(mpeg_scan *s, mpeg_header *first) {
    while (s->at < s->end) {
        int32_t got = 0;
        const uint8_t *p = io_file_peek(s->file, s->at, kLook, &got);
        if (p == nullptr || got < kMpegHeaderBytes) return false;
        // Only the last block is searched to its end; other blocks may cut off a chain there.
        const int32_t sure = s->at + got >= s->end ? got : got - kLook + 1;
        int64_t tag = 0;
        int32_t i = 0;
        for (; i < sure && tag == 0; ++i) {
            if (p[i] == 'I' && got - i >= kId3v2Head) tag = id3v2_bytes(p + i);
            if (p[i] == 0xFF && starts_chain(s, p + i, got - i, s->end - s->at - i, first)) {
                s->at += i;
                return true;
            }
        }
        s->at += tag > 0 ? i - 1 + tag : i;
    }
    return false;
}

// Finds the first frame of audio. Skips an encoder's info frame at the start.
bool find_start(mpeg_scan *s) {
    if (!find_chain(s, &s->head)) return false;
    s->started = true;
    int32_t got = 0;
    const uint8_t *p = io_file_peek(s->file, s->at, kMpegMaxFrame, &got);
    if (p == nullptr || !mpeg_is_info_frame(&s->head, p, std::min(got, s->head.bytes))) {
        return p != nullptr;
    }
    s->at += s->head.bytes;
    return find_chain(s, &s->head);
}

// Adds all complete frames from s->at on. Returns false if there are none, if reading fails or if
// memory runs out.
bool walk(mpeg_scan *s, frame_index *frames) {
    mpeg_header h = {};
    while (s->end - s->at >= kMpegHeaderBytes) {
        const uint8_t *p = io_file_bytes(s->file, s->at, kMpegHeaderBytes);
        if (p == nullptr) break;
        const bool follows = mpeg_parse(p, &h) && mpeg_same_stream(&h, &s->head);
        if (!follows && !find_chain(s, &h)) break;
        if (h.bytes > s->end - s->at) break;
        if (!frame_index_add(frames, s->at, h.bytes, h.samples)) return false;
        s->at += h.bytes;
    }
    return !s->file->failed && frames->count > 0;
}

bool scan_file(io_file *file, stream_info *info) {
    mpeg_scan s = {file, find_end(file), 0, {}, false};
    if (!find_start(&s) || !walk(&s, &info->frames)) return false;
    mpeg_describe(&s.head, info);
    if (s.head.rate == kDropRate && s.head.channels == 2) {
        info->delay = std::min(kWexaMpegDelay, s.head.samples);
    }
    return true;
}

}  // namespace

void *xmp123fd_create(const mtsrc_io *io, int64_t * /*word*/, xmp123_info *info,
                      void * /*reserved*/) {
    stream_reader *r = stream_open(io, scan_file, &info->duration);
    if (r == nullptr) return nullptr;
    info->sample_rate = r->info->rate;
    info->channels = r->info->channels;
    return r;
}
