#include "common/worker_group.h"

#include "common/alloc.h"

namespace {

constexpr int32_t kMaxWorkers = 4;

bool all_done(const int32_t *done, int32_t count) {
    for (int32_t i = 0; i < count; ++i) {
        if (done[i] != 1) return false;
    }
    return true;
}

}  // namespace

void run_worker(void *record, void (*body)(void *), void (*cleanup)(void *)) {
    pthread_cleanup_push(cleanup, record);
    body(record);
    pthread_exit(nullptr);
    pthread_cleanup_pop(0);
}

void worker_group_done(pthread_mutex_t *mutex, pthread_cond_t *cond, int32_t *done, int32_t count,
                       int32_t index) {
    pthread_mutex_lock(mutex);
    done[index] = 1;
    if (all_done(done, count)) pthread_cond_signal(cond);
    pthread_mutex_unlock(mutex);
}

void worker_group_run(const worker_slot *slots, int32_t count, pthread_mutex_t *mutex,
                      pthread_cond_t *cond, int32_t *done, const side_work *side) {
    bool started[kMaxWorkers] = {};
    if (count > kMaxWorkers) count = kMaxWorkers;

    // Clear all flags before the first thread starts so that a quick worker does not see another
    // worker's stale flag.
    for (int32_t i = 0; i < count; ++i) done[i] = 0;
    for (int32_t i = 0; i < count; ++i) {
        const worker_slot &slot = slots[i];
        started[i] = pthread_create(slot.thread, nullptr, slot.entry, slot.record) == 0;
        if (!started[i]) {
            slot.body(slot.record);
            worker_group_done(mutex, cond, done, count, i);
        }
    }

    if (side != nullptr) side->run(side->arg);
    pthread_mutex_lock(mutex);
    while (!all_done(done, count)) pthread_cond_wait(cond, mutex);
    pthread_mutex_unlock(mutex);

    for (int32_t i = 0; i < count; ++i) {
        if (started[i]) pthread_join(*slots[i].thread, nullptr);
    }
}

int32_t worker_lock_create(pthread_mutex_t **mutex, pthread_cond_t **cond) {
    *mutex = zeroed_items<pthread_mutex_t>(1);
    *cond = zeroed_items<pthread_cond_t>(1);
    if (*mutex != nullptr && *cond != nullptr && pthread_mutex_init(*mutex, nullptr) == 0) {
        if (pthread_cond_init(*cond, nullptr) == 0) return TAVO_OK;
        pthread_mutex_destroy(*mutex);
    }
    free(*mutex);
    free(*cond);
    *mutex = nullptr;
    *cond = nullptr;
    return TAVO_ERR_MEMORY;
}

void worker_lock_release(pthread_mutex_t **mutex, pthread_cond_t **cond) {
    if (*cond != nullptr) pthread_cond_destroy(*cond);
    if (*mutex != nullptr) pthread_mutex_destroy(*mutex);
    free(*cond);
    free(*mutex);
    *cond = nullptr;
    *mutex = nullptr;
}
