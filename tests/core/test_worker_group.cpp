#include <gtest/gtest.h>

#include <atomic>
#include <numeric>

#include "common/worker_group.h"
#include "tests/support/fault_layer.h"

namespace {

struct member {
    int32_t index;
    pthread_t thread, ran_on;
    int runs;
} members[4];

pthread_mutex_t *mutex;
pthread_cond_t *cond;
int32_t done[4] = {1, 1, 1, 1};  // left over from a run before
int finished;                    // of this run, under mutex
int stale_flags;                 // found set although their worker had not run

void work(void *record) {
    auto *self = static_cast<member *>(record);
    self->ran_on = pthread_self();
    ++self->runs;
    pthread_mutex_lock(mutex);
    const int set = std::accumulate(done, done + 4, 0);
    if (set > finished || done[self->index] != 0) ++stale_flags;
    ++finished;
    pthread_mutex_unlock(mutex);
}

void report(void *record) {
    worker_group_done(mutex, cond, done, 4, static_cast<member *>(record)->index);
}

std::atomic<int> ended;  // threads

void *enter(void *record) {
    thread_local const struct at_exit {
        ~at_exit() { ++ended; }
    } mark;
    run_worker(record, work, report);
}

TEST(WorkerGroup, EveryWorkerRunsOnceWhateverCanBeStarted) {
    for (const uint32_t lock : {fault::kMutex, fault::kCondition}) {
        fault::arm({lock, 0});
        EXPECT_EQ(worker_lock_create(&mutex, &cond), -2);
        EXPECT_TRUE(mutex == nullptr && cond == nullptr);
    }
    ASSERT_EQ(worker_lock_create(&mutex, &cond), 0);
    worker_slot slots[4];
    for (int32_t i = 0; i < 4; ++i) {
        members[i].index = i;
        slots[i] = {&members[i], &members[i].thread, enter, work};
    }
    for (int round = 0; round < 500; ++round) {  // the flags of one round are stale in the next
        SCOPED_TRACE(round);
        const int refused = round % 5;  // this worker and the later ones, or none
        const bool forever = round % 2 != 0;
        fault::arm({fault::kThread, refused, forever});
        finished = 0;
        ended = 0;
        worker_group_run(slots, 4, mutex, cond, done);
        ASSERT_EQ(finished, 4);
        ASSERT_EQ(ended, 4 - fault::refused());
        ASSERT_EQ(stale_flags, 0);
        for (int i = 0; i < 4; ++i) {
            ASSERT_EQ(done[i], 1);
            ASSERT_EQ(members[i].runs, round + 1);
            const bool here = pthread_equal(members[i].ran_on, pthread_self()) != 0;
            ASSERT_EQ(here, forever ? i >= refused : i == refused);
        }
    }
    fault::disarm();
    worker_lock_release(&mutex, &cond);
    EXPECT_TRUE(mutex == nullptr && cond == nullptr);
    worker_lock_release(&mutex, &cond);  // harmless
}

}  // namespace
