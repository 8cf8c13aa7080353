#include "pcm/decode_plan.h"

#include <algorithm>
#include <cstdlib>

#include "common/alloc.h"
#include "common/limits.h"
#include "common/worker_group.h"

pthread_mutex_t *ext_mutex_mt = nullptr;
pthread_cond_t *ext_cond_mt = nullptr;

namespace {

constexpr int64_t kSingleThreadUnits = 50'000'000;  // streams of up to 5 s use one thread
constexpr int32_t kParallelSegments = 4;
constexpr int64_t kOverlapUnits = 20'000'000;  // decoded past a segment's end to find the splice

int32_t segments_for(int64_t units) {
    return units > kSingleThreadUnits ? kParallelSegments : 1;
}

// Returns the number of records in the segment table. A later plan may use fewer of them.
int32_t table_size(const TAVO_CTX *ctx) {
    return std::max(ctx->seg_count, segments_for(ctx->duration));
}

// Opens a source, reads the format and the duration of the stream from it, and closes it.
int32_t read_stream_format(TAVO_CTX *ctx, const mtsrc_param *open_param) {
    int32_t err = 0;
    mtsrc_ctx *probe = mtsrc_init(open_param, &err);
    if (probe == nullptr) return TAVO_ERR_HANDLE;
    mtsrc_format format = {};
    const int32_t result = mtsrc_getstream_format(probe, &format);
    mtsrc_deinit(probe);

    if (result != 0 || check_stream(format) != TAVO_OK) return TAVO_ERR_FORMAT;
    ctx->fmt = {format.sample_rate, format.channels, format.bits};
    ctx->duration = format.duration;
    return 0;
}

// Plans one segment: computes the size of its buffer, allocates the buffer and seeks the source to
// `start`.
int32_t plan_segment(TAVO_CTX *ctx, int32_t index, int64_t start, int64_t seg_len) {
    TAVO_DECSEG *seg = &ctx->seg[index];
    const int32_t count = ctx->seg_count;
    const bool last = index == count - 1;
    seg->index = index;
    seg->count = count;
    seg->start = start;
    if (!span_bytes(last ? seg_len : seg_len + kOverlapUnits, ctx->fmt.sample_rate, &seg->cap)) {
        return TAVO_ERR_MEMORY;
    }
    seg->buf = allocate_buffer(seg->cap);
    if (seg->buf == nullptr) return TAVO_ERR_MEMORY;

    seg->seek_pos = start;  // kept if the seek fails without reporting a position
    mtsrc_seekstream(seg->src, start, &seg->seek_pos);
    return 0;
}

// Allocates the zeroed PCM buffer for a stream of `units` (100 ns each).
int32_t allocate_pcm(TAVO_CTX *ctx, int64_t units) {
    int64_t bytes = 0;
    if (!span_bytes(units, ctx->fmt.sample_rate, &bytes)) return TAVO_ERR_MEMORY;
    ctx->pcm_bytes = bytes;
    if (bytes == 0) return TAVO_ERR_MEMORY;
    ctx->pcm = static_cast<int16_t *>(calloc(static_cast<size_t>(bytes), 1));
    if (ctx->pcm == nullptr) return TAVO_ERR_MEMORY;
    advise_huge_pages(ctx->pcm, bytes);
    return 0;
}

// Allocates and initialises seg_count segment records, which share one array of done flags.
int32_t allocate_table(TAVO_CTX *ctx, const mtsrc_param *open_param) {
    ctx->seg = zeroed_items<TAVO_DECSEG>(ctx->seg_count);
    if (ctx->seg == nullptr) return TAVO_ERR_MEMORY;
    auto *done = zeroed_items<int32_t>(ctx->seg_count);
    if (done == nullptr) return TAVO_ERR_MEMORY;

    for (int32_t i = 0; i < ctx->seg_count; ++i) {
        TAVO_DECSEG *seg = &ctx->seg[i];
        seg->done = done;
        seg->mutex = ext_mutex_mt;
        seg->cond = ext_cond_mt;
        seg->open_param = *open_param;
        seg->fmt = ctx->fmt;
        seg->duration = ctx->duration;
    }
    return 0;
}

// Builds the whole plan. After a failure the caller must call tavo_decode_deinit.
int32_t build_decoding(TAVO_CTX *ctx, const mtsrc_param *open_param) {
    int32_t err = worker_lock_create(&ext_mutex_mt, &ext_cond_mt);
    if (err == 0) err = read_stream_format(ctx, open_param);
    if (err != 0) return err;

    ctx->seg_count = segments_for(ctx->duration);
    err = allocate_table(ctx, open_param);
    if (err != 0) return err;

    const int64_t seg_len = ctx->duration / ctx->seg_count;
    for (int32_t i = 0; i < ctx->seg_count; ++i) {
        TAVO_DECSEG *seg = &ctx->seg[i];
        err = TAVO_ERR_HANDLE;
        seg->src = mtsrc_init(&seg->open_param, &err);
        if (seg->src == nullptr) return err;
        err = plan_segment(ctx, i, i * seg_len, seg_len);
        if (err != 0) return err;
    }
    return allocate_pcm(ctx, ctx->duration);
}

}  // namespace

int32_t check_stream(const mtsrc_format &format) {
    int64_t bytes = 0;
    if (format.duration <= kRefusedUnits) return TAVO_ERR_SHORT;
    if (format.sample_rate < kMinRate) return TAVO_ERR_LOW_RATE;
    return span_bytes(format.duration, format.sample_rate, &bytes) ? TAVO_OK : TAVO_ERR_FORMAT;
}

int32_t tavo_decode_init(TAVO_CTX *ctx, const TAVO_PARAM *param) {
    const mtsrc_param open_param = {param->path};
    ctx->seg = nullptr;
    ctx->pcm = nullptr;
    ctx->seg_count = 0;
    clear_incomplete();
    const int32_t err = build_decoding(ctx, &open_param);
    if (err != 0) tavo_decode_deinit(ctx);
    return err;
}

void tavo_decode_deinit(TAVO_CTX *ctx) {
    if (ctx->seg != nullptr) {
        free(ctx->seg[0].done);
        const int32_t records = table_size(ctx);
        for (int32_t i = 0; i < records; ++i) {
            if (ctx->seg[i].src != nullptr) mtsrc_deinit(ctx->seg[i].src);
            free(ctx->seg[i].buf);
        }
        free(ctx->seg);
        ctx->seg = nullptr;
    }
    free(ctx->pcm);
    ctx->pcm = nullptr;
    worker_lock_release(&ext_mutex_mt, &ext_cond_mt);
}

int32_t construct_decbuf(TAVO_CTX *ctx, int64_t start) {
    // The caller has freed these buffers. Clear the pointers before anything can fail so that the
    // buffers are not freed again.
    ctx->pcm = nullptr;
    if (ctx->seg == nullptr) return TAVO_ERR_MEMORY;
    for (int32_t i = 0; i < ctx->seg_count; ++i) ctx->seg[i].buf = nullptr;

    int64_t rest = 0;
    if (__builtin_sub_overflow(ctx->duration, start, &rest) || rest < 0) return TAVO_ERR_MEMORY;
    // If `start` is negative, the rest may need more segments than the table has records.
    ctx->seg_count = std::min(segments_for(rest), table_size(ctx));
    const int64_t seg_len = rest / ctx->seg_count;
    int32_t err = 0;
    for (int32_t i = 0; i < ctx->seg_count && err == 0; ++i) {
        err = plan_segment(ctx, i, start + i * seg_len, seg_len);
    }
    if (err == 0) err = allocate_pcm(ctx, rest);
    for (int32_t i = 0; i < ctx->seg_count && err != 0; ++i) {
        free(ctx->seg[i].buf);
        ctx->seg[i].buf = nullptr;
    }
    return err;
}
