// Jobs that are stopped at any moment, on this or another thread, with and without a callback. Each
// reports once. The sanitizers find leaks and races.
#include <gtest/gtest.h>

#include <chrono>
#include <random>
#include <thread>

#include "tests/support/job_harness.h"

namespace {

using std::chrono::microseconds;

// Returns true if the job was stopped before its report.
bool stop_job_after(microseconds delay, int32_t mode, bool with_callback, bool on_other_thread) {
    TAVO_CTX *ctx = job::create(SHORT_SONGS "/long.wav", mode);
    if (!with_callback) tavo_setcallback(ctx, nullptr);
    EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), TAVO_OK);
    std::this_thread::sleep_for(delay);
    std::unique_lock<std::mutex> guard(job::lock);
    const bool early = with_callback && job::last.calls == 0;
    guard.unlock();
    const auto destroy = [ctx] { EXPECT_EQ(tavo_deinit(ctx), TAVO_OK); };
    if (on_other_thread) std::thread(destroy).join();
    if (!on_other_thread) destroy();
    EXPECT_EQ(job::last.calls, with_callback ? 1 : 0);
    // A job only fails if it was stopped before its report, and never in mode highlight.
    EXPECT_TRUE(!with_callback || job::last.status == 0 || (early && mode != TAVO_MODE_HIGHLIGHT));
    return early;
}

class Stops : public testing::TestWithParam<int32_t> {};

TEST_P(Stops, JobReportsOnceWheneverItIsStopped) {
    auto longest = microseconds(1000);  // doubled until a job ends by itself
    while (stop_job_after(longest, GetParam(), true, false)) longest *= 2;
    std::mt19937 random(static_cast<uint32_t>(GetParam()) + 1);
    int stopped = 0;
    for (int i = 0; i < 200 && !HasFailure(); ++i) {
        const auto delay = longest * static_cast<int>(random() % 100) / 100;
        SCOPED_TRACE(testing::Message() << "cycle " << i << ", delay " << delay.count() << " us");
        stopped += stop_job_after(delay, GetParam(), i % 8 != 0, random() % 4 == 0) ? 1 : 0;
    }
    EXPECT_GT(stopped, 0);
}

INSTANTIATE_TEST_SUITE_P(Modes, Stops, testing::Range(0, 3));

}  // namespace
