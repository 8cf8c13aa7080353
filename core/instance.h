// The instance: its creation, its check and its release.
//
// In: TAVO_PARAM. Out: TAVO_CTX with its sub-contexts and a planned decoding.
// Before: pcm/decode.h. After: core/lifecycle.h.
#ifndef TAVO_CORE_INSTANCE_H
#define TAVO_CORE_INSTANCE_H

#include "common/tavo_ctx.h"

extern "C" {

// Releases the instance and everything that it owns. The instance may be half built. No checks.
void clearTavoCtx(TAVO_CTX *ctx);
}

// Makes an instance in the ready state. The locks of core/lifecycle.h exist already. Returns the
// instance, owned by the caller, with *err TAVO_OK; or null with *err TAVO_ERR_MEMORY or, when the
// decoding cannot be prepared, TAVO_ERR_HANDLE, and everything made here is released.
TAVO_CTX *open_instance(const TAVO_PARAM *param, int32_t *err);

// True for a handle that is not null and carries the mark.
bool is_instance(const TAVO_CTX *ctx);

// True once the job has set its final state.
bool has_ended(const TAVO_CTX *ctx);

// True if a mode finds beats, or a highlight. Both are false for a mode outside 0 to 2.
inline bool finds_beats(int32_t mode) {
    return mode == TAVO_MODE_BEATS || mode == TAVO_MODE_BOTH;
}
inline bool finds_highlight(int32_t mode) {
    return mode == TAVO_MODE_HIGHLIGHT || mode == TAVO_MODE_BOTH;
}

#endif
