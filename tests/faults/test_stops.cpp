// Jobs that are stopped at any moment, here or on another thread, with and without a callback. Each
// reports once. Leaks and races are the sanitizers' to find.
#include <gtest/gtest.h>

#include <chrono>
#include <random>
#include <thread>

#include "tests/support/job_harness.h"

namespace {

using std::chrono::microseconds;

// True if the stop came before the report.
bool stopped_after(microseconds delay, int32_t mode, bool told, bool elsewhere) {
    TAVO_CTX *ctx = job::create(SHORT_SONGS "/long.wav", mode);
    if (!told) tavo_setcallback(ctx, nullptr);
    EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), TAVO_OK);
    std::this_thread::sleep_for(delay);
    std::unique_lock<std::mutex> guard(job::lock);
    const bool early = told && job::last.calls == 0;
    guard.unlock();
    const auto destroy = [ctx] { EXPECT_EQ(tavo_deinit(ctx), TAVO_OK); };
    if (elsewhere) std::thread(destroy).join();
    if (!elsewhere) destroy();
    EXPECT_EQ(job::last.calls, told ? 1 : 0);
    // Only a stop that came before the report makes a job fail, and never a highlight alone.
    EXPECT_TRUE(!told || job::last.status == 0 || (early && mode != TAVO_MODE_HIGHLIGHT));
    return early;
}

class Stops : public testing::TestWithParam<int32_t> {};

TEST_P(Stops, AtAnyMoment) {
    auto longest = microseconds(1000);  // twice as long until a job has ended by itself
    while (stopped_after(longest, GetParam(), true, false)) longest *= 2;
    std::mt19937 random(static_cast<uint32_t>(GetParam()) + 1);
    int stopped = 0;
    for (int i = 0; i < 200 && !HasFailure(); ++i) {
        const auto delay = longest * static_cast<int>(random() % 100) / 100;
        SCOPED_TRACE(testing::Message() << "cycle " << i << ", delay " << delay.count() << " us");
        stopped += stopped_after(delay, GetParam(), i % 8 != 0, random() % 4 == 0) ? 1 : 0;
    }
    EXPECT_GT(stopped, 0);
}

INSTANTIATE_TEST_SUITE_P(Modes, Stops, testing::Range(0, 3));

}  // namespace
