// Stage 6: computes the adaptive threshold, a sliding 97th percentile of the onset envelope. The
// window spans about four beats. Follows beat/tempo.h and precedes beat/candidates.h.
#pragma once

#include "beat/beat_ctx.h"

// One of the four threads that compute the threshold. It writes only thr[first .. last].
struct TAVO_THRES_WORKER {
    int32_t id;  // 0 to 3, also the worker's index in done_flags
    pthread_t thread;
    double *thr;              // [F - 1] shared
    const double *onset_env;  // [F] read-only
    int64_t first;            // first index
    int64_t last;             // last index, inclusive
    int32_t window;           // length of the window in analysis frames
    int32_t percentile;       // 97
    double running_max;       // largest threshold written so far, initially 0
    int32_t *done_flags;      // [thread_count] shared
    int32_t thread_count;     // 4
    pthread_mutex_t *mutex;   // feat_mutex_mt
    pthread_cond_t *cond;     // feat_cond_mt
};
static_assert(sizeof(void *) != 8 || offsetof(TAVO_THRES_WORKER, running_max) == 56);
static_assert(sizeof(void *) != 8 || offsetof(TAVO_THRES_WORKER, cond) == 88);

extern "C" {

// The thread entry of a worker and its completion handler. Both receive the TAVO_THRES_WORKER.
void *_tavo_proc_beatcandi(void *record);
void _thd_thres_cleanup(void *record);
}

// Fills thr[F - 1] on four threads. `thr` must be zeroed and have at least one entry; `window` is
// in analysis frames and `hop` in seconds. Returns 0, or TAVO_ERR_MEMORY if memory runs out.
int32_t build_threshold(const TAVO_BEAT_CTX *beat, int32_t window, float hop, double *thr);
