// The bodies of the worker thread that tavo_analyze starts, one per mode.
//
// Each decodes the file, runs its analyses, fills the instance's TAVO_INFO, sets the final state
// and calls the callback exactly once.
#ifndef TAVO_CORE_JOBS_H
#define TAVO_CORE_JOBS_H

#include "common/tavo_ctx.h"

extern "C" {

// Thread entries: the argument is the TAVO_CTX; none returns, each ends its thread by pthread_exit.
void *analyzeHighlightOnly(void *ctx);  // mode 0
void *analyzeOnsetOnly(void *ctx);      // mode 1
void *analyzeOnsetFromeHi(void *ctx);   // mode 2
void *analyzeHighlight(void *ctx);      // the same as analyzeHighlightOnly, for direct use

// The beat analysis and its report alone, on an instance whose ana is filled; returns 0 to its
// caller after the callback. In mode 2 the beats are shifted by the highlight start.
int32_t analyzeOnsetenv(TAVO_CTX *ctx);
}

#endif
