// Steps of the instance's life that the public interface is made of, and its two locks.
#ifndef TAVO_CORE_LIFECYCLE_H
#define TAVO_CORE_LIFECYCLE_H

#include "common/tavo_ctx.h"

extern "C" {

// Guards the writing of quit and the decision of tavo_deinit; tavo_cond carries the one signal that
// the job has ended. Both live from tavo_init to tavo_deinit.
extern pthread_mutex_t tavo_mutex;
extern pthread_cond_t tavo_cond;

// Raises the stop flag and waits until the job has ended (its callback may still run).
// Returns 0, at once when no job was started; -4 bad handle. tavo_mutex must not be held.
int32_t _tavo_quit(TAVO_CTX *ctx);

// Thread entry of the watcher that _tavo_quit starts: polls the state, signals tavo_cond.
void *_thd_quit_wait(void *ctx);

// Releases the instance and everything that it owns, also one that is only partly made. No checks.
void clearTavoCtx(TAVO_CTX *ctx);
}

// True for a handle that is not null and carries the mark.
bool is_instance(const TAVO_CTX *ctx);

#endif
