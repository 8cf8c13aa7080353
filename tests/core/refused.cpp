#include "tests/core/refused.h"

#include <pthread.h>

#include <cerrno>

extern "C" {
int __real_pthread_create(pthread_t *, const pthread_attr_t *, void *(*)(void *), void *);
int __real_pthread_mutex_init(pthread_mutex_t *, const pthread_mutexattr_t *);
int __real_pthread_cond_init(pthread_cond_t *, const pthread_condattr_t *);

int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attr, void *(*entry)(void *),
                          void *arg) {
    if (refused::next(&refused::threads)) return EAGAIN;
    return __real_pthread_create(thread, attr, entry, arg);
}
int __wrap_pthread_mutex_init(pthread_mutex_t *mutex, const pthread_mutexattr_t *attr) {
    return refused::next(&refused::mutexes) ? ENOMEM : __real_pthread_mutex_init(mutex, attr);
}
int __wrap_pthread_cond_init(pthread_cond_t *cond, const pthread_condattr_t *attr) {
    return refused::next(&refused::conditions) ? ENOMEM : __real_pthread_cond_init(cond, attr);
}
}
