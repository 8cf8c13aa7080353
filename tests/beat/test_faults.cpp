// The analysis when memory runs out, at every place by turns, and a stop in its middle.
#include <gtest/gtest.h>

#include <atomic>

#include "beat/candidates.h"
#include "tests/beat/beat_fixture.h"

namespace {

std::atomic<int> until_refused{INT32_MAX};  // allocations, with the one that is refused
std::atomic<int> held{0};                   // blocks that are not yet released
std::atomic<int> until_stop{INT32_MAX};     // thread starts, with the one at which a stop arrives
int32_t *stop_flag = nullptr;

bool refuse() {
    return until_refused.fetch_sub(1) == 1;
}

void *counted(void *memory) {
    if (memory != nullptr) ++held;
    return memory;
}

}  // namespace

extern "C" {
void *__real_calloc(size_t count, size_t size);
void *__real_malloc(size_t size);
void __real_free(void *memory);
int __real_pthread_create(pthread_t *, const pthread_attr_t *, void *(*)(void *), void *);

void *__wrap_calloc(size_t count, size_t size) {
    return refuse() ? nullptr : counted(__real_calloc(count, size));
}
void *__wrap_malloc(size_t size) {
    return refuse() ? nullptr : counted(__real_malloc(size));
}
void __wrap_free(void *memory) {
    if (memory != nullptr) --held;
    __real_free(memory);
}
int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attr, void *(*entry)(void *),
                          void *argument) {
    if (until_stop.fetch_sub(1) == 1) store_flag(stop_flag, 1);
    return __real_pthread_create(thread, attr, entry, argument);
}
}

namespace {

struct outcome {
    std::vector<float> beats;
    int32_t bpm;
    int32_t state;
    bool refused;
};

outcome analyse(int refused_allocation = INT32_MAX, int stopping_start = INT32_MAX) {
    static const std::vector<double> song = rising_song();
    analysis of(song);
    stop_flag = &of.ctx.quit;
    until_refused = refused_allocation;
    until_stop = stopping_start;
    const int before = held;
    EXPECT_EQ(getBeatPosition(&of.ctx), of.ctx.onset->beat_count);
    const bool met = until_refused < 1;
    until_refused = INT32_MAX;
    EXPECT_EQ(held - before, of.beats().empty() ? 0 : 1) << refused_allocation;
    return {of.beats(), of.ctx.onset->bpm, of.ctx.state, met};
}

}  // namespace

TEST(BeatFaults, EveryAllocationRefused) {
    const outcome whole = analyse();
    ASSERT_GT(whole.beats.size(), 3u);
    int without_beats = 0;
    for (int nth = 1;; ++nth) {
        const outcome found = analyse(nth);
        if (!found.refused) break;  // it needs fewer
        if (found.beats.empty()) {
            ++without_beats;
        } else {
            ASSERT_EQ(found.beats, whole.beats) << nth;  // never a part of the result
            ASSERT_EQ(found.bpm, whole.bpm);
            ASSERT_EQ(found.state, kStateFinished);
        }
    }
    EXPECT_GT(without_beats, 256);  // a row for each bin of the mel matrix alone
}

TEST(BeatFaults, RoomForEveryPeakAndRise) {
    TAVO_BEAT_CTX beat = {};
    beat.frame_count = 100;
    beat.rise_count = 3;
    EXPECT_EQ(candidate_room(&beat), 50 + 3 + 50);  // half of the frames, the rises, those added
}

// A stop that arrives with the envelope is seen after the tempo; with the threshold it is too late.
TEST(BeatFaults, StopInTheMiddle) {
    const outcome whole = analyse();
    const outcome stopped = analyse(INT32_MAX, 1);
    EXPECT_TRUE(stopped.beats.empty());
    EXPECT_EQ(stopped.bpm, whole.bpm);
    EXPECT_EQ(stopped.state, kStateRunning);
    const outcome late = analyse(INT32_MAX, 5);
    EXPECT_EQ(late.beats, whole.beats);
    EXPECT_EQ(late.state, kStateFinished);
}
