// The analysis when memory runs out or threads cannot be started, at every place by turns.
#include <gtest/gtest.h>

#include <atomic>

#include "beat/candidates.h"
#include "tests/beat/beat_fixture.h"

extern "C" {
void *__real_calloc(size_t count, size_t size);
void *__real_malloc(size_t size);
void __real_free(void *memory);
int __real_pthread_create(pthread_t *thread, const pthread_attr_t *attr, void *(*entry)(void *),
                          void *argument);
}

namespace {

std::atomic<bool> watching{false};
std::atomic<int> allocations{0};  // asked for while watching
std::atomic<int> held{0};         // obtained and not yet released
std::atomic<int> first_refused{-1};
std::atomic<bool> refuse_later{false};

std::atomic<int> starts{0};       // threads asked for while watching
std::atomic<int> refused{0};      // bit i: thread i cannot be started
int32_t *stop_flag = nullptr;     // raised
std::atomic<int> stop_start{-1};  // when this thread is started

bool refuse_allocation() {
    const int index = allocations++;
    const int first = first_refused;
    return first >= 0 && (index == first || (index > first && refuse_later));
}

void *counted(void *memory) {
    if (memory != nullptr) ++held;
    return memory;
}

struct outcome {
    std::vector<float> beats;
    int32_t bpm;
    int32_t state;
    int leaked;
};

outcome analyse(const std::vector<double> &song, int stop_at = -1) {
    analysis of(song);
    allocations = held = starts = 0;
    stop_flag = &of.ctx.quit;
    stop_start = stop_at;
    watching = true;
    const int32_t count = getBeatPosition(&of.ctx);
    watching = false;
    EXPECT_EQ(count, of.ctx.onset->beat_count);
    // What is still held may only be the beats.
    const int kept = of.ctx.onset->beat_times != nullptr ? 1 : 0;
    return {of.beats(), of.ctx.onset->bpm, of.ctx.state, held - kept};
}

const std::vector<double> &song() {
    static const std::vector<double> samples = [] {
        std::vector<double> quiet_to_loud = drum_song(120, 14);  // with a rise
        for (size_t i = 0; i < 5 * 11025; ++i) quiet_to_loud[i] *= 0.01;
        for (size_t i = 5 * 11025; i < quiet_to_loud.size(); ++i) {
            quiet_to_loud[i] += i % 2 == 0 ? 9000.0 : -9000.0;
        }
        return quiet_to_loud;
    }();
    return samples;
}

}  // namespace

extern "C" {
void *__wrap_calloc(size_t count, size_t size) {
    if (!watching) return __real_calloc(count, size);
    return refuse_allocation() ? nullptr : counted(__real_calloc(count, size));
}
void *__wrap_malloc(size_t size) {
    if (!watching) return __real_malloc(size);
    return refuse_allocation() ? nullptr : counted(__real_malloc(size));
}
void __wrap_free(void *memory) {
    if (watching && memory != nullptr) --held;
    __real_free(memory);
}
int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attr, void *(*entry)(void *),
                          void *argument) {
    if (watching) {
        const int index = starts++;
        if (index == stop_start) store_flag(stop_flag, 1);
        if ((refused >> index & 1) != 0) return 11;
    }
    return __real_pthread_create(thread, attr, entry, argument);
}
}

TEST(BeatFaults, EveryAllocationRefused) {
    const outcome whole = analyse(song());
    const int count = allocations;
    ASSERT_GT(whole.beats.size(), 3u);
    ASSERT_EQ(whole.leaked, 0);
    ASSERT_GT(count, 256);  // a row for each bin of the mel matrix alone
    int without_beats = 0;
    for (int later = 0; later <= 1; ++later) {
        for (int index = 0; index < count; ++index) {
            first_refused = index;
            refuse_later = later == 1;
            const outcome found = analyse(song());
            first_refused = -1;
            ASSERT_EQ(found.leaked, 0) << index;
            ASSERT_TRUE(found.state == kStateFinished || found.state == kStateRunning);
            if (found.beats.empty()) {
                ++without_beats;
            } else {
                ASSERT_EQ(found.beats, whole.beats) << index;  // never a part of the result
                ASSERT_EQ(found.bpm, whole.bpm);
                ASSERT_EQ(found.state, kStateFinished);
            }
        }
    }
    EXPECT_GT(without_beats, 500);
}

TEST(BeatFaults, RoomForEveryPeakAndRise) {
    TAVO_BEAT_CTX beat = {};
    beat.frame_count = 100;
    beat.rise_count = 3;
    EXPECT_EQ(candidate_room(&beat), 50 + 3 + 50);  // half of the frames, the rises, those added
}

// The body of a worker whose thread cannot be started runs on the calling thread.
TEST(BeatFaults, ThreadsThatCannotBeStarted) {
    const outcome whole = analyse(song());
    ASSERT_EQ(starts, 8);
    for (const int mask : {0x01, 0x0A, 0x0F, 0x80, 0xF0, 0xFF}) {
        refused = mask;
        const outcome found = analyse(song());
        refused = 0;
        EXPECT_EQ(found.beats, whole.beats) << mask;
        EXPECT_EQ(found.state, kStateFinished);
    }
}

// A stop that arrives with the envelope is seen after the tempo; with the threshold it is too late.
TEST(BeatFaults, StopInTheMiddle) {
    const outcome whole = analyse(song());
    const outcome stopped = analyse(song(), 0);
    EXPECT_TRUE(stopped.beats.empty());
    EXPECT_EQ(stopped.bpm, whole.bpm);
    EXPECT_EQ(stopped.state, kStateRunning);
    const outcome late = analyse(song(), 4);
    EXPECT_EQ(late.beats, whole.beats);
    EXPECT_EQ(late.state, kStateFinished);
}
