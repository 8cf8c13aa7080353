// The jobs of the three modes. A job runs the stages of its mode in order, on a thread that
// tavo_analyze starts.
//
// Input: a TAVO_CTX with the arguments of tavo_analyze. Output: a TAVO_INFO, passed to the callback
// exactly once, after the final state is set. Follows core/lifecycle.h. The host provides
// the callback; see for example jni/tavo_jni.h.
#pragma once

#include "common/tavo_ctx.h"

extern "C" {

// Thread entries. They receive the TAVO_CTX and end with pthread_exit.
void *analyzeHighlightOnly(void *arg);  // mode 0
void *analyzeOnsetOnly(void *arg);      // mode 1
void *analyzeOnsetFromeHi(void *arg);   // mode 2
void *analyzeHighlight(void *arg);      // same as analyzeHighlightOnly, for direct calls

// Runs only the beat analysis of an instance whose `ana` is filled, and reports the result. In mode
// 2, shifts the beats by the highlight start. Always returns TAVO_OK, after the callback. An
// instance without an onset context reports a failure.
int32_t analyzeOnsetenv(TAVO_CTX *ctx);
}
