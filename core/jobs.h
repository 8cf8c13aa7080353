// Stages 2 to 8 in order: the job of each mode, the body of the thread that tavo_analyze starts.
//
// In: TAVO_CTX, created and with its arguments stored. Out: TAVO_INFO, passed to the callback
// exactly once, after the final state is set. A job decodes the file and runs the analyses of its
// mode. Before: core/lifecycle.h. After: the host's callback, jni/tavo_jni.h.
#ifndef TAVO_CORE_JOBS_H
#define TAVO_CORE_JOBS_H

#include "common/tavo_ctx.h"

extern "C" {

// Thread entries. The argument is the TAVO_CTX. They end their thread by pthread_exit.
void *analyzeHighlightOnly(void *arg);  // mode 0
void *analyzeOnsetOnly(void *arg);      // mode 1
void *analyzeOnsetFromeHi(void *arg);   // mode 2
void *analyzeHighlight(void *arg);      // as analyzeHighlightOnly, for direct use

// Only the beat analysis and its report, on an instance whose ana is filled. In mode 2 the beats
// are shifted by the highlight start. Returns TAVO_OK to its caller, after the callback. An
// instance without an onset context reports a failure.
int32_t analyzeOnsetenv(TAVO_CTX *ctx);
}

#endif
