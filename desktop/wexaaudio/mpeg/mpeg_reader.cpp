// Bare MPEG audio files: open, frame by frame, exact seeks.
//
// Positions of seeks and the duration count the PCM that the source delivers. Of a 44.1-kHz stereo
// stream it drops the start of the first frame, so a sample lies that much later in what is
// decoded. The times that come with the frames count what is decoded: 0 marks the first frame,
// whole.
#include <algorithm>
#include <cstdlib>

#include "desktop/wexaaudio/mpeg/mpeg_frames.h"
#include "desktop/wexaaudio/mpeg/mpeg_scan.h"
#include "desktop/wexaaudio/shared/tags.h"
#include "desktop/wexaaudio/shared/units.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kDropRate = 44100;       // Hz
constexpr int64_t kMaxTagBytes = 1 << 20;  // of an ID3v2 tag looked through

struct mpeg_reader {
    io_file file;
    mpeg_stream stream;
    wexa_tags *tags;
    int64_t dropped;  // sample frames that the source drops at the start
    int64_t next;     // frame read next
    int32_t skip;     // sample frames cut from its front
    bool fresh;       // a seek came before it
};

void read_tags(mpeg_reader *r) {
    const int64_t bytes = std::min(r->stream.tag_bytes, kMaxTagBytes);
    r->tags = r->stream.tag >= 0 ? tags_create() : nullptr;
    uint8_t *tag =
        r->tags != nullptr ? static_cast<uint8_t *>(malloc(static_cast<size_t>(bytes))) : nullptr;
    if (tag != nullptr) {
        const int64_t got = io_file_read(&r->file, r->stream.tag, tag, bytes);
        tags_from_id3v2(r->tags, tag, static_cast<size_t>(std::max<int64_t>(got, 0)));
        free(tag);
    }
}

// Sample frames that the source delivers in all.
int64_t delivered(const mpeg_reader *r) {
    return std::max<int64_t>(frame_index_end(&r->stream.index) - r->dropped, 0);
}

}  // namespace

int32_t xmp123_init(void) {
    return 0;
}

void xmp123_deinit(void) {}

void *xmp123fd_create(const mtsrc_io *io, int64_t * /*word*/, xmp123_info *info,
                      void * /*reserved*/) {
    mpeg_reader *r = static_cast<mpeg_reader *>(calloc(1, sizeof(mpeg_reader)));
    if (r == nullptr || info == nullptr || !io_file_open(&r->file, io) ||
        !mpeg_scan(&r->file, &r->stream)) {
        xmp123fd_delete(r);
        return nullptr;
    }
    const mpeg_header &head = r->stream.head;
    if (head.rate == kDropRate && head.channels == 2) {
        r->dropped = std::min<int64_t>(kWexaMpegDelay, head.samples);
    }
    read_tags(r);
    info->sample_rate = head.rate;
    info->channels = head.channels;
    info->duration = units_of_duration(delivered(r), head.rate);
    info->tags = r->tags;
    return r;
}

int32_t xmp123fd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                         int64_t *second) {
    mpeg_reader *r = static_cast<mpeg_reader *>(reader);
    if (r == nullptr || buf == nullptr || bytes == nullptr) {
        return -1;
    }
    if (r->next >= r->stream.index.count) {
        return 1;
    }
    const mpeg_header &head = r->stream.head;
    const int32_t got = mpeg_frames_read(&r->file, &r->stream.index, r->next, r->fresh, r->skip,
                                         head.channels, buf, size);
    if (got <= 0) {
        return got < 0 ? -1 : 1;
    }
    const frame_entry &entry = r->stream.index.entry[r->next];
    *bytes = got;
    if (first != nullptr) {
        *first = units_from_samples(entry.first + r->skip, head.rate);
    }
    if (second != nullptr) {
        *second = units_from_samples(entry.samples - r->skip, head.rate);
    }
    ++r->next;
    r->skip = 0;
    r->fresh = false;
    return 0;
}

int32_t xmp123fd_seek(void *reader, const int64_t *position, int64_t *reached) {
    mpeg_reader *r = static_cast<mpeg_reader *>(reader);
    if (r == nullptr || position == nullptr || reached == nullptr) {
        return -1;
    }
    const frame_index *index = &r->stream.index;
    const int32_t rate = r->stream.head.rate;
    const int64_t end = delivered(r);
    const int64_t sample = seek_target(*position, end, rate);
    // At the start the source drops; anywhere else, in the first frame too, the frame's time is not
    // 0, so that nothing is dropped twice.
    const int64_t decoded = sample > 0 ? sample + r->dropped : 0;
    r->next = sample < end ? frame_index_find(index, decoded) : index->count;
    r->skip = sample < end ? static_cast<int32_t>(decoded - index->entry[r->next].first) : 0;
    r->fresh = true;
    *reached = units_from_samples(sample, rate);
    return 0;
}

void xmp123fd_delete(void *reader) {
    mpeg_reader *r = static_cast<mpeg_reader *>(reader);
    if (r != nullptr) {
        frame_index_free(&r->stream.index);
        tags_delete(r->tags);
        io_file_close(&r->file);
        free(r);
    }
}
