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

using core_song::for_each_mode;
using core_song::kModes;

TEST(Lifecycle, CreationMakesWhatTheModeNeeds) {
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
        int32_t rate = 0, channels = 0;
        int64_t ms = 0;
        EXPECT_EQ(tavo_get_stream(ctx, &rate, &channels, &ms), 0);
        EXPECT_EQ(tavo_get_stream(ctx, nullptr, nullptr, nullptr), 0);
        EXPECT_TRUE(rate == 22050 && channels == 1 && ms == 100'000);
        EXPECT_EQ(tavo_get_tempo(ctx), 0);
        EXPECT_TRUE(tavo_has_audio(ctx) == 0 && tavo_is_complete(ctx) == 0);
        EXPECT_EQ(_tavo_quit(ctx), 0);  // no job: nothing to stop
        EXPECT_EQ(ctx->quit, 0);
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_EQ(job::last.calls, 0);
    });
}

TEST(Lifecycle, CreationFailsWithOneCode) {
    const struct {
        std::string path;
        uint32_t calls;
        int64_t place;  // that fails: the instance's lock, then the decoding's
    } cases[] = {
        {core_song::whole().path + ".missing", fault::kNothing, 0},
        {testing::TempDir(), fault::kNothing, 0},
        {core_song::whole().path, fault::kMutex, 0},
        {core_song::whole().path, fault::kCondition, 0},
        {core_song::whole().path, fault::kMutex, 1},
        {core_song::whole().path, fault::kCondition, 1},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(testing::Message() << each.path << each.calls << each.place);
        fault::arm({each.calls, each.place});
        int32_t err = 99;
        EXPECT_EQ(job::create(each.path, TAVO_MODE_BOTH, &err), nullptr);
        EXPECT_EQ(err, -4);
    }
    fault::disarm();
    EXPECT_EQ(tavo_init(nullptr, nullptr), nullptr);
}

TEST(Probe, ReportsTheStreamOrWhyTheFileIsRefused) {
    const core_song::file short_song(support::make_song({8000, 1, 1.0, 120.0, 1, 0.0}));
    const core_song::file low_rate(support::make_song({7999, 2, 2.0, 120.0, 1, 0.0}));
    const struct {
        std::string path;
        int32_t code;
        TAVO_STREAM stream;
    } cases[] = {
        {core_song::whole().path, TAVO_OK, {22050, 1, 100'000}},
        {short_song.path, TAVO_ERR_SHORT, {8000, 1, 1000}},
        {low_rate.path, TAVO_ERR_LOW_RATE, {7999, 2, 2000}},
        {core_song::whole().path + ".missing", TAVO_ERR_OPEN, {}},
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

TEST(Listener, IsCalledOnceWithTheHostsPointerInsteadOfTheCallback) {
    for_each_mode(kModes, [](int32_t, TAVO_CTX *ctx) {
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
        EXPECT_TRUE(tavo_has_audio(ctx) == 0 && tavo_is_complete(ctx) == 0);
        EXPECT_EQ(tavo_set_listener(ctx, nullptr, nullptr), -4);
        EXPECT_EQ(tavo_get_loudness(ctx, &rate), nullptr);
        EXPECT_EQ(rate, 0);
        EXPECT_EQ(_tavo_quit(ctx), -4);
        EXPECT_EQ(tavo_deinit(ctx), -4);
    }
    EXPECT_TRUE(wrong.state == 1 && wrong.quit == 0);
}

// Its mode is unknown, or the thread is refused.
TEST(Lifecycle, AJobThatCannotStartLeavesTheInstanceReady) {
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
    // By then a release that does not wait has returned.
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
    visit.left = true;
}

void visit_callback_of(TAVO_CTX *ctx) {
    visit.ctx = ctx;
    visit.entered = visit.left = false;
    job::inside = stay_until_waited_for;
}

TEST(Lifecycle, AJobIsNotStartedTwiceAndReleasedAfterItsCallback) {
    for_each_mode(kModes, [](int32_t, TAVO_CTX *ctx) {
        visit_callback_of(ctx);
        fault::plan by = {fault::kThread};  // each thread finds the job running
        by.watch = [] { EXPECT_EQ(load_flag(&visit.ctx->state), 2); };
        fault::arm(by);
        ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -5);
        while (!visit.entered) std::this_thread::yield();
        EXPECT_EQ(visit.deinit_code, -4);
        EXPECT_EQ(load_flag(&ctx->state), 3);
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), -5);
        EXPECT_EQ(tavo_deinit(ctx), 0);
        EXPECT_TRUE(visit.left);
        fault::disarm();
        EXPECT_TRUE(job::last.calls == 1 && job::last.status == 0);
    });
}

int32_t (*read_behind_gate)(mtsrc_ctx *, int32_t, mtsrc_frame *) = nullptr;

int32_t read_once_stopped(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    while (load_flag(&visit.ctx->quit) == 0) std::this_thread::yield();
    return read_behind_gate(src, want, frame);
}

// A stop that arrives while decoding waits for it, then costs the beats but not the highlight. The
// watcher that waits for the end may be refused its thread.
TEST(Lifecycle, AStopDuringDecodingEndsBeforeTheBeats) {
    for (const bool watched : {true, false}) {
        for_each_mode(kModes, [watched](int32_t mode, TAVO_CTX *ctx) {
            SCOPED_TRACE(watched);
            read_behind_gate = ctx->seg[0].src->get_frm;
            for (int32_t i = 0; i < ctx->seg_count; ++i) {
                ctx->seg[i].src->get_frm = read_once_stopped;
            }
            visit_callback_of(ctx);
            // The job's thread, its four, then the watcher: they come in this order.
            fault::arm({fault::kThread, watched ? INT64_MAX : 5});
            ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
            while (fault::met() < 5) std::this_thread::yield();
            if (!watched) {
                EXPECT_EQ(_tavo_quit(ctx), 0);
                EXPECT_EQ(load_flag(&ctx->state), mode == TAVO_MODE_HIGHLIGHT ? 3 : 4);
                EXPECT_EQ(fault::refused(), 1);
            }
            EXPECT_EQ(tavo_deinit(ctx), 0);
            EXPECT_TRUE(visit.left);
            fault::disarm();
            EXPECT_STREQ(job::flaw_of(job::last, mode), nullptr);
            EXPECT_EQ(job::last.status, mode == TAVO_MODE_HIGHLIGHT ? 0 : -1);
            EXPECT_NEAR(job::last.hl_pos, mode == TAVO_MODE_BEATS ? 0 : 41'000, 1000);
        });
    }
}

}  // namespace
