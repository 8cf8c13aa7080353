#include "tests/support/fault_layer.h"

#include <pthread.h>
#include <sys/types.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>

namespace {

fault::plan now;
std::atomic<int64_t> count, failed;

bool fails(uint32_t call) {
    if ((now.calls & call) == 0) return false;
    if (now.watch != nullptr) now.watch();
    const int64_t place = count++;
    if (place < now.place || (place > now.place && !now.forever)) return false;
    ++failed;
    errno = now.error;
    return true;
}

void report_thread(void *(*entry)(void *), void *record) {
    if (now.thread_watch != nullptr) now.thread_watch(entry, record);
}

}  // namespace

namespace fault {

void arm(const plan &next) {
    count = failed = 0;
    now = next;
}
int64_t met() {
    return count;
}
int64_t refused() {
    return failed;
}

}  // namespace fault

#define WRAP(call, type, name, parameters, arguments, failure)         \
    extern "C" type __real_##name parameters;                          \
    extern "C" type __wrap_##name parameters;                          \
    extern "C" type __wrap_##name parameters {                         \
        return fails(fault::call) ? failure : __real_##name arguments; \
    }

WRAP(kMalloc, void *, malloc, (size_t size), (size), nullptr)
WRAP(kCalloc, void *, calloc, (size_t items, size_t size), (items, size), nullptr)
WRAP(kRealloc, void *, realloc, (void *block, size_t size), (block, size), nullptr)
WRAP(kMalloc, int, posix_memalign, (void **block, size_t alignment, size_t size),
     (block, alignment, size), ENOMEM)
WRAP(kThread, int, pthread_create,
     (pthread_t * id, const pthread_attr_t *how, void *(*run)(void *), void *with),
     ((report_thread(run, with), id), how, run, with), EAGAIN)
WRAP(kMutex, int, pthread_mutex_init, (pthread_mutex_t * lock, const pthread_mutexattr_t *how),
     (lock, how), ENOMEM)
WRAP(kCondition, int, pthread_cond_init, (pthread_cond_t * wait, const pthread_condattr_t *how),
     (wait, how), ENOMEM)
WRAP(kOpen, int, open, (const char *path, int flags, mode_t mode), (path, flags, mode), -1)
WRAP(kDup, int, dup, (int fd), (fd), -1)
WRAP(kRead, ssize_t, read, (int fd, void *buf, size_t bytes), (fd, buf, bytes), -1)
WRAP(kSeek, off64_t, lseek64, (int fd, off64_t offset, int from), (fd, offset, from), -1)
WRAP(kClose, int, close, (int fd), (fd), (__real_close(fd), -1))
WRAP(kFopen, FILE *, fopen, (const char *path, const char *mode), (path, mode), nullptr)
WRAP(kFwrite, size_t, fwrite, (const void *data, size_t size, size_t items, FILE *to),
     (data, size, items, to), 0)
