#include "tests/support/fault_layer.h"

#include <pthread.h>
#include <sys/types.h>
#include <unistd.h>

#include <cstdio>

namespace {

fault::plan current;

bool must_fail(uint32_t call) {
    if ((current.calls & call) == 0) return false;
    if (current.on_call != nullptr) current.on_call();
    const int64_t index = fault::counted_calls++;
    if (index < current.index || (index > current.index && !current.forever)) return false;
    ++fault::failed_calls;
    errno = current.error;
    return true;
}

}  // namespace

void fault::arm(const plan &next) {
    counted_calls = failed_calls = 0;
    current = next;
}

#define WRAP(call, type, name, parameters, arguments, failure)             \
    extern "C" type __real_##name parameters;                              \
    extern "C" type __wrap_##name parameters;                              \
    extern "C" type __wrap_##name parameters {                             \
        return must_fail(fault::call) ? failure : __real_##name arguments; \
    }

WRAP(kMalloc, void *, malloc, (size_t size), (size), nullptr)
WRAP(kCalloc, void *, calloc, (size_t items, size_t size), (items, size), nullptr)
WRAP(kRealloc, void *, realloc, (void *block, size_t size), (block, size), nullptr)
WRAP(kMalloc, int, posix_memalign, (void **block, size_t alignment, size_t size),
     (block, alignment, size), ENOMEM)
WRAP(kThread, int, pthread_create,
     (pthread_t * id, const pthread_attr_t *attributes, void *(*entry)(void *), void *record),
     (id, attributes, entry, record), EAGAIN)
WRAP(kMutex, int, pthread_mutex_init,
     (pthread_mutex_t * lock, const pthread_mutexattr_t *attributes), (lock, attributes), ENOMEM)
WRAP(kCondition, int, pthread_cond_init,
     (pthread_cond_t * cond, const pthread_condattr_t *attributes), (cond, attributes), ENOMEM)
WRAP(kOpen, int, open, (const char *path, int flags, mode_t mode), (path, flags, mode), -1)
WRAP(kDup, int, dup, (int fd), (fd), -1)
WRAP(kRead, ssize_t, read, (int fd, void *buf, size_t bytes), (fd, buf, bytes), -1)
WRAP(kSeek, off64_t, lseek64, (int fd, off64_t offset, int origin), (fd, offset, origin), -1)
WRAP(kClose, int, close, (int fd), (fd), (__real_close(fd), -1))
WRAP(kFopen, FILE *, fopen, (const char *path, const char *mode), (path, mode), nullptr)
WRAP(kFwrite, size_t, fwrite, (const void *data, size_t size, size_t items, FILE *stream),
     (data, size, items, stream), 0)
