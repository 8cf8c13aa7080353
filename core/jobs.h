// The job of each mode: it runs stages 2 to 8 in order on a thread that tavo_analyze starts.
//
// Input: TAVO_CTX with its arguments. Output: TAVO_INFO, passed to the callback exactly once, after
// the final state is set. Follows core/lifecycle.h; precedes the host's callback, jni/tavo_jni.h.
#ifndef TAVO_CORE_JOBS_H
#define TAVO_CORE_JOBS_H

#include "common/tavo_ctx.h"

extern "C" {

// Thread entries. The argument is the TAVO_CTX. They end with pthread_exit.
void *analyzeHighlightOnly(void *arg);  // mode 0
void *analyzeOnsetOnly(void *arg);      // mode 1
void *analyzeOnsetFromeHi(void *arg);   // mode 2
void *analyzeHighlight(void *arg);      // same as analyzeHighlightOnly, for direct calls

// Runs only the beat analysis and its report, for an instance whose `ana` is filled. In mode 2 it
// shifts the beats by the highlight start. Always returns TAVO_OK, after the callback. An instance
// without an onset context reports a failure.
int32_t analyzeOnsetenv(TAVO_CTX *ctx);
}

#endif
