// A media source without a file: a handle whose operations deliver a given run of bytes, for the
// stages that read sources.
#ifndef TAVO_TESTS_PCM_FAKE_SOURCE_H
#define TAVO_TESTS_PCM_FAKE_SOURCE_H

#include <algorithm>

#include "common/tavo_ctx.h"
#include "media_source/mtsrc_ctx.h"
#include "tests/pcm/signals.h"

// What one source plays. The test owns it; it outlives the source.
struct fake_audio {
    byte_run stream;
    int32_t rate = 8000;    // Hz
    int64_t warm_up = 0;    // bytes after a seek that differ from the stream's
    int64_t fail_at = -1;   // stream byte from which on reads fail
    int failing_seeks = 0;  // the next seeks that fail, without reporting a position
    int64_t report = -1;    // units reported by the next seek, whatever it is asked
    int64_t land = -1;      // stream byte where the next seek lands, whatever it is asked
    int empty_replies = 0;  // reads that bring nothing before the others do
    int32_t code = 0;       // of a read within the stream

    // Seen by the fake.
    std::vector<int64_t> seeks;   // positions asked for
    std::vector<int32_t> wanted;  // sizes asked for
    int closed = 0;
};

struct fake_source {
    mtsrc_ctx ctx;
    fake_audio *audio;
    int64_t at;    // next byte
    int64_t warm;  // bytes still to be falsified
};

inline int32_t fake_get(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    auto *self = reinterpret_cast<fake_source *>(src);
    fake_audio *audio = self->audio;
    audio->wanted.push_back(want);
    if (audio->fail_at >= 0 && self->at + want > audio->fail_at) {
        frame->size = want;  // must not be counted
        return -6;
    }
    if (audio->empty_replies > 0) {
        --audio->empty_replies;
        frame->size = 0;
        return audio->code;
    }
    const int64_t left = static_cast<int64_t>(audio->stream.size()) - self->at;
    const int64_t bytes = std::clamp<int64_t>(left, 0, want);
    auto *out = static_cast<uint8_t *>(frame->data);
    if (bytes > 0) memcpy(out, audio->stream.data() + self->at, static_cast<size_t>(bytes));
    for (int64_t i = 0; i < bytes && self->warm > 0; ++i, --self->warm) out[i] ^= 0x55;
    self->at += bytes;
    frame->size = static_cast<int32_t>(bytes);
    return bytes < want ? 1 : audio->code;
}

inline int32_t fake_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    auto *self = reinterpret_cast<fake_source *>(src);
    fake_audio *audio = self->audio;
    audio->seeks.push_back(position);
    if (audio->failing_seeks > 0) {
        --audio->failing_seeks;
        return -4;
    }
    const int64_t there = position * audio->rate / kUnitsPerSecond * 2;
    self->at = audio->land >= 0 ? audio->land : there;
    self->warm = audio->warm_up;
    *reached = audio->report >= 0 ? audio->report : position;
    audio->land = -1;
    audio->report = -1;
    return 0;
}

inline void fake_close(mtsrc_ctx *src) {
    ++reinterpret_cast<fake_source *>(src)->audio->closed;
}

// The handle is released by mtsrc_deinit like any other.
inline mtsrc_ctx *open_fake(fake_audio *audio) {
    auto *self = static_cast<fake_source *>(calloc(1, sizeof(fake_source)));
    memcpy(&self->ctx.mark, "KOVA", 4);
    self->ctx.get_frm = fake_get;
    self->ctx.seek = fake_seek;
    self->ctx.close = fake_close;
    pthread_mutex_init(&self->ctx.lock, nullptr);
    self->audio = audio;
    return &self->ctx;
}

#endif
