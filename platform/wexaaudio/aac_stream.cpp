#include "platform/wexaaudio/aac_stream.h"

#include <algorithm>
#include <cstdlib>

#include "platform/wexaaudio/av_decoder.h"
#include "platform/wexaaudio/bundle.h"
#include "platform/wexaaudio/units.h"

namespace {

// The core of a stream with spectral band replication has at most half of 48,000 Hz.
constexpr int32_t kMaxSbrCore = 24000;
constexpr int32_t kSbrFrames = 8;     // frames looked at for band replication; all carry it usually
constexpr int32_t kLearnFrames = 64;  // frames tried until one decodes at all

constexpr int32_t kMaxFrameSamples = 4096;  // as 16-bit pairs well within the frame buffer

struct group_plan {
    int32_t preroll;
    int32_t group;
};

// Opening a decoder costs as much as decoding several frames, so the largest groups that fit the
// frame buffer are taken. One frame of pre-roll settles the overlap of low complexity. Band
// replication has filters and envelopes with a longer memory: 8 frames of pre-roll can be heard.
constexpr group_plan kPlans[] = {{1, 64}, {1, 48}, {1, 32}, {1, 24}, {1, 16},
                                 {1, 8},  {1, 4},  {1, 2},  {1, 1}};
constexpr group_plan kSbrPlans[] = {{12, 64}, {12, 48}, {12, 32}, {12, 24}, {12, 16}, {12, 8},
                                    {12, 4},  {8, 4},   {4, 4},   {4, 2},   {2, 1},   {1, 1}};

// True when each group's longest bundle fits the frame buffer.
bool fits(const aac_stream *s, group_plan plan) {
    const int64_t frames = s->index.count;
    for (int64_t start = 0; start < frames; start += plan.group) {
        const int64_t from = std::max<int64_t>(start - plan.preroll, 0);
        const int64_t to = std::min(start + plan.group, frames);
        int64_t payload = 0;
        for (int64_t i = from; i < to; ++i) {
            payload += s->index.entry[i].bytes;
        }
        if (bundle_size(s->config.size, static_cast<int32_t>(to - from), payload) >
            kAacFrameBuffer) {
            return false;
        }
    }
    return true;
}

template <size_t N>
void choose_plan(aac_stream *s, const group_plan (&plans)[N]) {
    const group_plan *plan =
        std::find_if(plans, plans + N - 1, [s](group_plan p) { return fits(s, p); });
    s->preroll = plan->preroll;  // the last one is taken without a test: what does not fit even
    s->group = plan->group;      // there is handed out as silence
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
        s->index.entry[i].first = first;
        s->index.entry[i].samples = s->frame_samples;
        first += s->frame_samples;
    }
    // Prediction and long windows of the other object types remember more than one frame as well.
    if (s->config.object_type == kAacLowComplexity) {
        choose_plan(s, kPlans);
    } else {
        choose_plan(s, kSbrPlans);
    }
    s->next = 0;
    s->fresh = true;
    return true;
}

int32_t aac_stream_read(aac_stream *s, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second) {
    const int64_t k = s->next;
    if (k >= s->index.count) {
        return 1;
    }
    const int64_t start = k / s->group * s->group;
    const bool fresh = s->fresh || k == start;
    const int64_t from = fresh ? std::max<int64_t>(start - s->preroll, 0) : k;
    int64_t payload = 0;
    for (int64_t i = from; i <= k; ++i) {
        payload += s->index.entry[i].bytes;
    }
    bundle_head head = {{},
                        fresh ? kBundleFresh : 0,
                        s->channels,
                        s->frame_samples,
                        0,
                        s->config.size,
                        static_cast<int32_t>(k - from + 1)};
    if (bundle_size(head.setup, head.frames, payload) > size) {
        head.frames = 0;
    }
    bundle_writer w;
    bundle_begin(&w, buf, size, head, s->config.bytes);
    for (int64_t i = from; i <= k && head.frames > 0; ++i) {
        const frame_entry entry = s->index.entry[i];
        uint8_t *space = bundle_add(&w, entry.bytes);
        if (space == nullptr ||
            io_file_read(s->file, entry.offset, space, entry.bytes) != entry.bytes) {
            return -1;
        }
    }
    *bytes = bundle_end(&w);
    if (*bytes < 0) {
        return -1;
    }
    *first = units_from_samples(s->index.entry[k].first, s->sample_rate);
    *second = units_from_samples(s->frame_samples, s->sample_rate);
    s->fresh = false;
    ++s->next;
    return 0;
}

int32_t aac_stream_seek(aac_stream *s, int64_t position, int64_t *reached) {
    if (s->index.count == 0) {
        return -1;
    }
    const int64_t sample = samples_from_units(std::max<int64_t>(position, 0), s->sample_rate);
    int64_t k = frame_index_find(&s->index, sample);
    if (s->index.entry[k].first < sample && k + 1 < s->index.count) {
        ++k;
    }
    s->next = k;
    s->fresh = true;
    *reached = units_from_samples(s->index.entry[k].first, s->sample_rate);
    return 0;
}

int64_t aac_stream_duration(const aac_stream *s) {
    return units_from_samples(frame_index_end(&s->index), s->sample_rate);
}

void aac_stream_free(aac_stream *s) {
    frame_index_free(&s->index);
    *s = {};
}
