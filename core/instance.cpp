#include "core/instance.h"

#include <cstdlib>
#include <cstring>

#include "beat/beats.h"
#include "common/alloc.h"
#include "highlight/position.h"
#include "pcm/decode.h"

namespace {

constexpr char kMark[4] = {'Z', 'E', 'K', 'A'};

// The result record of an instance, followed by the listener and its argument.
struct result_record {
    TAVO_INFO info;  // must be first: TAVO_CTX.info points to it
    TAVO_LISTENER listener;
    void *user;  // the listener's argument
};

// The callback of an instance that has a listener.
void call_listener(TAVO_INFO *info) {
    const auto *record = reinterpret_cast<const result_record *>(info);
    record->listener(info, record->user);
}

// Creates an instance with its result record and the sub-contexts of its mode. Returns null if
// memory runs out.
TAVO_CTX *new_instance(int32_t mode) {
    auto *ctx = zeroed_items<TAVO_CTX>(1);
    if (ctx == nullptr) return nullptr;
    ctx->mode = mode;
    ctx->info = reinterpret_cast<TAVO_INFO *>(zeroed_items<result_record>(1));
    bool complete = ctx->info != nullptr;
    if (complete && finds_beats(mode)) {
        ctx->onset = zeroed_items<TAVO_ONSET_CTX>(1);
        complete = ctx->onset != nullptr;
        if (complete) {
            ctx->onset->frame_size = kFrameSize;
            ctx->onset->hop_size = kHopSize;
            ctx->ana_rate = kAnalysisRate;
        }
    }
    if (complete && finds_highlight(mode)) {
        ctx->hl = zeroed_items<TAVO_HL_CTX>(1);
        complete = ctx->hl != nullptr;
    }
    if (complete) return ctx;
    clearTavoCtx(ctx);
    return nullptr;
}

}  // namespace

TAVO_CTX *open_instance(const TAVO_PARAM *param, int32_t *err) {
    *err = TAVO_ERR_MEMORY;
    TAVO_CTX *ctx = new_instance(param->mode);
    if (ctx == nullptr) return nullptr;
    if (tavo_decode_init(ctx, param) != 0) {
        *err = TAVO_ERR_HANDLE;  // whatever the cause; tavo_probe reports it
        clearTavoCtx(ctx);
        return nullptr;
    }
    memcpy(ctx->magic, kMark, sizeof kMark);
    store_flag(&ctx->state, kStateReady);
    *err = TAVO_OK;
    return ctx;
}

bool is_instance(const TAVO_CTX *ctx) {
    return ctx != nullptr && memcmp(ctx->magic, kMark, sizeof kMark) == 0;
}

bool has_ended(const TAVO_CTX *ctx) {
    const int32_t state = load_flag(&ctx->state);
    return state == kStateFinished || state == kStateFailed;
}

extern "C" void clearTavoCtx(TAVO_CTX *ctx) {
    tavo_decode_deinit(ctx);
    if (finds_beats(ctx->mode)) {
        free(ctx->ana);
        clearOnsetCtx(ctx->onset);
    }
    if (finds_highlight(ctx->mode)) clearHighlgihtCtx(ctx->hl);
    free(ctx->info);
    free(ctx);
}

extern "C" void tavo_setcallback(TAVO_CTX *ctx, TAVO_CALLBACK callback) {
    ctx->callback = callback;
}

extern "C" int32_t tavo_set_listener(TAVO_CTX *ctx, TAVO_LISTENER listener, void *user) {
    if (!is_instance(ctx)) return TAVO_ERR_HANDLE;
    auto *record = reinterpret_cast<result_record *>(ctx->info);
    record->listener = listener;
    record->user = user;
    ctx->callback = listener == nullptr ? nullptr : call_listener;
    return TAVO_OK;
}

extern "C" int32_t tavo_get_stream(const TAVO_CTX *ctx, int32_t *rate, int32_t *channels,
                                   int64_t *duration_ms) {
    if (!is_instance(ctx)) return TAVO_ERR_HANDLE;
    if (rate != nullptr) *rate = ctx->fmt.sample_rate;
    if (channels != nullptr) *channels = ctx->fmt.channels;
    if (duration_ms != nullptr) *duration_ms = ctx->duration / kUnitsPerMs;
    return TAVO_OK;
}

extern "C" int32_t tavo_get_tempo(const TAVO_CTX *ctx) {
    const bool known =
        is_instance(ctx) && ctx->onset != nullptr && load_flag(&ctx->state) == kStateFinished;
    return known ? ctx->onset->bpm : 0;
}

extern "C" int32_t tavo_has_audio(const TAVO_CTX *ctx) {
    return is_instance(ctx) && has_ended(ctx) && ctx->pcm_bytes > 0 ? 1 : 0;
}

extern "C" int32_t tavo_is_complete(const TAVO_CTX *ctx) {
    return is_instance(ctx) && has_ended(ctx) && !is_incomplete() ? 1 : 0;
}

extern "C" const float *tavo_get_loudness(const TAVO_CTX *ctx, int32_t *count) {
    const bool known = is_instance(ctx) && ctx->hl != nullptr && has_ended(ctx);
    *count = known && ctx->hl->power != nullptr ? ctx->hl->power_count : 0;
    return *count > 0 ? ctx->hl->power : nullptr;
}
