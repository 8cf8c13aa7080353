#include "pcm/decode.h"

#include "common/worker_group.h"
#include "media_source/pcm_queue.h"
#include "pcm/read_pcm.h"

namespace {

constexpr int32_t kMaxSegments = 4;

void decode_segment(void *record) {
    auto *seg = static_cast<TAVO_DECSEG *>(record);
    if (seg->src == nullptr) return;
    read_pcm(seg->src, seg->buf, seg->cap, &seg->got);
}

// True if `ctx` holds a valid decoding plan.
bool is_planned(const TAVO_CTX *ctx) {
    return ctx->seg != nullptr && ctx->seg_count >= 1 && ctx->seg_count <= kMaxSegments;
}

}  // namespace

void thd_cleanup(void *seg) {
    const auto *self = static_cast<TAVO_DECSEG *>(seg);
    worker_group_done(self->mutex, self->cond, self->done, self->count, self->index);
}

void *_tavo_mtproc_decoding(void *seg) {
    run_worker(seg, decode_segment, thd_cleanup);
}

int64_t decode_segments(TAVO_CTX *ctx, void *dst, int64_t dst_capacity, segment_pages pages) {
    if (!is_planned(ctx) || ext_mutex_mt == nullptr) return 0;
    const int32_t count = ctx->seg_count;
    worker_slot slots[kMaxSegments] = {};
    for (int32_t i = 0; i < count; ++i) {
        TAVO_DECSEG *seg = &ctx->seg[i];
        slots[i] = {seg, &seg->thread, _tavo_mtproc_decoding, decode_segment};
    }
    worker_group_run(slots, count, ext_mutex_mt, ext_cond_mt, ctx->seg[0].done);
    for (int32_t i = 0; i < count && pages == segment_pages::released; ++i) {
        const TAVO_DECSEG *seg = &ctx->seg[i];
        if (seg->src != nullptr && seg->cap >= kLargeBytes) pcm_queue_release_pages(seg->src);
    }
    return stitch_segments(ctx->seg, count, ctx->fmt.sample_rate, static_cast<uint8_t *>(dst),
                           dst_capacity, pages);
}

int64_t DecodePcmMT(TAVO_CTX *ctx, void *dst, int64_t dst_capacity) {
    return decode_segments(ctx, dst, dst_capacity, segment_pages::kept);
}
