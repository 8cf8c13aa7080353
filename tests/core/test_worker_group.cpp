#include <gtest/gtest.h>

#include <numeric>

#include "common/worker_group.h"
#include "tests/core/refused.h"

namespace {

struct group;

struct member {
    group *all;
    int32_t index;
    pthread_t thread, ran_on;
    int runs, reports;
};

struct group {
    pthread_mutex_t *mutex = nullptr;
    pthread_cond_t *cond = nullptr;
    int32_t done[4] = {1, 1, 1, 1};  // left over from a run before
    int finished = 0;                // under mutex
    int stale_flags = 0;             // found set although their worker had not run
    member members[4] = {};
};

void work(void *record) {
    auto *self = static_cast<member *>(record);
    group *all = self->all;
    self->ran_on = pthread_self();
    ++self->runs;
    pthread_mutex_lock(all->mutex);
    const int set = std::accumulate(all->done, all->done + 4, 0);
    if (set > all->finished || all->done[self->index] != 0) ++all->stale_flags;
    ++all->finished;
    pthread_mutex_unlock(all->mutex);
}

void report(void *record) {
    auto *self = static_cast<member *>(record);
    ++self->reports;
    worker_group_done(self->all->mutex, self->all->cond, self->all->done, 4, self->index);
}

void *enter(void *record) {
    run_worker(record, work, report);
}

TEST(WorkerGroup, EveryWorkerRunsOnceWhateverCanBeStarted) {
    group all;
    for (refused::calls *lock : {&refused::mutexes, &refused::conditions}) {
        *lock = 1;
        EXPECT_EQ(worker_lock_create(&all.mutex, &all.cond), -2);
        EXPECT_EQ(all.mutex, nullptr);
        EXPECT_EQ(all.cond, nullptr);
    }
    ASSERT_EQ(worker_lock_create(&all.mutex, &all.cond), 0);
    worker_slot slots[4];
    for (int32_t i = 0; i < 4; ++i) {
        all.members[i] = {&all, i, {}, {}, 0, 0};
        slots[i] = {&all.members[i], &all.members[i].thread, enter, work};
    }
    for (int round = 0; round < 512; ++round) {  // the flags of one round are stale in the next
        const int mask = round % 16;
        SCOPED_TRACE(mask);
        refused::threads = static_cast<uint32_t>(mask);
        all.finished = 0;
        worker_group_run(slots, 4, all.mutex, all.cond, all.done);

        ASSERT_EQ(all.finished, 4);
        ASSERT_EQ(all.stale_flags, 0);
        for (int i = 0; i < 4; ++i) {
            ASSERT_EQ(all.done[i], 1);
            ASSERT_EQ(all.members[i].runs, round + 1);
            const bool here = pthread_equal(all.members[i].ran_on, pthread_self()) != 0;
            ASSERT_EQ(here, (mask >> i & 1) != 0);
        }
    }
    for (const member &each : all.members)
        EXPECT_EQ(each.reports, 512 / 2);  // where it was started
    worker_lock_release(&all.mutex, &all.cond);
    EXPECT_EQ(all.mutex, nullptr);
    EXPECT_EQ(all.cond, nullptr);
    worker_lock_release(&all.mutex, &all.cond);  // harmless
}

}  // namespace
