// Instances are created, used and destroyed again and again: jobs stopped at once, at any moment,
// after their end, from other threads. Each job reports exactly once, and at the end the process
// holds what it held after the tenth.
#include <gtest/gtest.h>
#include <malloc.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <random>
#include <thread>

#include "tests/faults/measure.h"
#include "tests/faults/trial.h"
#include "tests/support/job_harness.h"
#include "tests/support/song.h"

extern "C" __attribute__((weak)) size_t __sanitizer_get_current_allocated_bytes();

namespace {

constexpr unsigned kLongest = 60;  // seconds of one cycle
constexpr int kSettled = 10;       // cycles after which nothing more is kept

// Bytes: what ended threads' caches leave in other places, up to one a cycle. The smallest block
// has 32: lost by one of the ten kinds of ending alone, it makes 3.2 a cycle.
int64_t heap_slack(int cycles) {
    return 8192 + static_cast<int64_t>(cycles);
}

int cycles() {
    if (trial::sanitized()) return trial::full() ? 1000 : 60;
    return trial::full() ? 10'000 : 200;
}

// How a cycle goes on after tavo_init.
enum ending : int { kNoJob, kAtOnce, kAfter, kWithoutCallback, kDuring, kEndings = 10 };

int64_t entries(const char *folder) {
    const std::filesystem::directory_iterator all(folder);
    return std::distance(begin(all), end(all));
}

struct holding {
    int64_t heap = 0;
    int64_t descriptors = 0;
    int64_t threads = 0;
};

// A thread that has been joined can stay in the list for a moment.
holding held(int64_t threads_before) {
    holding now;
    for (int tries = 0; tries < 1000; ++tries) {
        now.threads = entries("/proc/self/task");
        if (now.threads <= threads_before) break;
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    now.heap = static_cast<int64_t>(__sanitizer_get_current_allocated_bytes != nullptr
                                        ? __sanitizer_get_current_allocated_bytes()
                                        : mallinfo2().uordblks);
    now.descriptors = entries("/proc/self/fd");
    return now;
}

struct tally {
    int started = 0, stopped_early = 0, finished = 0, callbacks = 0;
};

TAVO_CTX *current = nullptr;
int32_t answer_inside = 0;

class Lifecycle : public testing::TestWithParam<int32_t> {
 protected:
    void SetUp() override {
        support::song_spec plan;
        plan.rate = 22050;
        plan.seconds = 16.0;
        plan.loud_at = 6.0;
        plan.tail_at = 14.0;
        ASSERT_TRUE(support::write_wav(path, support::make_song(plan)));
    }
    void TearDown() override {
        alarm(0);
        unlink(path.c_str());
    }

    // The time from the start of a job to its report.
    double job_ms() {
        int32_t err = 99;
        TAVO_CTX *ctx = job::create(path, GetParam(), &err);
        const auto start = std::chrono::steady_clock::now();
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), TAVO_OK);
        job::wait();
        const double ms = trial::ms_since(start);
        EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
        return ms;
    }

    void cycle(int how, std::chrono::microseconds delay, bool elsewhere, tally *count) {
        int32_t err = 99;
        current = job::create(path, GetParam(), &err);
        ASSERT_NE(current, nullptr) << err;
        answer_inside = 99;
        job::inside = [](TAVO_INFO *) { answer_inside = tavo_deinit(current); };
        if (how == kWithoutCallback) tavo_setcallback(current, nullptr);
        if (how != kNoJob) {
            ASSERT_EQ(tavo_analyze(current, 0, 0, 0), TAVO_OK);
            ++count->started;
        }
        if (how == kAfter) job::wait();
        if (how >= kWithoutCallback) std::this_thread::sleep_for(delay);
        bool early = false;
        {
            const std::lock_guard<std::mutex> guard(job::lock);
            early = job::last.calls == 0 && how != kNoJob && how != kWithoutCallback;
        }
        int32_t answer = 99;
        if (elsewhere) {
            std::thread([&answer] { answer = tavo_deinit(current); }).join();
        } else {
            answer = tavo_deinit(current);
        }
        ASSERT_EQ(answer, TAVO_OK);
        ASSERT_EQ(job::last.calls, how == kNoJob || how == kWithoutCallback ? 0 : 1);
        ASSERT_EQ(answer_inside, job::last.calls == 0 ? 99 : TAVO_ERR_HANDLE);
        count->callbacks += job::last.calls;
        count->stopped_early += early ? 1 : 0;
        count->finished += job::last.calls == 1 && job::last.status == 0 ? 1 : 0;
        // Only a stop that came before the report makes a job fail, and never a highlight alone.
        ASSERT_TRUE(job::last.calls == 0 || job::last.status == 0 ||
                    (early && GetParam() != TAVO_MODE_HIGHLIGHT));
    }

    std::string path = testing::TempDir() + "tavo_lifecycle_" + std::to_string(getpid()) + ".wav";
};

TEST_P(Lifecycle, LeavesNothing) {
    trial::watch(kLongest, "the first job");
    std::vector<double> jobs = {job_ms(), job_ms(), job_ms(), job_ms(), job_ms()};
    std::sort(jobs.begin(), jobs.end());
    const double usual = jobs[2];
    std::mt19937 random(static_cast<uint32_t>(GetParam()) + 1);
    tally count;
    holding before;
    const int all = cycles();
    const int64_t threads = entries("/proc/self/task");
    for (int i = 0; i < all; ++i) {
        if (i == kSettled) before = held(threads);
        trial::watch(kLongest, "cycle " + std::to_string(i));
        // Each moment of the job in its turn, and a little beyond its end.
        std::uniform_real_distribution<double> part(0.0, 1.1 * usual * 1000.0);
        const std::chrono::microseconds delay(static_cast<int64_t>(part(random)));
        cycle(i % kEndings, delay, random() % 4 == 0, &count);
        if (HasFatalFailure()) {
            ADD_FAILURE() << "cycle " << i << ", delay " << delay.count() << " us";
            return;
        }
    }
    const holding after = held(before.threads);
    EXPECT_LE(after.heap - before.heap, heap_slack(all));
    EXPECT_EQ(after.descriptors, before.descriptors);
    EXPECT_EQ(after.threads, before.threads);
    EXPECT_EQ(count.callbacks, count.started - all / kEndings);
    EXPECT_GT(count.stopped_early, all / kEndings);
    EXPECT_LT(count.stopped_early, all);
    EXPECT_GT(count.finished, all / kEndings);
    trial::figure("lifecycle",
                  {{"mode", std::to_string(GetParam())},
                   {"cycles", std::to_string(all)},
                   {"stopped_early", std::to_string(count.stopped_early)},
                   {"finished", std::to_string(count.finished)},
                   {"callbacks", std::to_string(count.callbacks)},
                   {"job_ms", std::to_string(lround(usual))},
                   {"heap_growth", std::to_string(after.heap - before.heap)},
                   {"fds_growth", std::to_string(after.descriptors - before.descriptors)},
                   {"threads_growth", std::to_string(after.threads - before.threads)}});
}

INSTANTIATE_TEST_SUITE_P(Modes, Lifecycle,
                         testing::Values(TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH));

}  // namespace
