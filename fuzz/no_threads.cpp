// Takes the place of pthread_create: no thread can be started.
#include <pthread.h>

#include <cerrno>

extern "C" int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attr,
                                     void *(*start)(void *), void *argument);

extern "C" int __wrap_pthread_create(pthread_t * /*thread*/, const pthread_attr_t * /*attr*/,
                                     void *(* /*start*/)(void *), void * /*argument*/) {
    return EAGAIN;
}
