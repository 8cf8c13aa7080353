// An instance whose decoding plan is laid by hand over fake sources, as setup would leave it.
#ifndef TAVO_TESTS_PCM_PLAN_BUILDER_H
#define TAVO_TESTS_PCM_PLAN_BUILDER_H

#include "pcm/decode.h"
#include "tests/pcm/fake_source.h"

inline void *zeroed(int64_t bytes) {
    return calloc(static_cast<size_t>(bytes), 1);
}

// One segment per capacity, each playing its own audio. duration decides how many records the
// release finds: above 5 s four, else one. Released by tavo_decode_deinit.
inline void lay_plan(TAVO_CTX *ctx, std::vector<fake_audio> *audio,
                     const std::vector<int64_t> &capacity, int64_t duration) {
    const auto count = static_cast<int32_t>(capacity.size());
    const int32_t rate = audio->front().rate;
    *ctx = {};
    ctx->fmt = {rate, 1, 16};
    ctx->duration = duration;
    ctx->seg_count = count;
    ctx->seg = static_cast<TAVO_DECSEG *>(zeroed(count * int64_t{sizeof(TAVO_DECSEG)}));
    auto *done = static_cast<int32_t *>(zeroed(count * int64_t{sizeof(int32_t)}));
    ext_mutex_mt = static_cast<pthread_mutex_t *>(zeroed(sizeof(pthread_mutex_t)));
    ext_cond_mt = static_cast<pthread_cond_t *>(zeroed(sizeof(pthread_cond_t)));
    pthread_mutex_init(ext_mutex_mt, nullptr);
    pthread_cond_init(ext_cond_mt, nullptr);
    for (int32_t i = 0; i < count; ++i) {
        TAVO_DECSEG *seg = &ctx->seg[i];
        seg->index = i;
        seg->count = count;
        seg->src = open_fake(&(*audio)[static_cast<size_t>(i)]);
        seg->fmt = ctx->fmt;
        seg->duration = duration;
        seg->cap = capacity[static_cast<size_t>(i)];
        seg->buf = static_cast<uint8_t *>(malloc(static_cast<size_t>(seg->cap)));
        seg->start = i * (duration / count);
        seg->done = done;
        seg->mutex = ext_mutex_mt;
        seg->cond = ext_cond_mt;
        mtsrc_seekstream(seg->src, seg->start, &seg->seek_pos);
    }
    ctx->pcm_bytes = duration * rate * 2 / kUnitsPerSecond;
    ctx->pcm = static_cast<int16_t *>(zeroed(ctx->pcm_bytes));
}

// Frees the buffers as the caller of construct_decbuf has to.
inline void drop_buffers(TAVO_CTX *ctx) {
    for (int32_t i = 0; i < ctx->seg_count; ++i) {
        free(ctx->seg[i].buf);
        ctx->seg[i].buf = nullptr;
    }
    free(ctx->pcm);
    ctx->pcm = nullptr;
}

#endif
