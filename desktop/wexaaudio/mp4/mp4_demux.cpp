// MP4: the first audio track, AAC or MPEG Layer III. A demuxer has that one stream, and the stream
// handle is the demuxer itself.
//
// In: mtsrc_io. Out: bundles for aac_decoder.cpp or mpeg_decoder.cpp.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/aac/aac_stream.h"
#include "desktop/wexaaudio/mp4/mp4_index.h"
#include "desktop/wexaaudio/mpeg/mpeg_frames.h"
#include "desktop/wexaaudio/mpeg/mpeg_header.h"
#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/tags.h"
#include "desktop/wexaaudio/shared/units.h"
#include "media_source/wexaaudio.h"

namespace {

// Frames looked at for a header that says rate and length; the first one has it unless damaged.
constexpr int64_t kLearnFrames = 64;

struct mp4_demux {
    io_file file;
    wexa_tags *tags;  // owned
    int32_t track;    // index of the audio track, -1 without one
    int32_t format_tag;
    aac_stream stream;  // of either codec; for Layer III only its index, format and position
};

// Rate, channels and frame length of a Layer III track come from its frames: all have one length.
bool learn_mpeg(aac_stream *s) {
    mpeg_header h = {};
    bool known = false;
    for (int64_t k = 0; k < std::min(s->index.count, kLearnFrames) && !known; ++k) {
        int32_t got = 0;
        const uint8_t *p = io_file_peek(s->file, s->index.entry[k].offset, kMpegHeaderBytes, &got);
        known = p != nullptr && got >= kMpegHeaderBytes && mpeg_parse(p, &h) && h.layer == 3;
    }
    if (!known) {
        return false;
    }
    s->sample_rate = h.rate;
    s->channels = h.channels;
    s->frame_samples = h.samples;
    s->fresh = true;  // group stays 0: each seek finds its own pre-roll
    int64_t first = 0;
    for (int64_t k = 0; k < s->index.count; ++k) {
        s->index.entry[k].first = first;
        s->index.entry[k].samples = h.samples;
        first += h.samples;
    }
    return true;
}

bool open_tracks(mp4_demux *d, xmp4_info *info) {
    mp4_index index;
    if (!mp4_index_read(&index, &d->file, d->tags)) {
        return false;
    }
    aac_stream *s = &d->stream;
    s->file = &d->file;
    s->index = index.frames;
    s->config = index.config;
    s->sample_rate = index.sample_rate;
    s->channels = index.channels;
    d->track = index.track;
    d->format_tag = index.format_tag;
    info->track_count = index.track_count;
    memcpy(info->kind, index.kind, sizeof info->kind);
    switch (d->format_tag) {
        case kWexaTagAac:
            return aac_stream_learn(s);
        case kWexaTagMpegLayer3:
            return learn_mpeg(s);
        default:
            return true;  // the source refuses the tag
    }
}

int32_t read_mpeg(aac_stream *s, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                  int64_t *second) {
    if (s->next >= s->index.count) {
        return 1;
    }
    const int32_t got =
        mpeg_frames_read(s->file, &s->index, s->next, s->fresh, s->skip, s->channels, buf, size);
    if (got <= 0) {
        return got == 0 ? 1 : -1;
    }
    *bytes = got;
    *first = units_from_samples(s->index.entry[s->next].first + s->skip, s->sample_rate);
    *second = units_from_samples(s->frame_samples - s->skip, s->sample_rate);
    s->fresh = false;
    aac_stream_advance(s);
    return 0;
}

}  // namespace

void *xmp4fd_create(const mtsrc_io *io, int32_t * /*word*/, xmp4_info *info, void * /*reserved*/) {
    av_prepare();
    mp4_demux *d = static_cast<mp4_demux *>(calloc(1, sizeof(mp4_demux)));
    if (d == nullptr || info == nullptr) {
        free(d);
        return nullptr;
    }
    d->tags = tags_create();
    if (d->tags == nullptr || !io_file_open(&d->file, io) || !open_tracks(d, info)) {
        xmp4fd_delete(d);
        return nullptr;
    }
    if (d->format_tag != 0) {
        info->duration = aac_stream_duration(&d->stream);
    }
    info->tags = d->tags;
    return d;
}

void xmp4fd_delete(void *demux) {
    mp4_demux *d = static_cast<mp4_demux *>(demux);
    if (d != nullptr) {
        aac_stream_free(&d->stream);
        io_file_close(&d->file);
        tags_delete(d->tags);
        free(d);
    }
}

void *xmp4fds_open(void *demux, int32_t track, void * /*reserved*/) {
    const mp4_demux *d = static_cast<mp4_demux *>(demux);
    return d != nullptr && track >= 0 && track == d->track ? demux : nullptr;
}

void xmp4fds_close(void * /*stream*/) {}

int32_t xmp4fds_get_info_aud(void *stream, xmp4_track *track) {
    const mp4_demux *d = static_cast<mp4_demux *>(stream);
    if (d == nullptr || track == nullptr) {
        return -1;
    }
    track->format_tag = d->format_tag;
    track->sample_rate = d->stream.sample_rate;
    track->channels = d->stream.channels;
    return 0;
}

int32_t xmp4fds_get_frm(void *stream, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second) {
    mp4_demux *d = static_cast<mp4_demux *>(stream);
    if (d == nullptr || buf == nullptr || bytes == nullptr || first == nullptr ||
        second == nullptr) {
        return -1;
    }
    switch (d->format_tag) {
        case kWexaTagAac:
            return aac_stream_read(&d->stream, buf, size, bytes, first, second);
        case kWexaTagMpegLayer3:
            return read_mpeg(&d->stream, buf, size, bytes, first, second);
        default:
            return -1;
    }
}

int32_t xmp4fds_seek(void *stream, const int64_t *position, int64_t *reached, int32_t /*flags*/) {
    mp4_demux *d = static_cast<mp4_demux *>(stream);
    if (d == nullptr || position == nullptr || reached == nullptr || d->format_tag == 0) {
        return -1;
    }
    return aac_stream_seek(&d->stream, *position, reached);
}
