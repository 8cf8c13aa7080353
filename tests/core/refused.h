// Thread starts and lock initialisations that fail. Bit i of a mask stands for the i-th call after
// the mask was set.
#ifndef TAVO_TESTS_CORE_REFUSED_H
#define TAVO_TESTS_CORE_REFUSED_H

#include <pthread.h>

#include <atomic>
#include <cerrno>
#include <cstdint>

namespace refused {

using calls = std::atomic<uint32_t>;
inline calls threads{0}, mutexes{0}, conditions{0};

// Whether the call that is being made fails.
inline bool next(calls *mask) {
    const uint32_t now = *mask;
    *mask = now >> 1;
    return (now & 1u) != 0;
}

}  // namespace refused

// The program is linked with --wrap for these three.
extern "C" {
int __real_pthread_create(pthread_t *, const pthread_attr_t *, void *(*)(void *), void *);
int __real_pthread_mutex_init(pthread_mutex_t *, const pthread_mutexattr_t *);
int __real_pthread_cond_init(pthread_cond_t *, const pthread_condattr_t *);

[[gnu::used]] inline int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attr,
                                               void *(*entry)(void *), void *arg) {
    if (refused::next(&refused::threads)) return EAGAIN;
    return __real_pthread_create(thread, attr, entry, arg);
}
[[gnu::used]] inline int __wrap_pthread_mutex_init(pthread_mutex_t *mutex,
                                                   const pthread_mutexattr_t *attr) {
    return refused::next(&refused::mutexes) ? ENOMEM : __real_pthread_mutex_init(mutex, attr);
}
[[gnu::used]] inline int __wrap_pthread_cond_init(pthread_cond_t *cond,
                                                  const pthread_condattr_t *attr) {
    return refused::next(&refused::conditions) ? ENOMEM : __real_pthread_cond_init(cond, attr);
}
}

#endif
