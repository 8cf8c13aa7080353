#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <cstring>

#include "core/jobs.h"
#include "job_harness.h"
#include "media_source/mtsrc_ctx.h"
#include "pcm/decode.h"
#include "tests/support/song.h"

namespace {

std::string write_song(const char *name, const support::song &song) {
    const std::string path = testing::TempDir() + name;
    EXPECT_TRUE(support::write_wav(path, song));
    return path;
}

support::song minute_song() {
    support::song_spec plan;
    plan.seconds = 100.0;
    plan.loud_at = 41.0;
    plan.tail_at = 80.0;
    return support::make_song(plan);
}

job::result run(const std::string &path, int32_t mode, int32_t length = 0, int32_t max_beats = 0) {
    int32_t err = 99;
    TAVO_CTX *ctx = job::create(path, mode, &err);
    EXPECT_NE(ctx, nullptr) << path;
    if (ctx == nullptr) return {};
    EXPECT_EQ(tavo_analyze(ctx, length, max_beats, 0), 0);
    const job::result result = job::wait();
    EXPECT_EQ(tavo_deinit(ctx), 0);
    EXPECT_EQ(job::last.calls, 1);
    return result;
}

// Distance from a time in ms to the nearest drum hit.
double to_nearest_hit(const support::song &song, double ms) {
    double nearest = 1e9;
    for (double hit : song.hits) nearest = std::min(nearest, std::fabs(hit * 1000.0 - ms));
    return nearest;
}

TEST(Jobs, HighlightIsWhereTheSongGetsLoud) {
    const support::song song = minute_song();
    const std::string path = write_song("tavo_jobs_hl.wav", song);
    const job::result result = run(path, TAVO_MODE_HIGHLIGHT);
    EXPECT_EQ(result.status, 0);
    EXPECT_NEAR(result.hl_pos, 41'000, 400);
    EXPECT_EQ(result.beat_count, 0);
    EXPECT_TRUE(result.null_beats);
    for (int i = 0; i < 5; ++i) {
        EXPECT_EQ(run(path, TAVO_MODE_HIGHLIGHT).hl_pos, result.hl_pos);
    }
}

TEST(Jobs, BeatsFallOnTheDrums) {
    const support::song song = minute_song();
    const std::string path = write_song("tavo_jobs_beats.wav", song);
    const job::result result = run(path, TAVO_MODE_BEATS);
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.hl_pos, 0);
    ASSERT_GT(result.beat_count, 20);
    int on_hit = 0;
    for (float ms : result.beats) on_hit += to_nearest_hit(song, ms) <= 2 * 23.22;
    EXPECT_GE(on_hit * 10, result.beat_count * 9);
    for (size_t i = 1; i < result.beats.size(); ++i) {
        EXPECT_LE(result.beats[i - 1], result.beats[i]);
    }
    // At most 3 by the threshold; the gaps may bring back five each, 50 in all.
    EXPECT_LE(run(path, TAVO_MODE_BEATS, 0, 3).beat_count, 53);
}

// Mode 2 equals mode 1 of a file that starts where mode 2's highlight does.
TEST(Jobs, BothIsBeatsOfTheRestOfTheFile) {
    const support::song song = minute_song();
    const job::result both = run(write_song("tavo_jobs_both.wav", song), TAVO_MODE_BOTH);
    EXPECT_EQ(both.status, 0);
    ASSERT_GT(both.hl_pos, 1000);
    EXPECT_EQ(both.hl_pos % 1000, 0);  // WAV seeks land on whole seconds
    ASSERT_GT(both.beat_count, 5);

    support::song rest = song;
    const auto cut =
        static_cast<std::ptrdiff_t>(both.hl_pos) * song.plan.rate / 1000 * song.plan.channels;
    rest.pcm.erase(rest.pcm.begin(), rest.pcm.begin() + cut);
    const job::result beats = run(write_song("tavo_jobs_rest.wav", rest), TAVO_MODE_BEATS);
    ASSERT_EQ(beats.beat_count, both.beat_count);
    for (size_t i = 0; i < both.beats.size(); ++i) {
        EXPECT_EQ(both.beats[i], beats.beats[i] + static_cast<float>(both.hl_pos));
        EXPECT_GE(both.beats[i], static_cast<float>(both.hl_pos));
    }
}

int32_t failing_read(mtsrc_ctx *, int32_t, mtsrc_frame *) {
    return -6;
}

// A file that decodes to nothing still runs its analyses and reports once.
TEST(Jobs, NothingDecodedIsReportedByMode) {
    const std::string path = write_song("tavo_jobs_none.wav", minute_song());
    const int32_t status[] = {0, -1, -1};
    const int32_t state[] = {3, 4, 4};
    for (int32_t mode = 0; mode <= 2; ++mode) {
        int32_t err = 99;
        TAVO_CTX *ctx = job::create(path, mode, &err);
        ASSERT_NE(ctx, nullptr);
        for (int32_t i = 0; i < ctx->seg_count; ++i) ctx->seg[i].src->get_frm = failing_read;
        ASSERT_EQ(tavo_analyze(ctx, 30, 0, 0), 0);
        const job::result result = job::wait();
        EXPECT_EQ(result.status, status[mode]);
        EXPECT_EQ(result.hl_pos, 0);
        EXPECT_EQ(result.beat_count, 0);
        EXPECT_TRUE(result.null_beats);
        EXPECT_EQ(load_flag(&ctx->state), state[mode]);
        EXPECT_EQ(tavo_deinit(ctx), 0);
    }
}

// The beat analysis alone, on an analysis signal put into the instance: returns to its caller, and
// in mode 2 shifts the beats by the highlight start.
TEST(Jobs, BeatAnalysisAloneShiftsInMode2) {
    support::song_spec plan;
    plan.rate = 11025;
    plan.channels = 1;
    plan.seconds = 20.0;
    plan.loud_at = 0.0;
    const support::song song = support::make_song(plan);
    const std::string path = write_song("tavo_jobs_alone.wav", song);

    std::vector<float> beats[2];
    for (int32_t mode : {TAVO_MODE_BEATS, TAVO_MODE_BOTH}) {
        int32_t err = 99;
        TAVO_CTX *ctx = job::create(path, mode, &err);
        ASSERT_NE(ctx, nullptr);
        ctx->ana_len = static_cast<int64_t>(song.pcm.size());
        ctx->ana = static_cast<double *>(malloc(song.pcm.size() * sizeof(double)));
        ASSERT_NE(ctx->ana, nullptr);
        for (size_t i = 0; i < song.pcm.size(); ++i) ctx->ana[i] = song.pcm[i];
        if (ctx->hl != nullptr) ctx->hl->hl_pos = 29'980;
        EXPECT_EQ(analyzeOnsetenv(ctx), 0);
        EXPECT_EQ(job::last.calls, 1);
        EXPECT_EQ(job::last.status, 0);
        EXPECT_EQ(job::last.hl_pos, mode == TAVO_MODE_BOTH ? 29'980 : 0);
        beats[mode - 1] = job::last.beats;
        EXPECT_EQ(tavo_deinit(ctx), 0);
    }
    ASSERT_GT(beats[0].size(), 3U);
    ASSERT_EQ(beats[0].size(), beats[1].size());
    for (size_t i = 0; i < beats[0].size(); ++i) EXPECT_EQ(beats[1][i], beats[0][i] + 29'980.0F);
}

}  // namespace
