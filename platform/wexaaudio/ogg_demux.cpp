// Ogg: the first audio stream of the file's first group of streams. A demuxer has that one stream,
// and the stream handle is the demuxer itself.
//
// In: mtsrc_io. Out: bundles for vorbis_decoder.cpp, the set-up data, the information records.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "media_source/wexaaudio.h"
#include "platform/wexaaudio/av_decoder.h"
#include "platform/wexaaudio/bundle.h"
#include "platform/wexaaudio/ogg_index.h"
#include "platform/wexaaudio/tags.h"
#include "platform/wexaaudio/units.h"

namespace {

constexpr int32_t kSilenceSamples = 4096;  // of a hole handed out at a time

struct ogg_demux {
    io_file file;
    wexa_tags *tags;  // owned
    ogg_index index;
    int64_t next;    // packet to be handed out next
    int32_t inside;  // sample frames of it already given, of a hole
    bool fresh;      // the next packet starts a decoder
};

// The packet at or after k that has audio, the count of packets when there is none.
int64_t with_audio(const frame_index *packets, int64_t k) {
    while (k < packets->count && packets->entry[k].samples == 0) {
        ++k;
    }
    return k;
}

// Hands out packet k, with the one before it when the decoder starts here. Returns the bytes
// written, -1 when the file cannot be read. A packet that does not fit becomes silence.
int32_t write_packet(ogg_demux *d, int64_t k, void *buf, int32_t size) {
    const frame_entry *entry = d->index.packets.entry;
    // Behind a packet that only primes, or nothing usable, a linear read starts afresh as well.
    const bool fresh = d->fresh || k == 0 || entry[k - 1].samples == 0;
    const int64_t from = fresh && k > 0 && entry[k - 1].bytes > 0 ? k - 1 : k;
    int64_t payload = 0;
    for (int64_t i = from; i <= k; ++i) {
        payload += entry[i].bytes;
    }
    bundle_head head = {};
    head.flags = fresh ? kBundleFresh : 0;
    head.channels = d->index.setup.channels;
    head.samples = entry[k].samples;
    head.skip = k == d->index.cut_packet ? d->index.cut_samples : 0;
    head.frames = static_cast<int32_t>(k - from + 1);
    if (bundle_size(0, head.frames, payload) > size) {
        head.frames = 0;
        head.flags = kBundleFresh;
    }
    bundle_writer w;
    bundle_begin(&w, buf, size, head, nullptr);
    for (int64_t i = from; i <= k && head.frames > 0; ++i) {
        uint8_t *space = bundle_add(&w, entry[i].bytes);
        if (space == nullptr ||
            !ogg_index_copy(&d->index, &d->file, entry[i].offset, space, entry[i].bytes)) {
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

}  // namespace

void *xoggd_create(const mtsrc_io *io, int64_t * /*word*/, xogg_info *info, void * /*reserved*/) {
    av_quiet();
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
            units_from_samples(frame_index_end(&d->index.packets), d->index.setup.sample_rate);
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
    const frame_entry &entry = packets->entry[k];
    const bool hole = entry.bytes == 0;
    const int32_t inside = k == d->next ? d->inside : 0;
    const int32_t samples =
        hole ? std::min(entry.samples - inside, kSilenceSamples) : entry.samples;
    const int32_t written =
        hole ? write_silence(d, samples, buf, size) : write_packet(d, k, buf, size);
    if (written < 0) {
        return -1;
    }
    const int32_t rate = d->index.setup.sample_rate;
    *bytes = written;
    *first = units_from_samples(entry.first + inside, rate);
    *second = units_from_samples(samples, rate);
    const bool done = !hole || inside + samples == entry.samples;
    d->next = done ? k + 1 : k;
    d->inside = done ? 0 : inside + samples;
    d->fresh = hole;
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
    const int64_t sample = samples_from_units(std::max<int64_t>(*position, 0), rate);
    int64_t k = frame_index_find(packets, sample);
    const frame_entry &found = packets->entry[k];
    d->inside = 0;
    if (found.bytes == 0 && sample < found.first + found.samples) {
        d->inside = static_cast<int32_t>(std::max<int64_t>(sample - found.first, 0));
    } else if (found.first < sample && with_audio(packets, k + 1) < packets->count) {
        k = with_audio(packets, k + 1);
    }
    d->next = k;
    d->fresh = true;
    *reached = units_from_samples(packets->entry[k].first + d->inside, rate);
    return 0;
}
