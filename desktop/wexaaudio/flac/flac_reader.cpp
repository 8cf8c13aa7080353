// FLAC files: open, frame by frame, exact seeks.
//
// A frame that is too large for the source's buffer is decoded here and handed out as finished PCM,
// piece by piece.
#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/flac/flac_scan.h"
#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/bundle.h"
#include "desktop/wexaaudio/shared/tags.h"
#include "desktop/wexaaudio/shared/units.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kChannels = 2;                               // of all PCM of this format
constexpr int32_t kSampleFrame = kChannels * sizeof(int16_t);  // bytes
constexpr int64_t kMaxCommentBytes = 1 << 20;

struct flac_reader {
    uint8_t reserved[kFlacReaderFlag];
    uint8_t flag;  // set by the source before every read; nothing depends on it
    io_file file;
    flac_stream stream;
    wexa_tags *tags;
    int64_t next;       // frame read next
    int32_t skip;       // sample frames cut from its front
    av_decoder av;      // for frames decoded here; opened when one is met
    uint8_t *big;       // a compressed frame decoded here, owned
    uint8_t *pcm;       // [pcm_total][2] its PCM, owned; null when none is being handed out
    int32_t pcm_total;  // sample frames
    int32_t pcm_done;   // sample frames handed out
};
static_assert(offsetof(flac_reader, flag) == kFlacReaderFlag);

void read_tags(flac_reader *r) {
    const int64_t bytes = std::min(r->stream.comment_bytes, kMaxCommentBytes);
    r->tags = r->stream.comment >= 0 ? tags_create() : nullptr;
    uint8_t *block = r->tags != nullptr
                         ? static_cast<uint8_t *>(malloc(static_cast<size_t>(bytes) + 1))
                         : nullptr;
    if (block != nullptr) {
        const int64_t got = io_file_read(&r->file, r->stream.comment, block, bytes);
        tags_from_vorbis(r->tags, block, static_cast<size_t>(std::max<int64_t>(got, 0)));
        free(block);
    }
}

// Decodes one frame with its check sum verified. Returns its sample frames, 0 or less when it is
// damaged or cut.
int32_t decode_here(flac_reader *r, const frame_entry &entry) {
    const av_setup setup = {r->stream.raw_info, kFlacInfoBytes, 0, 0, true};
    if (r->av.ctx == nullptr && !av_decoder_open(&r->av, "flac", &setup)) {
        return -1;
    }
    free(r->big);
    r->big = static_cast<uint8_t *>(malloc(static_cast<size_t>(entry.bytes) + 1));
    if (r->big == nullptr) {
        return -1;
    }
    const int64_t got = io_file_read(&r->file, entry.offset, r->big, entry.bytes);
    return got > 0 ? av_decoder_decode(&r->av, r->big, static_cast<int32_t>(got)) : -1;
}

// A last frame that the end of the file cuts is not there.
void settle_last(flac_reader *r) {
    frame_index *index = &r->stream.index;
    if (r->stream.last_unsure && index->count > 0) {
        const frame_entry &last = index->entry[index->count - 1];
        if (decode_here(r, last) < last.samples) {
            --index->count;
        }
    }
}

void drop_pcm(flac_reader *r) {
    free(r->pcm);
    r->pcm = nullptr;
}

// Decodes a frame that no buffer of the source can hold; a damaged one becomes silence.
bool start_pcm(flac_reader *r, const frame_entry &entry) {
    const int32_t bytes = entry.samples * kSampleFrame;
    r->pcm = static_cast<uint8_t *>(calloc(static_cast<size_t>(entry.samples), kSampleFrame));
    r->pcm_total = entry.samples;
    r->pcm_done = r->skip;
    if (r->pcm == nullptr) {
        return false;
    }
    if (decode_here(r, entry) > 0) {
        av_decoder_pcm(&r->av, kAvFront, 0, 0, -1, r->pcm, bytes);
    }
    return true;
}

int32_t write_pcm(flac_reader *r, void *buf, int32_t size) {
    const int64_t room = size - bundle_size(0, 1, 0);
    const int32_t samples =
        static_cast<int32_t>(std::min<int64_t>(room / kSampleFrame, r->pcm_total - r->pcm_done));
    if (samples < 1) {
        return -1;
    }
    bundle_head head = {};
    head.flags = kBundlePcm;
    head.channels = kChannels;
    head.samples = samples;
    head.frames = 1;
    bundle_writer w = {};
    bundle_begin(&w, buf, size, head, nullptr);
    uint8_t *space = bundle_add(&w, samples * kSampleFrame);
    if (space == nullptr) {
        return -1;
    }
    memcpy(space, r->pcm + static_cast<ptrdiff_t>(r->pcm_done) * kSampleFrame,
           static_cast<size_t>(samples) * kSampleFrame);
    r->pcm_done += samples;
    return bundle_end(&w);
}

// Returns the bytes written, 0 when the file ends early, -1 on failure.
int32_t write_frame(flac_reader *r, const frame_entry &entry, void *buf, int32_t size) {
    bundle_head head = {};
    head.flags = entry.bytes == 0 ? kBundleLost : 0;
    head.channels = kChannels;
    head.samples = entry.samples - r->skip;
    head.skip = r->skip;
    head.setup = kFlacInfoBytes;
    head.frames = entry.bytes == 0 ? 0 : 1;
    bundle_writer w = {};
    bundle_begin(&w, buf, size, head, r->stream.raw_info);
    if (entry.bytes > 0) {
        uint8_t *space = bundle_add(&w, entry.bytes);
        if (space == nullptr) {
            return -1;
        }
        const int64_t got = io_file_read(&r->file, entry.offset, space, entry.bytes);
        if (got != entry.bytes) {
            return got < 0 ? -1 : 0;
        }
    }
    return bundle_end(&w);
}

// The next bundle: a piece of the frame being handed out, or the next frame.
int32_t write_next(flac_reader *r, const frame_entry &entry, void *buf, int32_t size) {
    const bool fits = bundle_size(kFlacInfoBytes, 1, entry.bytes) <= size;
    if (fits && r->pcm == nullptr) {
        return write_frame(r, entry, buf, size);
    }
    if (r->pcm == nullptr && !start_pcm(r, entry)) {
        return -1;
    }
    return write_pcm(r, buf, size);
}

}  // namespace

int32_t xflac_init(void) {
    return 0;
}

void xflac_deinit(void) {}

void *xflacfd_create(const mtsrc_io *io, int64_t * /*word*/, xflac_info *info,
                     void * /*reserved*/) {
    flac_reader *r = static_cast<flac_reader *>(calloc(1, sizeof(flac_reader)));
    if (r == nullptr || info == nullptr || !io_file_open(&r->file, io) ||
        !flac_scan(&r->file, &r->stream)) {
        xflacfd_delete(r);
        return nullptr;
    }
    settle_last(r);
    read_tags(r);
    info->sample_rate = r->stream.first.rate;
    info->duration = units_of_duration(frame_index_end(&r->stream.index), r->stream.first.rate);
    info->tags = r->tags;
    return r;
}

int32_t xflacfd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second) {
    flac_reader *r = static_cast<flac_reader *>(reader);
    if (r == nullptr || buf == nullptr || bytes == nullptr) {
        return -1;
    }
    if (r->next >= r->stream.index.count) {
        return 1;
    }
    const frame_entry &entry = r->stream.index.entry[r->next];
    const int32_t before = r->pcm != nullptr ? r->pcm_done : r->skip;
    const int32_t got = write_next(r, entry, buf, size);
    if (got <= 0) {
        return got < 0 ? -1 : 1;
    }
    const int32_t rate = r->stream.first.rate;
    const int32_t samples = r->pcm != nullptr ? r->pcm_done - before : entry.samples - before;
    *bytes = got;
    if (first != nullptr) {
        *first = units_from_samples(entry.first + before, rate);
    }
    if (second != nullptr) {
        *second = units_from_samples(samples, rate);
    }
    if (r->pcm == nullptr || r->pcm_done == r->pcm_total) {
        drop_pcm(r);
        r->skip = 0;
        ++r->next;
    }
    return 0;
}

int32_t xflacfd_seek(void *reader, const int64_t *position, int64_t *reached) {
    flac_reader *r = static_cast<flac_reader *>(reader);
    if (r == nullptr || position == nullptr || reached == nullptr) {
        return -1;
    }
    const frame_index *index = &r->stream.index;
    const int32_t rate = r->stream.first.rate;
    const int64_t end = frame_index_end(index);
    const int64_t sample = seek_target(*position, end, rate);
    drop_pcm(r);
    r->next = sample < end ? frame_index_find(index, sample) : index->count;
    r->skip = sample < end ? static_cast<int32_t>(sample - index->entry[r->next].first) : 0;
    *reached = units_from_samples(sample, rate);
    return 0;
}

void xflacfd_delete(void *reader) {
    flac_reader *r = static_cast<flac_reader *>(reader);
    if (r != nullptr) {
        drop_pcm(r);
        free(r->big);
        av_decoder_close(&r->av);
        frame_index_free(&r->stream.index);
        tags_delete(r->tags);
        io_file_close(&r->file);
        free(r);
    }
}
