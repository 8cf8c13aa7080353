// Stage 6: the adaptive threshold, a sliding 97th percentile of the onset envelope.
// Before: beat/tempo.h (the window is about four beats). After: beat/candidates.h.
#ifndef TAVO_BEAT_THRESHOLD_H
#define TAVO_BEAT_THRESHOLD_H

#include "beat/beat_ctx.h"

extern "C" {

// Thread entry of one worker, and its completion handler. The argument is the TAVO_THRES_WORKER.
void *_tavo_proc_beatcandi(void *worker);
void _thd_thres_cleanup(void *worker);
}

// Fills thr[F - 1] (zero before) for a window of W frames, on four threads. Returns 0; -2 out of
// memory.
int32_t build_threshold(const TAVO_BEAT_CTX *beat, int32_t window, double *thr);

#endif
