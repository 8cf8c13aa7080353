// Starts and stops the job of an instance. Declares the lock and the condition that exist from the
// creation of an instance to its release.
//
// Input: the host's calls (include/tavo.h). Output: a job (core/jobs.h) on its own thread. Follows
// core/instance.h and precedes core/jobs.h.
#pragma once

#include "common/tavo_ctx.h"

extern "C" {

// tavo_mutex guards writes to quit and the test of the state in tavo_deinit. tavo_cond signals the
// end of the job. Both exist from tavo_init to tavo_deinit.
extern pthread_mutex_t tavo_mutex;
extern pthread_cond_t tavo_cond;

// Sets the stop flag and waits until the job has ended; its callback may still be running. The
// caller must not hold tavo_mutex. Does not wait if no job was started. Returns TAVO_OK, or
// TAVO_ERR_HANDLE if `ctx` is not an instance.
int32_t _tavo_quit(TAVO_CTX *ctx);

// The thread entry of the watcher that _tavo_quit starts. It polls the state until the job has
// ended and then signals tavo_cond.
void *_thd_quit_wait(void *arg);
}
