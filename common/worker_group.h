// The completion pattern of all worker groups: decoding, block average, onset, threshold.
//
// A group has one record per worker, and a mutex, a condition and an array of done flags that the
// workers share. A worker's thread entry calls run_worker; its completion handler calls
// worker_group_done. The starter calls worker_group_run, which waits for all flags and joins every
// thread, and only then reads results. Used by pcm/ and beat/.
#ifndef TAVO_COMMON_WORKER_GROUP_H
#define TAVO_COMMON_WORKER_GROUP_H

#include <pthread.h>

#include <cstdint>

// One worker.
struct worker_slot {
    void *record;                  // passed to both functions below
    pthread_t *thread;             // receives the thread's handle
    void *(*entry)(void *record);  // the thread's entry: run_worker
    void (*body)(void *record);    // the work alone, if the thread cannot be started
};

// A worker's whole thread entry: pushes the completion handler cleanup, runs body and ends the
// thread. Both get the record.
[[noreturn]] void run_worker(void *record, void (*body)(void *), void (*cleanup)(void *));

// For completion handlers: sets done[index] to 1 under the mutex, and signals the condition once
// all count flags are set.
void worker_group_done(pthread_mutex_t *mutex, pthread_cond_t *cond, int32_t *done, int32_t count,
                       int32_t index);

// Work for the calling thread while a group runs.
struct side_work {
    void (*run)(void *arg);
    void *arg;
};

// Clears the done flags, starts count workers (at most 4) in order, does the side work (null
// for none), waits until every flag is set and joins the threads. If a thread cannot be started,
// its worker's body runs on the calling thread.
void worker_group_run(const worker_slot *slots, int32_t count, pthread_mutex_t *mutex,
                      pthread_cond_t *cond, int32_t *done, const side_work *side = nullptr);

// Allocates and initialises a mutex and a condition. Returns TAVO_OK; TAVO_ERR_MEMORY, both null.
int32_t worker_lock_create(pthread_mutex_t **mutex, pthread_cond_t **cond);

// Destroys and frees both and sets them to null. Null pointers are skipped.
void worker_lock_release(pthread_mutex_t **mutex, pthread_cond_t **cond);

#endif
