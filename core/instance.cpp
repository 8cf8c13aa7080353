#include <android/log.h>

#include <cstdlib>
#include <cstring>

#include "beat/beats.h"
#include "common/alloc.h"
#include "core/lifecycle.h"
#include "highlight/position.h"
#include "pcm/decode.h"

namespace {

constexpr char kMark[4] = {'Z', 'E', 'K', 'A'};

bool has_beats(int32_t mode) {
    return mode == TAVO_MODE_BEATS || mode == TAVO_MODE_BOTH;
}
bool has_highlight(int32_t mode) {
    return mode == TAVO_MODE_HIGHLIGHT || mode == TAVO_MODE_BOTH;
}

// The instance with its result record and the sub-contexts of its mode, or null.
TAVO_CTX *new_instance(int32_t mode) {
    TAVO_CTX *ctx = zeroed_items<TAVO_CTX>(1);
    if (ctx == nullptr) return nullptr;
    ctx->mode = mode;
    ctx->info = zeroed_items<TAVO_INFO>(1);
    bool complete = ctx->info != nullptr;
    if (complete && has_beats(mode)) {
        ctx->onset = zeroed_items<TAVO_ONSET_CTX>(1);
        complete = ctx->onset != nullptr;
        if (complete) {
            ctx->onset->frame_size = kFrameSize;
            ctx->onset->hop_size = kHopSize;
            ctx->ana_rate = kAnalysisRate;
        }
    }
    if (complete && has_highlight(mode)) {
        ctx->hl = zeroed_items<TAVO_HL_CTX>(1);
        complete = ctx->hl != nullptr;
    }
    if (complete) return ctx;
    clearTavoCtx(ctx);
    return nullptr;
}

bool create_locks() {
    if (pthread_mutex_init(&tavo_mutex, nullptr) != 0) return false;
    if (pthread_cond_init(&tavo_cond, nullptr) == 0) return true;
    pthread_mutex_destroy(&tavo_mutex);
    return false;
}

void destroy_locks() {
    pthread_cond_destroy(&tavo_cond);
    pthread_mutex_destroy(&tavo_mutex);
}

// The steps of tavo_init between the locks: the instance, or null with the code in *err.
TAVO_CTX *open_instance(const TAVO_PARAM *param, int32_t *err) {
    *err = TAVO_ERR_MEMORY;
    TAVO_CTX *ctx = new_instance(param->mode);
    if (ctx == nullptr) return nullptr;
    if (tavo_decode_init(ctx, param) != 0) {
        *err = TAVO_ERR_HANDLE;  // one code for every reason: the media source knows the details
        clearTavoCtx(ctx);
        return nullptr;
    }
    memcpy(ctx->magic, kMark, sizeof(kMark));
    store_flag(&ctx->state, kStateReady);
    *err = TAVO_OK;
    return ctx;
}

}  // namespace

bool is_instance(const TAVO_CTX *ctx) {
    return ctx != nullptr && memcmp(ctx->magic, kMark, sizeof(kMark)) == 0;
}

extern "C" TAVO_CTX *tavo_init(const TAVO_PARAM *param, int32_t *err) {
    int32_t unread = 0;
    if (err == nullptr) err = &unread;
    *err = TAVO_ERR_HANDLE;
    if (param == nullptr) return nullptr;
    if (!create_locks()) return nullptr;
    TAVO_CTX *ctx = open_instance(param, err);
    if (ctx == nullptr) {
        destroy_locks();
        return nullptr;
    }
    __android_log_print(ANDROID_LOG_DEBUG, "tavo", "tavo_init64() complete (%d) \n", 0);
    return ctx;
}

extern "C" void tavo_setcallback(TAVO_CTX *ctx, TAVO_CALLBACK callback) {
    ctx->callback = callback;
}

extern "C" void clearTavoCtx(TAVO_CTX *ctx) {
    tavo_decode_deinit(ctx);
    if (has_beats(ctx->mode)) {
        free(ctx->ana);
        clearOnsetCtx(ctx->onset);
    }
    if (has_highlight(ctx->mode)) clearHighlgihtCtx(ctx->hl);
    free(ctx->info);
    free(ctx);
}
