// Ogg: the first audio stream of the file's first group of streams. A demuxer has that one stream,
// and the stream handle is the demuxer itself.
//
// In: mtsrc_io. Out: bundles for vorbis_decoder.cpp, the set-up data, the information records.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/ogg/ogg_index.h"
#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/bundle.h"
#include "desktop/wexaaudio/shared/tags.h"
#include "desktop/wexaaudio/shared/units.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kSilenceSamples = 4096;  // of a hole handed out at a time

struct ogg_demux {
    io_file file;
    wexa_tags *tags;  // owned
    ogg_index index;
    int64_t next;    // packet to be handed out next
    int32_t inside;  // sample frames at its front already given, of a hole, or cut off by a seek
    bool fresh;      // the next packet starts a decoder
    bool primed;     // and the one before it has just been handed out to that end
};

// The packet at or after k that has audio, the count of packets when there is none.
int64_t with_audio(const frame_index *packets, int64_t k) {
    while (k < packets->count && packets->entry[k].samples == 0) {
        ++k;
    }
    return k;
}

// Hands out packet k for samples sample frames of its output, inside frames from its front on.
// Returns the bytes written, -1 when the file cannot be read. A packet that does not fit becomes
// silence.
int32_t write_packet(ogg_demux *d, int64_t k, bool fresh, int32_t inside, int32_t samples,
                     void *buf, int32_t size) {
    const frame_entry entry = d->index.packets.entry[k];
    bundle_head head = {};
    head.flags = fresh ? kBundleFresh : 0;
    head.channels = d->index.setup.channels;
    head.samples = samples;
    head.skip = inside + (k == d->index.cut_packet ? d->index.cut_samples : 0);
    head.frames = 1;
    if (bundle_size(0, head.frames, entry.bytes) > size) {
        head.frames = 0;
        head.flags = kBundleFresh;
    }
    bundle_writer w;
    bundle_begin(&w, buf, size, head, nullptr);
    if (head.frames > 0) {
        uint8_t *space = bundle_add(&w, entry.bytes);
        if (space == nullptr ||
            !ogg_index_copy(&d->index, &d->file, entry.offset, space, entry.bytes)) {
            return -1;
        }
    }
    return bundle_end(&w);
}

int32_t write_silence(const ogg_demux *d, int32_t samples, void *buf, int32_t size) {
    bundle_head head = {};
    head.flags = kBundleFresh;
    head.channels = d->index.setup.channels;
    head.samples = samples;
    bundle_writer w;
    bundle_begin(&w, buf, size, head, nullptr);
    return bundle_end(&w);
}

// Hands out what comes next of packet k: silence of a hole, the packet before it that a decoder
// starts with, or itself. *samples: sample frames that it will give.
int32_t write_next(ogg_demux *d, int64_t k, int32_t inside, void *buf, int32_t size,
                   int32_t *samples) {
    const frame_entry *entry = d->index.packets.entry;
    const int32_t left = entry[k].samples - inside;
    if (entry[k].bytes == 0) {
        *samples = std::min(left, kSilenceSamples);
        d->fresh = true;
        d->primed = false;
        return write_silence(d, *samples, buf, size);
    }
    // Behind a packet that only primes, or nothing usable, a linear read starts afresh as well.
    const bool fresh = !d->primed && (d->fresh || k == 0 || entry[k - 1].samples == 0);
    d->primed = fresh && k > 0 && entry[k - 1].bytes > 0;
    d->fresh = false;
    *samples = d->primed ? 0 : left;
    return d->primed ? write_packet(d, k - 1, true, 0, 0, buf, size)
                     : write_packet(d, k, fresh, inside, left, buf, size);
}

}  // namespace

void *xoggd_create(const mtsrc_io *io, int64_t * /*word*/, xogg_info *info, void * /*reserved*/) {
    av_prepare();
    ogg_demux *d = static_cast<ogg_demux *>(calloc(1, sizeof(ogg_demux)));
    if (d == nullptr || info == nullptr) {
        free(d);
        return nullptr;
    }
    d->tags = tags_create();
    if (d->tags == nullptr || !io_file_open(&d->file, io) ||
        !ogg_index_read(&d->index, &d->file, d->tags)) {
        xoggd_delete(d);
        return nullptr;
    }
    d->fresh = true;
    info->stream_count = d->index.stream_count;
    memcpy(info->kind, d->index.kind, sizeof info->kind);
    if (d->index.codec == kOggVorbis) {
        info->duration =
            units_of_duration(frame_index_end(&d->index.packets), d->index.setup.sample_rate);
    }
    info->tags = d->tags;
    return d;
}

void xoggd_delete(void *demux) {
    ogg_demux *d = static_cast<ogg_demux *>(demux);
    if (d != nullptr) {
        ogg_index_free(&d->index);
        io_file_close(&d->file);
        tags_delete(d->tags);
        free(d);
    }
}

void *xoggds_open(void *demux, int32_t index, void * /*reserved*/) {
    const ogg_demux *d = static_cast<ogg_demux *>(demux);
    return d != nullptr && index >= 0 && index == d->index.stream ? demux : nullptr;
}

void xoggds_close(void * /*stream*/) {}

int32_t xoggds_get_info_aud(void *stream, xogg_stream *info) {
    const ogg_demux *d = static_cast<ogg_demux *>(stream);
    if (d == nullptr || info == nullptr) {
        return -1;
    }
    info->codec = d->index.codec;
    info->sample_rate = d->index.setup.sample_rate;
    return 0;
}

int32_t xoggds_get_format(void *stream, void *buf, int32_t *length) {
    const ogg_demux *d = static_cast<ogg_demux *>(stream);
    if (d == nullptr || length == nullptr || d->index.setup.data == nullptr) {
        return -1;
    }
    *length = d->index.setup.bytes;
    if (buf != nullptr) {
        memcpy(buf, d->index.setup.data, static_cast<size_t>(d->index.setup.bytes));
    }
    return 0;
}

int32_t xoggds_get_frm(void *stream, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                       int64_t *second) {
    ogg_demux *d = static_cast<ogg_demux *>(stream);
    if (d == nullptr || buf == nullptr || bytes == nullptr || first == nullptr ||
        second == nullptr || d->index.codec != kOggVorbis) {
        return -1;
    }
    const frame_index *packets = &d->index.packets;
    const int64_t k = with_audio(packets, d->next);
    if (k >= packets->count) {
        return 1;
    }
    const int32_t inside = k == d->next ? d->inside : 0;
    int32_t samples = 0;
    const int32_t written = write_next(d, k, inside, buf, size, &samples);
    if (written < 0) {
        return -1;
    }
    const frame_entry &entry = packets->entry[k];
    const int32_t rate = d->index.setup.sample_rate;
    *bytes = written;
    *first = units_from_samples(entry.first + inside, rate);
    *second = units_from_samples(samples, rate);
    const bool done = inside + samples == entry.samples;
    d->next = done ? k + 1 : k;
    d->inside = done ? 0 : inside + samples;
    return 0;
}

int32_t xoggds_seek(void *stream, const int64_t *position, int64_t *reached, int32_t /*flags*/) {
    ogg_demux *d = static_cast<ogg_demux *>(stream);
    if (d == nullptr || position == nullptr || reached == nullptr || d->index.codec != kOggVorbis ||
        d->index.packets.count == 0) {
        return -1;
    }
    const frame_index *packets = &d->index.packets;
    const int32_t rate = d->index.setup.sample_rate;
    const int64_t end = frame_index_end(packets);
    const int64_t sample = seek_target(*position, end, rate);
    const int64_t k = sample < end ? frame_index_find(packets, sample) : packets->count;
    d->next = k;
    d->inside = sample < end ? static_cast<int32_t>(sample - packets->entry[k].first) : 0;
    d->fresh = true;
    d->primed = false;
    *reached = units_from_samples(sample, rate);
    return 0;
}
