#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "common/alloc.h"
#include "core/jobs.h"
#include "media_source/mtsrc_ctx.h"
#include "pcm/decode.h"
#include "tests/core/core_song.h"
#include "tests/support/job_harness.h"

namespace {

job::result run(const std::string &path, int32_t mode, int32_t max_beats = 0) {
    TAVO_CTX *ctx = job::create(path, mode);
    EXPECT_NE(ctx, nullptr) << path;
    if (ctx == nullptr) return {};
    EXPECT_EQ(tavo_analyze(ctx, 20, max_beats, 5), 0);
    const job::result result = job::wait();
    EXPECT_EQ(ctx->hl != nullptr ? ctx->hl->hl_param : 20, 20);
    if (ctx->onset != nullptr) {
        EXPECT_EQ(ctx->onset->max_beats, max_beats);
        EXPECT_EQ(ctx->onset->beat_param2, 5);
    }
    EXPECT_EQ(tavo_has_audio(ctx), 1);
    // The nearest periods of whole frames are 21 and 22, 123 and 117 BPM.
    EXPECT_NEAR(tavo_get_tempo(ctx), mode == TAVO_MODE_HIGHLIGHT ? 0 : 120, 3);
    EXPECT_EQ(tavo_deinit(ctx), 0);
    EXPECT_EQ(job::last.calls, 1);
    EXPECT_EQ(result.status, 0);
    return result;
}

// Whether a drum is hit within two hops of a time in ms.
bool on_a_hit(float ms) {
    const std::vector<double> &hits = core_song::samples().hits;
    return std::any_of(hits.begin(), hits.end(), [ms](double hit) {
        return std::fabs(hit * 1000.0 - static_cast<double>(ms)) <= 2 * 23.22;
    });
}

TEST(Jobs, HighlightIsWhereTheSongGetsLoud) {
    const job::result result = run(core_song::path(), TAVO_MODE_HIGHLIGHT);
    EXPECT_NEAR(result.hl_pos, 41'000, 400);
    EXPECT_EQ(result.beat_count, 0);
    EXPECT_TRUE(result.null_beats);
}

TEST(Jobs, BeatsFallOnTheDrums) {
    const job::result result = run(core_song::path(), TAVO_MODE_BEATS);
    EXPECT_EQ(result.hl_pos, 0);
    ASSERT_GT(result.beat_count, 20);
    const auto on_hits = std::count_if(result.beats.begin(), result.beats.end(), on_a_hit);
    EXPECT_GE(on_hits * 10, result.beat_count * 9);
    EXPECT_TRUE(std::is_sorted(result.beats.begin(), result.beats.end()));
}

// Mode 2 equals mode 1 of a file that starts where mode 2's highlight does.
TEST(Jobs, BothIsBeatsOfTheRestOfTheFile) {
    const job::result both = run(core_song::path(), TAVO_MODE_BOTH, 7);
    ASSERT_GT(both.hl_pos, 1000);
    EXPECT_EQ(both.hl_pos % 1000, 0);  // WAV seeks land on whole seconds
    ASSERT_GT(both.beat_count, 5);

    support::song rest = core_song::samples();
    const auto cut = static_cast<std::ptrdiff_t>(both.hl_pos) * rest.plan.rate / 1000;
    rest.pcm.erase(rest.pcm.begin(), rest.pcm.begin() + cut);
    const core_song::file file(rest);
    job::result beats = run(file.path, TAVO_MODE_BEATS, 7);
    for (float &ms : beats.beats) ms += static_cast<float>(both.hl_pos);
    EXPECT_EQ(both.beats, beats.beats);
}

int32_t read_nothing(mtsrc_ctx *, int32_t, mtsrc_frame *) {
    return TAVO_ERR_READ;
}

// Only modes 1 and 2 have a failure to report; the host of mode 0 asks for the audio.
TEST(Jobs, AFileThatCannotBeDecodedEndsInEveryMode) {
    for (int32_t mode : {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH}) {
        SCOPED_TRACE(mode);
        TAVO_CTX *ctx = job::create(core_song::path(), mode);
        ASSERT_NE(ctx, nullptr);
        for (int32_t i = 0; i < ctx->seg_count; ++i) ctx->seg[i].src->get_frm = read_nothing;
        EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
        const job::result result = job::wait();
        EXPECT_EQ(result.status, mode == TAVO_MODE_HIGHLIGHT ? 0 : -1);
        EXPECT_EQ(result.hl_pos, 0);
        EXPECT_EQ(tavo_has_audio(ctx), 0);
        EXPECT_EQ(tavo_get_tempo(ctx), 0);
        EXPECT_EQ(tavo_deinit(ctx), 0);
    }
}

// The beat analysis alone, on an analysis signal put into the instance, returns to its caller. In
// mode 2 it shifts the beats by the highlight start; without an onset context it reports a failure.
TEST(Jobs, BeatAnalysisAloneReportsInEveryMode) {
    support::song_spec plan;
    plan.rate = 11025;
    plan.channels = 1;
    plan.seconds = 20.0;
    plan.loud_at = 0.0;
    const support::song song = support::make_song(plan);

    std::vector<float> beats[3];
    for (int32_t mode : {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH}) {
        SCOPED_TRACE(mode);
        TAVO_CTX *ctx = job::create(core_song::path(), mode);
        ASSERT_NE(ctx, nullptr);
        double *signal = zeroed_items<double>(static_cast<int64_t>(song.pcm.size()));
        ASSERT_NE(signal, nullptr);
        std::copy(song.pcm.begin(), song.pcm.end(), signal);
        ctx->ana_len = static_cast<int64_t>(song.pcm.size());
        ctx->ana = signal;
        if (ctx->hl != nullptr) ctx->hl->hl_pos = 29'980;
        EXPECT_EQ(analyzeOnsetenv(ctx), 0);
        EXPECT_EQ(job::last.calls, 1);
        EXPECT_EQ(job::last.status, mode == TAVO_MODE_HIGHLIGHT ? -1 : 0);
        EXPECT_EQ(ctx->state, mode == TAVO_MODE_HIGHLIGHT ? 4 : 3);
        EXPECT_EQ(job::last.hl_pos, mode == TAVO_MODE_BOTH ? 29'980 : 0);
        beats[mode] = job::last.beats;
        if (mode == TAVO_MODE_HIGHLIGHT) free(signal);  // not the instance's to release there
        EXPECT_EQ(tavo_deinit(ctx), 0);
    }
    EXPECT_TRUE(beats[0].empty());
    EXPECT_GT(beats[1].size(), 3u);
    for (float &ms : beats[1]) ms += 29'980.0f;
    EXPECT_EQ(beats[1], beats[2]);
}

}  // namespace
