#include "common/worker_group.h"
#include "pcm/decode.h"
#include "pcm/read_pcm.h"
#include "pcm/song.h"
#include "pcm/stitch.h"

namespace {

constexpr int32_t kMaxSegments = 4;

void decode_segment(void *record) {
    auto *seg = static_cast<TAVO_DECSEG *>(record);
    if (seg->src == nullptr) return;
    seg->got = read_pcm(seg->src, seg->buf, seg->cap);
}

// keep: whether the segments' buffers stay allocated.
int64_t decode_plan(TAVO_CTX *ctx, void *dst, int64_t dst_capacity, bool keep) {
    const int32_t count = ctx->seg_count;
    if (ctx->seg == nullptr || ext_mutex_mt == nullptr) return 0;
    if (count < 1 || count > kMaxSegments) return 0;

    worker_slot slots[kMaxSegments] = {};
    for (int32_t i = 0; i < count; ++i) {
        TAVO_DECSEG *seg = &ctx->seg[i];
        slots[i] = {seg, &seg->thread, _tavo_mtproc_decoding, decode_segment};
    }
    worker_group_run(slots, count, ext_mutex_mt, ext_cond_mt, ctx->seg[0].done);
    return stitch_segments(ctx->seg, count, ctx->fmt.sample_rate, static_cast<uint8_t *>(dst),
                           dst_capacity, keep);
}

}  // namespace

void free_segment_buffer(TAVO_DECSEG *seg) {
    free(seg->buf);
    seg->buf = nullptr;
}

void thd_cleanup(void *seg) {
    const auto *self = static_cast<TAVO_DECSEG *>(seg);
    worker_group_done(self->mutex, self->cond, self->done, self->count, self->index);
}

void *_tavo_mtproc_decoding(void *seg) {
    run_worker(seg, decode_segment, thd_cleanup);
}

int64_t DecodePcmMT(TAVO_CTX *ctx, void *dst, int64_t dst_capacity) {
    return decode_plan(ctx, dst, dst_capacity, true);
}

void decode_song(TAVO_CTX *ctx) {
    ctx->pcm_bytes = decode_plan(ctx, ctx->pcm, ctx->pcm_bytes, false);
}
