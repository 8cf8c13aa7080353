// Instances are made, used and destroyed again and again: jobs stopped at once, at any moment,
// after their end, from other threads. Each job reports once. Leaks and races are the sanitizers'
// to find.
#include <gtest/gtest.h>

#include <chrono>
#include <random>
#include <thread>

#include "tests/support/job_harness.h"

namespace {

using std::chrono::microseconds;

constexpr int kCycles = 200;

// How a cycle goes on after tavo_init; the rest of them with a job that is stopped after a delay.
enum ending : int { kNoJob, kAtOnce, kAfter, kWithoutCallback, kEndings = 8 };

// True when the stop came before the report.
bool cycle(int how, int32_t mode, microseconds delay, bool elsewhere) {
    TAVO_CTX *ctx = job::create(SHORT_SONGS "/long.wav", mode);
    if (how == kWithoutCallback) tavo_setcallback(ctx, nullptr);
    EXPECT_EQ(how == kNoJob ? 0 : tavo_analyze(ctx, 0, 0, 0), TAVO_OK);
    if (how == kAfter) job::wait();
    if (how >= kWithoutCallback) std::this_thread::sleep_for(delay);
    bool early = false;
    {
        const std::lock_guard<std::mutex> guard(job::lock);
        early = job::last.calls == 0;
    }
    const auto destroy = [ctx] { EXPECT_EQ(tavo_deinit(ctx), TAVO_OK); };
    if (elsewhere) {
        std::thread(destroy).join();
    } else {
        destroy();
    }
    const bool reports = how != kNoJob && how != kWithoutCallback;
    EXPECT_EQ(job::last.calls, reports ? 1 : 0);
    // Only a stop that came before the report makes a job fail, and never a highlight alone.
    EXPECT_TRUE(!reports || job::last.status == 0 || (early && mode != TAVO_MODE_HIGHLIGHT));
    return early && reports;
}

class Lifecycle : public testing::TestWithParam<int32_t> {};

TEST_P(Lifecycle, EndsAtAnyMoment) {
    const auto start = std::chrono::steady_clock::now();
    EXPECT_FALSE(cycle(kAfter, GetParam(), {}, false));
    const auto usual =
        std::chrono::duration_cast<microseconds>(std::chrono::steady_clock::now() - start);
    std::mt19937 random(static_cast<uint32_t>(GetParam()) + 1);
    int stopped = 0;
    for (int i = 0; i < kCycles && !HasFailure(); ++i) {
        const auto delay = usual * static_cast<int>(random() % 110) / 100;
        SCOPED_TRACE(testing::Message() << "cycle " << i << ", delay " << delay.count() << " us");
        stopped += cycle(i % kEndings, GetParam(), delay, random() % 4 == 0) ? 1 : 0;
    }
    EXPECT_GT(stopped, 0);
}

INSTANTIATE_TEST_SUITE_P(Modes, Lifecycle, testing::Range(0, 3));

}  // namespace
