// The life of an instance between creation and release: its two locks, the start of its job, the
// stop.
//
// In: the calls of include/tavo.h. Out: a job of core/jobs.h on its own thread. Before:
// core/instance.h, core/jobs.h. After: the host.
#ifndef TAVO_CORE_LIFECYCLE_H
#define TAVO_CORE_LIFECYCLE_H

#include "common/tavo_ctx.h"

extern "C" {

// tavo_mutex guards writes to quit and the test of the state in tavo_deinit. tavo_cond signals the
// end of the job. Both exist from tavo_init to tavo_deinit.
extern pthread_mutex_t tavo_mutex;
extern pthread_cond_t tavo_cond;

// Sets the stop flag and waits until the job has ended; its callback may still be running. The
// caller must not hold tavo_mutex. Returns TAVO_OK, at once if no job was started; TAVO_ERR_HANDLE
// if ctx is not an instance.
int32_t _tavo_quit(TAVO_CTX *ctx);

// Thread entry of the watcher that _tavo_quit starts. It polls the state and then signals
// tavo_cond.
void *_thd_quit_wait(void *arg);
}

#endif
