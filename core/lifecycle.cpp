#include "core/lifecycle.h"

#include <android/log.h>
#include <sched.h>

#include "core/instance.h"
#include "core/jobs.h"

extern "C" {
pthread_mutex_t tavo_mutex;
pthread_cond_t tavo_cond;
}

namespace {

using job_entry = void *(*)(void *ctx);

// The job of each mode.
constexpr job_entry kJobs[] = {analyzeHighlightOnly, analyzeOnsetOnly, analyzeOnsetFromeHi};
static_assert(TAVO_MODE_HIGHLIGHT == 0 && TAVO_MODE_BEATS == 1 && TAVO_MODE_BOTH == 2);

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

// Polls without sleeping so that stopping takes no longer than the rest of the job. Yields so
// that the job can run on a single processor.
void poll_until_ended(const TAVO_CTX *ctx) {
    while (!has_ended(ctx)) sched_yield();
}

// True inside the callback of a job that tavo_analyze started. There, tavo_deinit would have to
// join the thread that is calling it.
bool runs_job_of(const TAVO_CTX *ctx) {
    return pthread_equal(ctx->worker, pthread_self()) != 0;
}

// A job that the host runs on a thread of its own, without tavo_analyze, has no worker to join.
void join_worker(const TAVO_CTX *ctx) {
    if (pthread_equal(ctx->worker, pthread_t{}) == 0) pthread_join(ctx->worker, nullptr);
}

}  // namespace

extern "C" TAVO_CTX *tavo_init(const TAVO_PARAM *param, int32_t *err) {
    int32_t ignored = 0;
    if (err == nullptr) err = &ignored;
    *err = TAVO_ERR_HANDLE;
    if (param == nullptr || !create_locks()) return nullptr;
    TAVO_CTX *ctx = open_instance(param, err);
    if (ctx == nullptr) {
        destroy_locks();
        return nullptr;
    }
    __android_log_print(ANDROID_LOG_DEBUG, "tavo", "tavo_init64() complete (%d) \n", 0);
    return ctx;
}

extern "C" int32_t tavo_analyze(TAVO_CTX *ctx, int32_t hl_param, int32_t max_beats,
                                int32_t beat_param2) {
    if (!is_instance(ctx)) return TAVO_ERR_HANDLE;
    if (load_flag(&ctx->state) != kStateReady) return TAVO_ERR_NOT_READY;
    if (ctx->mode < TAVO_MODE_HIGHLIGHT || ctx->mode > TAVO_MODE_BOTH) return TAVO_ERR_HANDLE;
    if (finds_highlight(ctx->mode)) ctx->hl->hl_param = hl_param;
    if (finds_beats(ctx->mode)) {
        ctx->onset->max_beats = max_beats;
        ctx->onset->beat_param2 = beat_param2;
    }

    // Set the state before the thread exists so that a quick job's final state is not overwritten.
    store_flag(&ctx->state, kStateRunning);
    if (pthread_create(&ctx->worker, nullptr, kJobs[ctx->mode], ctx) != 0) {
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
    } else if (has_ended(ctx)) {
        join_worker(ctx);  // only its callback may still be running
    }
    clearTavoCtx(ctx);
    pthread_mutex_unlock(&tavo_mutex);
    destroy_locks();
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
    while (!has_ended(ctx)) pthread_cond_wait(&tavo_cond, &tavo_mutex);
    pthread_mutex_unlock(&tavo_mutex);
    pthread_join(watcher, nullptr);
    return TAVO_OK;
}

extern "C" void *_thd_quit_wait(void *arg) {
    const auto *ctx = static_cast<const TAVO_CTX *>(arg);
    poll_until_ended(ctx);
    pthread_mutex_lock(&tavo_mutex);
    pthread_cond_signal(&tavo_cond);
    pthread_mutex_unlock(&tavo_mutex);
    pthread_exit(nullptr);
}
