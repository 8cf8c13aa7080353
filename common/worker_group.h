// The one completion pattern of all worker groups (decoding, block average, onset, threshold).
//
// A group is an array of records, one per worker, each naming a slot of a shared array of done
// flags, and a mutex and a condition. Every worker's thread entry pushes its completion handler,
// does its work and ends by pthread_exit; the handler reports through worker_group_done. The
// starter waits for all flags and joins every thread before it reads a result.
#ifndef TAVO_COMMON_WORKER_GROUP_H
#define TAVO_COMMON_WORKER_GROUP_H

#include <pthread.h>

#include <cstdint>

// One worker as the group sees it.
struct worker_slot {
    void *record;                  // handed to both functions below
    pthread_t *thread;             // receives the thread's handle
    void *(*entry)(void *record);  // the thread's entry: pushes the handler, ends by pthread_exit
    void (*body)(void *record);    // the work alone, for a worker whose thread cannot be started
};

// The whole of a worker's thread entry: pushes cleanup, the group's completion handler, runs the
// body and ends the thread. Both are called with the record.
[[noreturn]] void run_worker(void *record, void (*body)(void *), void (*cleanup)(void *));

// Completion handler's body: under the mutex sets done[index] to 1 and signals the condition when
// all count flags are set.
void worker_group_done(pthread_mutex_t *mutex, pthread_cond_t *cond, int32_t *done, int32_t count,
                       int32_t index);

// What the calling thread does while a group works.
struct side_work {
    void (*run)(void *arg);
    void *arg;
};

// Clears the done flags, starts the count (at most 4) workers in order, does the work of beside
// (null for none), waits until every flag is set and joins the threads. The body of a worker whose
// thread cannot be started runs on the calling thread.
void worker_group_run(const worker_slot *slots, int32_t count, pthread_mutex_t *mutex,
                      pthread_cond_t *cond, int32_t *done, const side_work *beside = nullptr);

// Allocate and initialise a lock and its condition into the two globals. Returns 0; -2 with both
// null.
int32_t worker_lock_create(pthread_mutex_t **mutex, pthread_cond_t **cond);
// Destroys and frees what is present and clears both.
void worker_lock_release(pthread_mutex_t **mutex, pthread_cond_t **cond);

#endif
