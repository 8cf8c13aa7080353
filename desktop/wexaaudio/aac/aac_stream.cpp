#include "desktop/wexaaudio/aac/aac_stream.h"

#include <algorithm>
#include <cstdlib>

#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/bundle.h"
#include "desktop/wexaaudio/shared/units.h"

namespace {

// The core of a stream with spectral band replication has at most half of 48,000 Hz.
constexpr int32_t kMaxSbrCore = 24000;
constexpr int32_t kSbrFrames = 8;     // frames looked at for band replication; all carry it usually
constexpr int32_t kLearnFrames = 64;  // frames tried until one decodes at all

constexpr int32_t kMaxFrameSamples = 4096;  // as 16-bit pairs well within the frame buffer

// Opening a decoder costs as much as decoding several frames, which speaks for large groups; a seek
// decodes half a group on average, which speaks for small ones.
//
// One frame settles the overlap of low complexity. Band replication has filters and envelopes with
// a longer memory, and its set-up may come with every tenth frame only: 8 frames can be heard.
constexpr int32_t kGroup = 256;
constexpr int32_t kPreroll = 1;
constexpr int32_t kLongPreroll = 12;

constexpr int32_t kMaxBlockBytes = 8191;  // what an ADTS header can state, beyond any real block

// Goes back to where the group of the next frame starts a decoder.
void start_group(aac_stream *s) {
    s->fresh = true;
    s->feed =
        s->group > 0 ? std::max<int64_t>(s->next - s->next % s->group - s->preroll, 0) : s->next;
}

// Decodes frame k alone with a fresh decoder. Returns the sample frames that d then holds.
int32_t decode_alone(const aac_stream *s, int64_t k, av_decoder *d, uint8_t *buf) {
    const frame_entry entry = s->index.entry[k];
    av_setup setup = {};
    setup.extra = s->config.bytes;
    setup.extra_bytes = s->config.size;
    if (entry.bytes > kAacFrameBuffer ||
        io_file_read(s->file, entry.offset, buf, entry.bytes) != entry.bytes ||
        !av_decoder_open(d, "aac", &setup)) {
        return 0;
    }
    return std::max(av_decoder_decode(d, buf, entry.bytes), 0);
}

// Finds rate, channels and frame length. False when no frame gives audio.
bool learn_output(aac_stream *s) {
    av_decoder d = {};
    uint8_t *buf = static_cast<uint8_t *>(malloc(kAacFrameBuffer));
    const int32_t core_rate = aac_rate_of_index(s->config.rate_index);
    const bool may_have_sbr =
        s->config.object_type == kAacLowComplexity && core_rate > 0 && core_rate <= kMaxSbrCore;
    const int64_t tries = std::min<int64_t>(s->index.count, kLearnFrames);
    for (int64_t k = 0; buf != nullptr && k < tries; ++k) {
        const int32_t samples = decode_alone(s, k, &d, buf);
        if (samples > 0 && samples <= kMaxFrameSamples && av_decoder_rate(&d) > s->sample_rate) {
            s->sample_rate = av_decoder_rate(&d);
            s->channels = av_decoder_channels(&d);
            s->frame_samples = samples;
        }
        const bool sbr_found = s->sample_rate > core_rate;
        if (s->sample_rate > 0 && (!may_have_sbr || sbr_found || k + 1 >= kSbrFrames)) {
            break;
        }
    }
    av_decoder_close(&d);
    free(buf);
    return s->sample_rate > 0;
}

}  // namespace

bool aac_stream_learn(aac_stream *s) {
    s->sample_rate = 0;
    if (!learn_output(s)) {
        return false;
    }
    const bool sbr = s->sample_rate == 2 * aac_rate_of_index(s->config.rate_index);
    if (sbr) {
        aac_config_make_sbr(&s->config, s->config.channels == 1 && s->channels == 2);
    }
    int64_t first = 0;
    for (int64_t i = 0; i < s->index.count; ++i) {
        frame_entry &entry = s->index.entry[i];
        entry.first = first;
        entry.samples = s->frame_samples;
        entry.bytes = entry.bytes <= kMaxBlockBytes ? entry.bytes : 0;
        first += s->frame_samples;
    }
    // The prediction of other object types remembers more than one frame as well.
    const bool plain = s->config.object_type == kAacLowComplexity && !sbr;
    s->group = kGroup;
    s->preroll = plain ? kPreroll : kLongPreroll;
    start_group(s);
    return true;
}

void aac_stream_advance(aac_stream *s) {
    ++s->next;
    s->skip = 0;
    s->feed = s->next;
    if (s->group > 0 && s->next % s->group == 0) {
        start_group(s);
    }
}

int32_t aac_stream_read(aac_stream *s, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second) {
    if (s->next >= s->index.count) {
        return 1;
    }
    const frame_entry entry = s->index.entry[s->feed];
    const bool heard = s->feed == s->next;
    bundle_head head = {};
    head.flags = s->fresh ? kBundleFresh : 0;
    head.channels = s->channels;
    head.samples = heard ? s->frame_samples - s->skip : 0;
    head.skip = heard ? s->skip : 0;
    head.setup = s->config.size;
    head.frames = 1;
    bundle_writer w;
    bundle_begin(&w, buf, size, head, s->config.bytes);
    uint8_t *space = bundle_add(&w, entry.bytes);
    if (space == nullptr ||
        io_file_read(s->file, entry.offset, space, entry.bytes) != entry.bytes) {
        return -1;
    }
    *bytes = bundle_end(&w);
    *first = units_from_samples(entry.first + head.skip, s->sample_rate);
    *second = units_from_samples(head.samples, s->sample_rate);
    s->fresh = false;
    ++s->feed;
    if (heard) {
        aac_stream_advance(s);
    }
    return 0;
}

int32_t aac_stream_seek(aac_stream *s, int64_t position, int64_t *reached) {
    if (s->index.count == 0) {
        return -1;
    }
    const int64_t end = frame_index_end(&s->index);
    const int64_t sample = seek_target(position, end, s->sample_rate);
    s->next = sample < end ? frame_index_find(&s->index, sample) : s->index.count;
    s->skip = sample < end ? static_cast<int32_t>(sample - s->index.entry[s->next].first) : 0;
    start_group(s);
    *reached = units_from_samples(sample, s->sample_rate);
    return 0;
}

int64_t aac_stream_duration(const aac_stream *s) {
    return units_of_duration(frame_index_end(&s->index), s->sample_rate);
}

void aac_stream_free(aac_stream *s) {
    frame_index_free(&s->index);
    *s = {};
}
