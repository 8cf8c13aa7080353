#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <thread>

#include "core/lifecycle.h"
#include "media_source/mtsrc_ctx.h"
#include "pcm/decode.h"
#include "tests/core/core_song.h"
#include "tests/core/refused.h"
#include "tests/support/job_harness.h"

namespace {

constexpr int32_t kModes[] = {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH};

TAVO_CTX *create(int32_t mode) {
    int32_t err = 99;
    TAVO_CTX *ctx = job::create(core_song::path(), mode, &err);
    EXPECT_EQ(err, 0);
    return ctx;
}

TEST(Lifecycle, CreationMakesWhatTheModeNeeds) {
    for (int32_t mode : kModes) {
        SCOPED_TRACE(mode);
        TAVO_CTX *ctx = create(mode);
        ASSERT_NE(ctx, nullptr);
        EXPECT_EQ(memcmp(ctx, "ZEKA", 4), 0);
        EXPECT_EQ(ctx->state, 1);
        EXPECT_EQ(ctx->ana_rate, mode == TAVO_MODE_HIGHLIGHT ? 0 : 11025);
        EXPECT_EQ(ctx->hl != nullptr, mode != TAVO_MODE_BEATS);
        EXPECT_EQ(ctx->onset != nullptr, mode != TAVO_MODE_HIGHLIGHT);
        if (ctx->onset != nullptr) {
            EXPECT_EQ(ctx->onset->frame_size, 512);
            EXPECT_EQ(ctx->onset->hop_size, 256);
        }
        int32_t rate = 0, channels = 0;
        int64_t ms = 0;
        EXPECT_EQ(tavo_get_stream(ctx, &rate, &channels, &ms), 0);
        EXPECT_EQ(tavo_get_stream(ctx, nullptr, nullptr, nullptr), 0);
        EXPECT_EQ(rate, 22050);
        EXPECT_EQ(channels, 1);
        EXPECT_EQ(ms, 100'000);
        EXPECT_EQ(tavo_get_tempo(ctx), 0);
        EXPECT_EQ(tavo_has_audio(ctx), 0);
        EXPECT_EQ(_tavo_quit(ctx), 0);  // no job: nothing to stop
        EXPECT_EQ(ctx->quit, 0);
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_EQ(job::last.calls, 0);
    }
}

TEST(Lifecycle, CreationFailsWithOneCode) {
    const struct {
        std::string path;
        uint32_t mutexes, conditions;
    } cases[] = {
        {core_song::path() + ".missing", 0, 0},
        {testing::TempDir(), 0, 0},
        {core_song::path(), 1, 0},
        {core_song::path(), 0, 1},
        {core_song::path(), 2, 0},  // the decoding's
        {core_song::path(), 0, 2},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.path + std::to_string(each.mutexes) + std::to_string(each.conditions));
        refused::mutexes = each.mutexes;
        refused::conditions = each.conditions;
        int32_t err = 99;
        EXPECT_EQ(job::create(each.path, TAVO_MODE_BOTH, &err), nullptr);
        EXPECT_EQ(err, -4);
    }
    refused::mutexes = refused::conditions = 0;
    EXPECT_EQ(tavo_init(nullptr, nullptr), nullptr);
}

TEST(Lifecycle, BadHandlesTouchNothing) {
    TAVO_CTX wrong{};
    memcpy(wrong.magic, "KOVA", 4);
    wrong.state = 1;
    for (TAVO_CTX *ctx : {static_cast<TAVO_CTX *>(nullptr), &wrong}) {
        int32_t rate = 99;
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -4);
        EXPECT_EQ(tavo_get_stream(ctx, &rate, nullptr, nullptr), -4);
        EXPECT_EQ(rate, 99);
        EXPECT_EQ(tavo_get_tempo(ctx), 0);
        EXPECT_EQ(tavo_has_audio(ctx), 0);
        EXPECT_EQ(_tavo_quit(ctx), -4);
        EXPECT_EQ(tavo_deinit(ctx), -4);
    }
    EXPECT_EQ(wrong.state, 1);
    EXPECT_EQ(wrong.quit, 0);
}

TEST(Lifecycle, AJobThatCannotStartLeavesTheInstanceReady) {
    for (int32_t mode : {-1, 3}) {
        TAVO_CTX *ctx = create(mode);
        ASSERT_NE(ctx, nullptr);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -4);
        EXPECT_EQ(ctx->state, 1);
        EXPECT_EQ(tavo_deinit(ctx), 0);
    }
    TAVO_CTX *ctx = create(TAVO_MODE_HIGHLIGHT);
    ASSERT_NE(ctx, nullptr);
    refused::threads = 1;
    EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -2);
    EXPECT_EQ(ctx->state, 1);
    EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
    EXPECT_EQ(job::wait().status, 0);
    EXPECT_EQ(tavo_deinit(ctx), 0);
}

// Inside the callback, where the state is final: no second start, no release; and a release from
// outside waits until the callback has returned.
struct {
    TAVO_CTX *ctx;
    std::atomic<bool> entered, left;
    int32_t deinit_code;
} visit;

void stay_until_waited_for(TAVO_INFO *) {
    visit.deinit_code = tavo_deinit(visit.ctx);
    visit.entered = true;
    while (pthread_mutex_trylock(&tavo_mutex) == 0) {  // held by the tavo_deinit that joins
        pthread_mutex_unlock(&tavo_mutex);
        std::this_thread::yield();
    }
    std::this_thread::sleep_for(
        std::chrono::milliseconds(20));  // a release that does not wait is over
    visit.left = true;
}

TEST(Lifecycle, AJobIsNotStartedTwiceAndReleasedAfterItsCallback) {
    for (int32_t mode : kModes) {
        SCOPED_TRACE(mode);
        TAVO_CTX *ctx = create(mode);
        ASSERT_NE(ctx, nullptr);
        visit.ctx = ctx;
        visit.entered = visit.left = false;
        job::inside = stay_until_waited_for;
        ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -5);
        while (!visit.entered) std::this_thread::yield();
        EXPECT_EQ(visit.deinit_code, -4);
        EXPECT_EQ(load_flag(&ctx->state), 3);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -5);
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_TRUE(visit.left);
        EXPECT_EQ(job::last.calls, 1);
        EXPECT_EQ(job::last.status, 0);
    }
}

const TAVO_CTX *gated = nullptr;
int32_t (*read_behind_gate)(mtsrc_ctx *, int32_t, mtsrc_frame *) = nullptr;

int32_t read_once_stopped(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    while (load_flag(&gated->quit) == 0) std::this_thread::yield();
    return read_behind_gate(src, want, frame);
}

// A stop that arrives while decoding waits for it, then costs the beats but not the highlight. The
// watcher that waits for the end may be refused its thread.
TEST(Lifecycle, AStopDuringDecodingEndsBeforeTheBeats) {
    for (int32_t mode : kModes) {
        for (uint32_t no_watcher : {0u, 1u}) {
            SCOPED_TRACE(testing::Message() << mode << no_watcher);
            TAVO_CTX *ctx = create(mode);
            ASSERT_NE(ctx, nullptr);
            gated = ctx;
            read_behind_gate = ctx->seg[0].src->get_frm;
            for (int32_t i = 0; i < ctx->seg_count; ++i) {
                ctx->seg[i].src->get_frm = read_once_stopped;
            }
            // The job's thread, its four, then the watcher: they come in this order.
            refused::threads = no_watcher << 5;
            ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
            while (refused::threads > no_watcher) std::this_thread::yield();
            if (no_watcher != 0) {
                EXPECT_EQ(_tavo_quit(ctx), 0);
                EXPECT_EQ(load_flag(&ctx->state), mode == TAVO_MODE_HIGHLIGHT ? 3 : 4);
                EXPECT_EQ(refused::threads, 0u);
            }
            EXPECT_EQ(tavo_deinit(ctx), 0);
            EXPECT_EQ(job::last.calls, 1);
            EXPECT_EQ(job::last.status, mode == TAVO_MODE_HIGHLIGHT ? 0 : -1);
            if (mode == TAVO_MODE_BEATS) {
                EXPECT_EQ(job::last.hl_pos, 0);
            } else {
                EXPECT_NEAR(job::last.hl_pos, 41'000, 1000);
            }
            EXPECT_EQ(job::last.beat_count, 0);
            EXPECT_TRUE(job::last.null_beats);
        }
    }
}

}  // namespace
