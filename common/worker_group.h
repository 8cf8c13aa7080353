// Runs a group of worker threads and waits for them. Used by pcm/ and beat/ for decoding, block
// averages, the onset envelope and the threshold.
//
// A group has one record per worker. The workers share a mutex, a condition and an array of done
// flags. A worker's thread entry calls run_worker, and its completion handler calls
// worker_group_done. Another thread calls worker_group_run, which waits for all flags and joins
// every worker. The results are complete when it returns.
#pragma once

#include <pthread.h>

#include <cstdint>

// One worker.
struct worker_slot {
    void *record;                  // passed to both functions below
    pthread_t *thread;             // receives the thread's handle
    void *(*entry)(void *record);  // the thread's entry, which calls run_worker
    void (*body)(void *record);    // called directly if the thread cannot be started
};

// Implements a thread entry: pushes the completion handler `cleanup`, runs `body` and ends the
// thread. Both functions receive the record.
[[noreturn]] void run_worker(void *record, void (*body)(void *), void (*cleanup)(void *));

// Called by completion handlers. Sets done[index] to 1 under the mutex, and signals the condition
// if all `count` flags are set.
void worker_group_done(pthread_mutex_t *mutex, pthread_cond_t *cond, int32_t *done, int32_t count,
                       int32_t index);

// Work that the calling thread does while a group runs.
struct side_work {
    void (*run)(void *arg);
    void *arg;
};

// Clears the done flags, starts `count` workers (at most 4) in order, runs the side work unless it
// is null, waits until every flag is set and joins the threads. If a thread cannot be started, its
// worker's body runs on the calling thread.
void worker_group_run(const worker_slot *slots, int32_t count, pthread_mutex_t *mutex,
                      pthread_cond_t *cond, int32_t *done, const side_work *side = nullptr);

// Allocates and initialises a mutex and a condition. Returns TAVO_OK, or TAVO_ERR_MEMORY with both
// pointers null.
int32_t worker_lock_create(pthread_mutex_t **mutex, pthread_cond_t **cond);

// Destroys and frees the mutex and the condition and sets both pointers to null. Null is ignored.
void worker_lock_release(pthread_mutex_t **mutex, pthread_cond_t **cond);
