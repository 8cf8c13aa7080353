#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <thread>

#include "core/lifecycle.h"
#include "media_source/mtsrc_ctx.h"
#include "pcm/decode.h"
#include "tests/support/job_harness.h"
#include "tests/support/song.h"

namespace {

constexpr int32_t kModes[] = {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH};

// One song for all cases: 24 s at 120 BPM, loud from 8 s on.
TAVO_CTX *create(int32_t mode) {
    static const std::string path = [] {
        support::song_spec plan;
        plan.seconds = 24.0;
        plan.rate = 22050;
        plan.loud_at = 8.0;
        plan.tail_at = 22.0;
        const std::string name =
            testing::TempDir() + "tavo_lifecycle" + std::to_string(getpid()) + ".wav";
        EXPECT_TRUE(support::write_wav(name, support::make_song(plan)));
        return name;
    }();
    int32_t err = 99;
    TAVO_CTX *ctx = job::create(path, mode, &err);
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
        EXPECT_EQ(ctx->seg_count, 4);
        EXPECT_EQ(ctx->duration, 240'000'000);
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_EQ(job::last.calls, 0);
    }
}

TEST(Lifecycle, UnusableFilesAreOneCode) {
    for (const std::string &path : {testing::TempDir() + "tavo_missing.wav", testing::TempDir()}) {
        int32_t err = 99;
        EXPECT_EQ(job::create(path, TAVO_MODE_BOTH, &err), nullptr) << path;
        EXPECT_EQ(err, -4) << path;
    }
}

TEST(Lifecycle, BadHandlesTouchNothing) {
    TAVO_CTX wrong{};
    memcpy(wrong.magic, "KOVA", 4);
    wrong.state = 1;
    for (TAVO_CTX *ctx : {static_cast<TAVO_CTX *>(nullptr), &wrong}) {
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -4);
        EXPECT_EQ(_tavo_quit(ctx), -4);
        EXPECT_EQ(tavo_deinit(ctx), -4);
    }
    EXPECT_EQ(wrong.state, 1);
    EXPECT_EQ(wrong.quit, 0);
}

TEST(Lifecycle, UnknownModeStartsNothing) {
    for (int32_t mode : {-1, 3}) {
        TAVO_CTX *ctx = create(mode);
        ASSERT_NE(ctx, nullptr);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -4);
        EXPECT_EQ(ctx->state, 1);
        EXPECT_EQ(tavo_deinit(ctx), 0);
    }
}

// While a job runs and in its callback, before which the final state is set: no second start, and
// a release waits for the callback.
TEST(Lifecycle, AJobIsNotStartedTwiceAndReleasedAfterItsCallback) {
    for (int32_t mode : kModes) {
        SCOPED_TRACE(mode);
        TAVO_CTX *ctx = create(mode);
        ASSERT_NE(ctx, nullptr);
        job::hold = true;
        ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -5);
        EXPECT_EQ(job::wait().status, 0);
        EXPECT_EQ(load_flag(&ctx->state), 3);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -5);
        bool released = false;
        std::thread releaser([&released] {
            std::this_thread::sleep_for(std::chrono::milliseconds(30));
            released = true;
            job::release();
        });
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_TRUE(released);
        releaser.join();
        EXPECT_EQ(job::last.calls, 1);
    }
}

const TAVO_CTX *gated = nullptr;
int32_t (*read_behind_gate)(mtsrc_ctx *, int32_t, mtsrc_frame *) = nullptr;

int32_t read_once_stopped(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    while (load_flag(&gated->quit) == 0) std::this_thread::yield();
    return read_behind_gate(src, want, frame);
}

// A stop that arrives while decoding waits for it, then costs the beats but not the highlight.
TEST(Lifecycle, StopDuringDecodingEndsBeforeTheBeats) {
    for (int32_t mode : kModes) {
        SCOPED_TRACE(mode);
        TAVO_CTX *ctx = create(mode);
        ASSERT_NE(ctx, nullptr);
        gated = ctx;
        read_behind_gate = ctx->seg[0].src->get_frm;
        for (int32_t i = 0; i < ctx->seg_count; ++i) ctx->seg[i].src->get_frm = read_once_stopped;
        ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_EQ(job::last.calls, 1);
        EXPECT_EQ(job::last.status, mode == TAVO_MODE_HIGHLIGHT ? 0 : -1);
        EXPECT_EQ(job::last.beat_count, 0);
        EXPECT_TRUE(job::last.null_beats);
    }
}

}  // namespace
