#include "core/lifecycle.h"

#include <sched.h>

#include "core/jobs.h"

extern "C" {
pthread_mutex_t tavo_mutex;
pthread_cond_t tavo_cond;
}

namespace {

bool job_ended(const TAVO_CTX *ctx) {
    const int32_t state = load_flag(&ctx->state);
    return state == kStateFinished || state == kStateFailed;
}

// The poll does not sleep, so that a stop costs no more than the rest of the job; it yields, so
// that the job gets the processor where there is only one.
void poll_until_ended(const TAVO_CTX *ctx) {
    while (!job_ended(ctx)) sched_yield();
}

// True inside the callback of the job that tavo_analyze started: tavo_deinit would join itself.
bool runs_job_of(const TAVO_CTX *ctx) {
    return pthread_equal(ctx->worker, pthread_self()) != 0;
}

// A job may have been run without tavo_analyze, on a thread that is not ours to join.
void join_worker(TAVO_CTX *ctx) {
    if (pthread_equal(ctx->worker, pthread_t{}) == 0) pthread_join(ctx->worker, nullptr);
}

// Stores what the mode needs of the arguments. Returns the job's entry, null for an unknown mode.
void *(*prepare_job(TAVO_CTX *ctx, int32_t hl_param, int32_t max_beats,
                    int32_t beat_param2))(void *) {
    const bool highlight = ctx->mode == TAVO_MODE_HIGHLIGHT || ctx->mode == TAVO_MODE_BOTH;
    const bool beats = ctx->mode == TAVO_MODE_BEATS || ctx->mode == TAVO_MODE_BOTH;
    if (highlight) ctx->hl->hl_param = hl_param;
    if (beats) {
        ctx->onset->max_beats = max_beats;
        ctx->onset->beat_param2 = beat_param2;
    }
    if (highlight && beats) return analyzeOnsetFromeHi;
    if (beats) return analyzeOnsetOnly;
    return highlight ? analyzeHighlightOnly : nullptr;
}

}  // namespace

extern "C" int32_t tavo_analyze(TAVO_CTX *ctx, int32_t hl_param, int32_t max_beats,
                                int32_t beat_param2) {
    if (!is_instance(ctx)) return TAVO_ERR_HANDLE;
    if (load_flag(&ctx->state) != kStateReady) return TAVO_ERR_NOT_READY;
    void *(*entry)(void *) = prepare_job(ctx, hl_param, max_beats, beat_param2);
    if (entry == nullptr) return TAVO_ERR_HANDLE;

    // Before the thread exists: a quick job's final state must not be overwritten.
    store_flag(&ctx->state, kStateRunning);
    if (pthread_create(&ctx->worker, nullptr, entry, ctx) != 0) {
        ctx->worker = pthread_t{};
        store_flag(&ctx->state, kStateReady);
        return TAVO_ERR_MEMORY;
    }
    return TAVO_OK;
}

extern "C" int32_t tavo_deinit(TAVO_CTX *ctx) {
    if (!is_instance(ctx) || runs_job_of(ctx)) return TAVO_ERR_HANDLE;

    pthread_mutex_lock(&tavo_mutex);
    if (load_flag(&ctx->state) == kStateRunning) {
        pthread_mutex_unlock(&tavo_mutex);
        _tavo_quit(ctx);
        pthread_mutex_lock(&tavo_mutex);
        join_worker(ctx);
    } else if (job_ended(ctx)) {
        join_worker(ctx);  // at most its callback still runs
    }
    clearTavoCtx(ctx);
    pthread_mutex_unlock(&tavo_mutex);
    pthread_cond_destroy(&tavo_cond);
    pthread_mutex_destroy(&tavo_mutex);
    return TAVO_OK;
}

extern "C" int32_t _tavo_quit(TAVO_CTX *ctx) {
    if (!is_instance(ctx)) return TAVO_ERR_HANDLE;
    if (load_flag(&ctx->state) == kStateReady) return TAVO_OK;

    pthread_mutex_lock(&tavo_mutex);
    store_flag(&ctx->quit, 1);
    pthread_mutex_unlock(&tavo_mutex);

    pthread_t watcher{};
    if (pthread_create(&watcher, nullptr, _thd_quit_wait, ctx) != 0) {
        poll_until_ended(ctx);
        return TAVO_OK;
    }
    pthread_mutex_lock(&tavo_mutex);
    while (!job_ended(ctx)) pthread_cond_wait(&tavo_cond, &tavo_mutex);
    pthread_mutex_unlock(&tavo_mutex);
    pthread_join(watcher, nullptr);
    return TAVO_OK;
}

extern "C" void *_thd_quit_wait(void *arg) {
    const TAVO_CTX *ctx = static_cast<const TAVO_CTX *>(arg);
    poll_until_ended(ctx);
    pthread_mutex_lock(&tavo_mutex);
    pthread_cond_signal(&tavo_cond);
    pthread_mutex_unlock(&tavo_mutex);
    pthread_exit(nullptr);
}
