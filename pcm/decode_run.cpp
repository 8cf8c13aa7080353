#include <cstdlib>

#include "common/alloc.h"
#include "common/worker_group.h"
#include "pcm/decode.h"
#include "pcm/read_pcm.h"
#include "pcm/song.h"
#include "pcm/stitch.h"

namespace {

constexpr int32_t kMaxSegments = 4;
constexpr int64_t kCacheLine = 64;  // bytes; no two threads write to the same

void decode_segment(void *record) {
    auto *seg = static_cast<TAVO_DECSEG *>(record);
    if (seg->src == nullptr) return;
    seg->got = read_pcm(seg->src, seg->buf, seg->cap);
}

// Whether there is a plan that this stage can have made.
bool is_planned(const TAVO_CTX *ctx) {
    return ctx->seg != nullptr && ctx->seg_count >= 1 && ctx->seg_count <= kMaxSegments;
}

// Bytes of pcm that hold the segment's buffer, at least one cache line.
int64_t part_bytes(const TAVO_DECSEG *seg) {
    return (seg->cap / kCacheLine + 1) * kCacheLine;
}

// Replaces the segments' buffers by consecutive parts of pcm, which is enlarged: stitching then
// moves bytes within memory that is mapped already. False when memory runs out; the segments have
// no buffers then.
bool share_pcm(TAVO_CTX *ctx) {
    int64_t bytes = 0;
    for (int32_t i = 0; i < ctx->seg_count; ++i) {
        free_segment_buffer(&ctx->seg[i]);
        bytes += part_bytes(&ctx->seg[i]);
    }
    auto *pool = static_cast<uint8_t *>(realloc(ctx->pcm, static_cast<size_t>(bytes)));
    if (pool == nullptr) return false;
    advise_huge_pages(pool, bytes);
    ctx->pcm = reinterpret_cast<int16_t *>(pool);
    for (int32_t i = 0; i < ctx->seg_count; ++i) {
        ctx->seg[i].buf = pool;
        pool += part_bytes(&ctx->seg[i]);
    }
    return true;
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
    if (!is_planned(ctx) || ext_mutex_mt == nullptr) return 0;
    const int32_t count = ctx->seg_count;
    worker_slot slots[kMaxSegments] = {};
    for (int32_t i = 0; i < count; ++i) {
        TAVO_DECSEG *seg = &ctx->seg[i];
        slots[i] = {seg, &seg->thread, _tavo_mtproc_decoding, decode_segment};
    }
    worker_group_run(slots, count, ext_mutex_mt, ext_cond_mt, ctx->seg[0].done);
    return stitch_segments(ctx->seg, count, ctx->fmt.sample_rate, static_cast<uint8_t *>(dst),
                           dst_capacity);
}

void decode_song(TAVO_CTX *ctx) {
    const int64_t capacity = ctx->pcm_bytes;
    ctx->pcm_bytes = 0;
    if (!is_planned(ctx) || !share_pcm(ctx)) return;
    ctx->pcm_bytes = DecodePcmMT(ctx, ctx->pcm, capacity);
    for (int32_t i = 0; i < ctx->seg_count; ++i) ctx->seg[i].buf = nullptr;
}
