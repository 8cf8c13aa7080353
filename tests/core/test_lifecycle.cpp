#include <atomic>
#include <chrono>
#include <cstring>
#include <thread>

#include "core/instance.h"
#include "core/lifecycle.h"
#include "media_source/mtsrc_ctx.h"
#include "pcm/decode.h"
#include "tests/core/core_song.h"
#include "tests/support/fault_layer.h"

namespace {

// The listener replaces the callback.
TEST(Lifecycle, InstanceHasTheContextsOfItsModeAndCallsItsListener) {
    for_each_mode(kModes, [](int32_t mode, TAVO_CTX *ctx) {
        EXPECT_EQ(memcmp(ctx, "ZEKA", 4), 0);
        EXPECT_EQ(ctx->state, 1);
        EXPECT_EQ(ctx->ana_rate, mode == TAVO_MODE_HIGHLIGHT ? 0 : 11025);
        EXPECT_EQ(ctx->hl != nullptr, mode != TAVO_MODE_BEATS);
        EXPECT_EQ(ctx->onset != nullptr, mode != TAVO_MODE_HIGHLIGHT);
        if (ctx->onset != nullptr) {
            EXPECT_EQ(ctx->onset->frame_size, 512);
            EXPECT_EQ(ctx->onset->hop_size, 256);
        }
        EXPECT_EQ(tavo_get_stream(ctx, nullptr, nullptr, nullptr), 0);
        EXPECT_EQ(tavo_get_tempo(ctx), 0);
        EXPECT_TRUE(tavo_has_audio(ctx) == 0 && tavo_is_complete(ctx) == 0);
        EXPECT_EQ(_tavo_quit(ctx), 0);  // no job to stop
        EXPECT_EQ(ctx->quit, 0);

        std::atomic<int> calls{0};
        const auto count = [](TAVO_INFO *info, void *user) {
            *static_cast<std::atomic<int> *>(user) += info->status == 0 ? 1 : 100;
        };
        EXPECT_EQ(tavo_set_listener(ctx, count, &calls), 0);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
        while (!has_ended(ctx)) std::this_thread::yield();
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_TRUE(calls == 1 && job::last.calls == 0);
    });
}

TEST(Probe, ReportsTheStreamOrWhyTheFileIsRefused) {
    const song_file short_song(support::make_song({8000, 1, 1.0, 120.0, 1, 0.0}));
    const song_file low_rate(support::make_song({7999, 2, 2.0, 120.0, 1, 0.0}));
    const struct {
        std::string path;
        int32_t code;
        TAVO_STREAM stream;
    } cases[] = {
        {whole_song().path, TAVO_OK, {22050, 1, 100'000}},
        {short_song.path, TAVO_ERR_SHORT, {8000, 1, 1000}},
        {low_rate.path, TAVO_ERR_LOW_RATE, {7999, 2, 2000}},
        {whole_song().path + ".missing", TAVO_ERR_OPEN, {}},
        {testing::TempDir(), TAVO_ERR_READ, {}},
        {std::string(TAVO_PATH_BYTES, 'x'), TAVO_ERR_FORMAT, {}},
    };
    for (const auto &row : cases) {
        SCOPED_TRACE(row.path);
        TAVO_STREAM stream = {-1, -1, -1};
        EXPECT_EQ(tavo_probe(row.path.c_str(), &stream), row.code);
        EXPECT_EQ(tavo_probe(row.path.c_str(), nullptr), row.code);
        EXPECT_TRUE(stream.rate == row.stream.rate && stream.channels == row.stream.channels &&
                    stream.duration_ms == row.stream.duration_ms);
        EXPECT_STRNE(tavo_error_text(row.code), tavo_error_text(1));
    }
    EXPECT_EQ(tavo_probe(nullptr, nullptr), TAVO_ERR_HANDLE);
}

TEST(Lifecycle, BadHandlesChangeNothing) {
    TAVO_CTX wrong{};
    memcpy(wrong.magic, "KOVA", 4);
    wrong.state = 1;
    for (TAVO_CTX *ctx : {static_cast<TAVO_CTX *>(nullptr), &wrong}) {
        int32_t rate = 99;
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -4);
        EXPECT_EQ(tavo_get_stream(ctx, &rate, nullptr, nullptr), -4);
        EXPECT_EQ(rate, 99);
        EXPECT_EQ(tavo_get_tempo(ctx), 0);
        EXPECT_TRUE(tavo_has_audio(ctx) == 0 && tavo_is_complete(ctx) == 0);
        EXPECT_EQ(tavo_set_listener(ctx, nullptr, nullptr), -4);
        EXPECT_EQ(tavo_get_loudness(ctx, &rate), nullptr);
        EXPECT_EQ(rate, 0);
        EXPECT_EQ(_tavo_quit(ctx), -4);
        EXPECT_EQ(tavo_deinit(ctx), -4);
    }
    EXPECT_TRUE(wrong.state == 1 && wrong.quit == 0);
    EXPECT_EQ(tavo_init(nullptr, nullptr), nullptr);
}

// A job does not start if its mode is unknown or its thread cannot be started.
TEST(Lifecycle, FailedStartLeavesTheInstanceReady) {
    for_each_mode({-1, 3, TAVO_MODE_HIGHLIGHT}, [](int32_t mode, TAVO_CTX *ctx) {
        fault::arm({fault::kThread, 0});
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), mode == TAVO_MODE_HIGHLIGHT ? -2 : -4);
        fault::disarm();
        EXPECT_EQ(ctx->state, 1);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), mode == TAVO_MODE_HIGHLIGHT ? 0 : -4);
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_EQ(job::last.calls, mode == TAVO_MODE_HIGHLIGHT ? 1 : 0);
    });
}

// Shared by a test and the callback of its job.
struct {
    TAVO_CTX *ctx;
    std::atomic<bool> entered, left;
    int32_t deinit_code;
} callback_state;

void wait_for_tavo_deinit(TAVO_INFO *) {
    callback_state.deinit_code = tavo_deinit(callback_state.ctx);
    callback_state.entered = true;
    while (pthread_mutex_trylock(&tavo_mutex) == 0) {  // until the test's tavo_deinit locks it
        pthread_mutex_unlock(&tavo_mutex);
        std::this_thread::yield();
    }
    // A tavo_deinit that does not wait would return within this time.
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
    callback_state.left = true;
}

void block_callback_of(TAVO_CTX *ctx) {
    callback_state.ctx = ctx;
    callback_state.entered = callback_state.left = false;
    job::during_callback = wait_for_tavo_deinit;
}

// Inside the callback the state is final. The job cannot be started again, the callback cannot
// release the instance, and a release on another thread waits until the callback returns.
TEST(Lifecycle, JobStartsOnceAndIsReleasedAfterItsCallback) {
    for_each_mode(kModes, [](int32_t, TAVO_CTX *ctx) {
        block_callback_of(ctx);
        fault::plan plan = {fault::kThread};  // no call fails, but each checks the state
        plan.on_call = [] { EXPECT_EQ(load_flag(&callback_state.ctx->state), 2); };
        fault::arm(plan);
        ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -5);
        while (!callback_state.entered) std::this_thread::yield();
        EXPECT_EQ(callback_state.deinit_code, -4);
        EXPECT_EQ(load_flag(&ctx->state), 3);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -5);
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_TRUE(callback_state.left);
        fault::disarm();
        EXPECT_TRUE(job::last.calls == 1 && job::last.status == 0);
    });
}

int32_t (*original_get_frm)(mtsrc_ctx *, int32_t, mtsrc_frame *) = nullptr;

int32_t read_after_stop(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    while (load_flag(&callback_state.ctx->quit) == 0) std::this_thread::yield();
    return original_get_frm(src, want, frame);
}

// A stop during decoding skips only the beats, even if the thread that awaits the job cannot start.
TEST(Lifecycle, StopDuringDecodingSkipsTheBeats) {
    for (const bool watched : {true, false}) {
        for_each_mode(kModes, [watched](int32_t mode, TAVO_CTX *ctx) {
            SCOPED_TRACE(watched);
            original_get_frm = ctx->seg[0].src->get_frm;
            for (int32_t i = 0; i < ctx->seg_count; ++i) ctx->seg[i].src->get_frm = read_after_stop;
            block_callback_of(ctx);
            // Threads start in this order: the job, four decoders, the one that awaits the job.
            fault::arm({fault::kThread, watched ? INT64_MAX : 5});
            ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
            while (fault::counted_calls < 5) std::this_thread::yield();
            if (!watched) {
                EXPECT_EQ(_tavo_quit(ctx), 0);
                EXPECT_EQ(load_flag(&ctx->state), mode == TAVO_MODE_HIGHLIGHT ? 3 : 4);
                EXPECT_EQ(fault::failed_calls, 1);
            }
            EXPECT_EQ(tavo_deinit(ctx), 0);
            EXPECT_TRUE(callback_state.left);
            fault::disarm();
            EXPECT_STREQ(job::find_inconsistency(job::last, mode), nullptr);
            EXPECT_EQ(job::last.status, mode == TAVO_MODE_HIGHLIGHT ? 0 : -1);
            EXPECT_NEAR(job::last.hl_pos, mode == TAVO_MODE_BEATS ? 0 : 41'000, 1000);
        });
    }
}

}  // namespace
