// Instances are made, used and destroyed again and again: jobs stopped at once, at any moment,
// after their end, from other threads. Each job reports once, and nothing that the process holds
// grows.
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <random>
#include <thread>

#include "tests/support/job_harness.h"

namespace {

constexpr int kSettled = 10;  // cycles after which nothing more is kept
constexpr int kCycles = 200;

int64_t entries(const char *folder) {
    const std::filesystem::directory_iterator all(folder);
    return std::distance(begin(all), end(all));
}

TAVO_CTX *current = nullptr;
int32_t answer_inside = 0;

// How a cycle goes on after tavo_init.
enum ending : int { kNoJob, kAtOnce, kAfter, kWithoutCallback, kDuring, kEndings = 8 };

// True when the stop came before the report.
bool cycle(int how, int32_t mode, std::chrono::microseconds delay, bool elsewhere) {
    current = job::create(std::string(SHORT_SONGS) + "/long.wav", mode);
    answer_inside = 99;
    job::inside = [](TAVO_INFO *) { answer_inside = tavo_deinit(current); };
    if (how == kWithoutCallback) tavo_setcallback(current, nullptr);
    if (how != kNoJob) {
        EXPECT_EQ(tavo_analyze(current, 0, 0, 0), TAVO_OK);
    }
    if (how == kAfter) job::wait();
    if (how >= kWithoutCallback) std::this_thread::sleep_for(delay);
    bool early = false;
    {
        const std::lock_guard<std::mutex> guard(job::lock);
        early = job::last.calls == 0;
    }
    int32_t answer = 99;
    const auto destroy = [&answer] { answer = tavo_deinit(current); };
    if (elsewhere) {
        std::thread(destroy).join();
    } else {
        destroy();
    }
    EXPECT_EQ(answer, TAVO_OK);
    const int reports = how == kNoJob || how == kWithoutCallback ? 0 : 1;
    EXPECT_EQ(job::last.calls, reports);
    EXPECT_EQ(answer_inside, reports == 0 ? 99 : TAVO_ERR_HANDLE);
    // Only a stop that came before the report makes a job fail, and never a highlight alone.
    EXPECT_TRUE(reports == 0 || job::last.status == 0 || (early && mode != TAVO_MODE_HIGHLIGHT));
    return early && reports == 1;
}

class Lifecycle : public testing::TestWithParam<int32_t> {};

TEST_P(Lifecycle, LeavesNothing) {
    const auto start = std::chrono::steady_clock::now();
    EXPECT_FALSE(cycle(kAfter, GetParam(), {}, false));
    const auto usual = std::chrono::duration_cast<std::chrono::microseconds>(
        std::chrono::steady_clock::now() - start);
    std::mt19937 random(static_cast<uint32_t>(GetParam()) + 1);
    int64_t descriptors = 0, threads = 0;
    int stopped = 0;
    for (int i = 0; i < kCycles && !HasFailure(); ++i) {
        if (i == kSettled) descriptors = entries("/proc/self/fd");
        if (i == kSettled) threads = entries("/proc/self/task");
        const auto delay = usual * static_cast<int>(random() % 110) / 100;
        SCOPED_TRACE(testing::Message() << "cycle " << i << ", delay " << delay.count() << " us");
        stopped += cycle(i % kEndings, GetParam(), delay, random() % 4 == 0) ? 1 : 0;
    }
    EXPECT_EQ(entries("/proc/self/fd"), descriptors);
    // A thread that has been joined can stay in the list for a moment.
    for (int tries = 0; tries < 1000 && entries("/proc/self/task") > threads; ++tries) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    EXPECT_LE(entries("/proc/self/task"), threads);
    EXPECT_GT(stopped, 0);
}

INSTANTIATE_TEST_SUITE_P(Modes, Lifecycle, testing::Range(0, 3));

}  // namespace
