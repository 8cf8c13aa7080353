// The instance's life between creation and release: its two locks, the start of its job, the stop.
//
// In: the calls of include/tavo.h. Out: a job of core/jobs.h on a thread of its own.
// Before: core/instance.h, core/jobs.h. After: the host.
#ifndef TAVO_CORE_LIFECYCLE_H
#define TAVO_CORE_LIFECYCLE_H

#include "common/tavo_ctx.h"

extern "C" {

// tavo_mutex guards the writing of quit and the decision of tavo_deinit; tavo_cond carries the one
// signal that the job has ended. Both exist from tavo_init to tavo_deinit.
extern pthread_mutex_t tavo_mutex;
extern pthread_cond_t tavo_cond;

// Raises the stop flag and waits until the job has ended; its callback may still run. The caller
// does not hold tavo_mutex. Returns TAVO_OK, at once if no job was started; TAVO_ERR_HANDLE.
int32_t _tavo_quit(TAVO_CTX *ctx);

// Thread entry of the watcher that _tavo_quit starts: polls the state, then signals tavo_cond.
void *_thd_quit_wait(void *arg);
}

#endif
