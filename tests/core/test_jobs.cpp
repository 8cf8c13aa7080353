#include <algorithm>
#include <cmath>

#include "common/alloc.h"
#include "core/jobs.h"
#include "media_source/mtsrc_ctx.h"
#include "pcm/decode.h"
#include "tests/core/core_song.h"

namespace {

job::result run(const std::string &path, int32_t mode, int32_t max_beats = 0) {
    TAVO_CTX *ctx = job::create(path, mode);
    EXPECT_EQ(tavo_analyze(ctx, 20, max_beats, 5), 0);
    const job::result result = job::wait();
    EXPECT_EQ(ctx->hl != nullptr ? ctx->hl->hl_param : 20, 20);
    EXPECT_EQ(ctx->onset != nullptr ? ctx->onset->max_beats : max_beats, max_beats);
    EXPECT_EQ(ctx->onset != nullptr ? ctx->onset->beat_param2 : 5, 5);
    EXPECT_TRUE(tavo_has_audio(ctx) == 1 && tavo_is_complete(ctx) == 1);
    int32_t points = -1;
    const float *loudness = tavo_get_loudness(ctx, &points);
    EXPECT_EQ(loudness != nullptr, mode != TAVO_MODE_BEATS);
    EXPECT_EQ(points, mode != TAVO_MODE_BEATS ? (100 - 6) / 2 + 1 : 0);
    EXPECT_TRUE(loudness == nullptr || loudness[45 / 2] > 2 * loudness[35 / 2]);
    EXPECT_NEAR(tavo_get_tempo(ctx), mode == TAVO_MODE_HIGHLIGHT ? 0 : 120, 3);  // rounded period
    EXPECT_EQ(tavo_deinit(ctx), 0);
    EXPECT_STREQ(job::find_inconsistency(job::last, mode), nullptr);
    EXPECT_EQ(result.status, 0);
    return result;
}

TEST(Jobs, HighlightIsWhereTheSongGetsLoud) {
    EXPECT_NEAR(run(whole_song().path, TAVO_MODE_HIGHLIGHT).hl_pos, 41'000, 400);
}

TEST(Jobs, BeatsFallOnTheDrums) {
    const job::result result = run(whole_song().path, TAVO_MODE_BEATS);
    EXPECT_EQ(result.hl_pos, 0);
    ASSERT_GT(result.beat_count, 20);
    int32_t on_hits = 0;  // beats within two hops of a drum hit
    for (const float ms : result.beats) {
        for (const double hit : whole_song().song.hits)
            on_hits += std::fabs(hit * 1000.0 - static_cast<double>(ms)) <= 2 * 23.22 ? 1 : 0;
    }
    EXPECT_GE(on_hits * 10, result.beat_count * 9);
}

// Mode 2 finds the same beats as mode 1 does in a copy of the song that starts at the highlight.
TEST(Jobs, BothFindsTheBeatsOfTheRestOfTheFile) {
    const job::result both = run(whole_song().path, TAVO_MODE_BOTH, 7);
    ASSERT_GT(both.hl_pos, 1000);
    EXPECT_EQ(both.hl_pos % 1000, 0);  // WAV seeks reach whole seconds

    support::song rest = whole_song().song;
    rest.pcm.erase(rest.pcm.begin(), rest.pcm.begin() + both.hl_pos / 1000 * rest.plan.rate);
    job::result beats = run(song_file(rest).path, TAVO_MODE_BEATS, 7);
    for (float &ms : beats.beats) ms += static_cast<float>(both.hl_pos);
    EXPECT_EQ(both.beats, beats.beats);
}

int32_t read_nothing(mtsrc_ctx *, int32_t, mtsrc_frame *) {
    return TAVO_ERR_READ;
}

// Only the modes with beats report a failure. If only the conversion fails, a highlight is found.
TEST(Jobs, FailuresAreReportedInTheModesWithBeats) {
    for (const bool decodes : {false, true}) {
        for_each_mode(kModes, [decodes](int32_t mode, TAVO_CTX *ctx) {
            SCOPED_TRACE(decodes);
            for (int32_t i = 0; i < ctx->seg_count && !decodes; ++i) {
                ctx->seg[i].src->get_frm = read_nothing;
            }
            if (decodes) ctx->ana_rate = -1;  // an invalid rate, so the conversion fails
            EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
            const job::result result = job::wait();
            EXPECT_EQ(result.status, mode == TAVO_MODE_HIGHLIGHT ? 0 : -1);
            EXPECT_NEAR(result.hl_pos, decodes && mode != TAVO_MODE_BEATS ? 41'000 : 0, 400);
            EXPECT_STREQ(job::find_inconsistency(result, mode), nullptr);
            EXPECT_EQ(tavo_has_audio(ctx), decodes);
            EXPECT_EQ(tavo_is_complete(ctx), decodes);
            EXPECT_EQ(tavo_get_tempo(ctx), 0);
            EXPECT_EQ(tavo_deinit(ctx), 0);
        });
    }
}

// The test stores an analysis signal and calls the beat analysis directly. Mode 2 adds the
// highlight's start to the beats. Mode 0, which has no onset context, reports a failure.
TEST(Jobs, BeatAnalysisAloneReportsInEveryMode) {
    const support::song song = support::make_song({11025, 1, 20.0, 120.0, 1, 0.0});
    std::vector<float> beats[3];
    for_each_mode(kModes, [&song, &beats](int32_t mode, TAVO_CTX *ctx) {
        ctx->ana_len = static_cast<int64_t>(song.pcm.size());
        ctx->ana = zeroed_items<double>(ctx->ana_len);
        double *signal = ctx->ana;
        std::copy(song.pcm.begin(), song.pcm.end(), signal);
        if (ctx->hl != nullptr) ctx->hl->hl_pos = 29'980;
        EXPECT_EQ(analyzeOnsetenv(ctx), 0);
        EXPECT_EQ(job::last.calls, 1);
        EXPECT_EQ(job::last.status, mode == TAVO_MODE_HIGHLIGHT ? -1 : 0);
        EXPECT_EQ(ctx->state, mode == TAVO_MODE_HIGHLIGHT ? 4 : 3);
        EXPECT_EQ(job::last.hl_pos, mode == TAVO_MODE_BOTH ? 29'980 : 0);
        beats[mode] = job::last.beats;
        ctx->ana_len = 0;  // a second analysis, which finds nothing
        EXPECT_EQ(analyzeOnsetenv(ctx), 0);
        EXPECT_TRUE(job::last.status == -1 && job::last.beat_count == 0 && job::last.null_beats);
        if (mode == TAVO_MODE_HIGHLIGHT) free(signal);  // in this mode the instance does not own it
        EXPECT_EQ(tavo_deinit(ctx), 0);
    });
    EXPECT_TRUE(beats[0].empty() && beats[1].size() > 3);
    for (float &ms : beats[1]) ms += 29'980.0f;
    EXPECT_EQ(beats[1], beats[2]);
}

}  // namespace
