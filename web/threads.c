// Replaces the pthread functions, because the page has no threads. pthread_create runs the job to
// completion before it returns. It fails if the job calls it, so the job does all the work itself.
#include <errno.h>
#include <pthread.h>
#include <setjmp.h>
#include <stdlib.h>

static jmp_buf thread_end;
static int thread_runs = 0;
static char handle;  // its address is the handle of every ended thread

int pthread_create(pthread_t *thread, const pthread_attr_t *attr, void *(*entry)(void *),
                   void *arg) {
    (void)attr;
    if (thread_runs) return EAGAIN;
    thread_runs = 1;
    *thread = (pthread_t)&handle;
    if (setjmp(thread_end) == 0) entry(arg);
    thread_runs = 0;
    return 0;
}

_Noreturn void pthread_exit(void *result) {
    (void)result;
    if (!thread_runs) abort();
    longjmp(thread_end, 1);
}

int pthread_join(pthread_t thread, void **result) {
    if (result != NULL) *result = NULL;
    return thread == (pthread_t)&handle ? 0 : ESRCH;
}
