// Creates, checks and releases instances.
//
// Input: a TAVO_PARAM. Output: a TAVO_CTX with its sub-contexts and a decoding plan. Follows
// pcm/decode.h and precedes core/lifecycle.h.
#pragma once

#include "common/tavo_ctx.h"

extern "C" {

// Releases the instance, which may be only partly built, and everything that it owns. The handle is
// not checked.
void clearTavoCtx(TAVO_CTX *ctx);
}

// Creates an instance in the ready state. The locks of core/lifecycle.h must exist. Returns the
// instance, which the caller owns, and sets *err to TAVO_OK. On failure, returns null, releases
// everything and sets *err to TAVO_ERR_MEMORY or, if planning fails, to TAVO_ERR_HANDLE.
TAVO_CTX *open_instance(const TAVO_PARAM *param, int32_t *err);

// True if the handle is not null and has the mark of an instance.
bool is_instance(const TAVO_CTX *ctx);

// True if the job has set its final state.
bool has_ended(const TAVO_CTX *ctx);

// True if the mode includes the beats or the highlight, respectively. Both return false for values
// outside 0 to 2.
inline bool finds_beats(int32_t mode) {
    return mode == TAVO_MODE_BEATS || mode == TAVO_MODE_BOTH;
}
inline bool finds_highlight(int32_t mode) {
    return mode == TAVO_MODE_HIGHLIGHT || mode == TAVO_MODE_BOTH;
}
