#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>

#include "core/jobs.h"
#include "tests/support/job_harness.h"
#include "tests/support/song.h"

namespace {

std::string write_song(const char *name, const support::song &song) {
    const std::string path = testing::TempDir() + std::to_string(getpid()) + name;
    EXPECT_TRUE(support::write_wav(path, song));
    return path;
}

// Loud from 41 s to 80 s of its 100 s.
const support::song &long_song() {
    static const support::song song = [] {
        support::song_spec plan;
        plan.seconds = 100.0;
        plan.loud_at = 41.0;
        plan.tail_at = 80.0;
        return support::make_song(plan);
    }();
    return song;
}

const std::string &long_song_path() {
    static const std::string path = write_song("tavo_jobs.wav", long_song());
    return path;
}

job::result run(const std::string &path, int32_t mode, int32_t max_beats = 0) {
    TAVO_CTX *ctx = job::create(path, mode);
    EXPECT_NE(ctx, nullptr) << path;
    if (ctx == nullptr) return {};
    EXPECT_EQ(tavo_analyze(ctx, 0, max_beats, 0), 0);
    const job::result result = job::wait();
    EXPECT_EQ(tavo_deinit(ctx), 0);
    EXPECT_EQ(job::last.calls, 1);
    EXPECT_EQ(result.status, 0);
    return result;
}

// Whether a drum is hit within two hops of a time in ms.
bool on_a_hit(float ms) {
    const std::vector<double> &hits = long_song().hits;
    return std::any_of(hits.begin(), hits.end(), [ms](double hit) {
        return std::fabs(hit * 1000.0 - static_cast<double>(ms)) <= 2 * 23.22;
    });
}

TEST(Jobs, HighlightIsWhereTheSongGetsLoud) {
    const job::result result = run(long_song_path(), TAVO_MODE_HIGHLIGHT);
    EXPECT_NEAR(result.hl_pos, 41'000, 400);
    EXPECT_EQ(result.beat_count, 0);
    EXPECT_TRUE(result.null_beats);
}

TEST(Jobs, BeatsFallOnTheDrums) {
    const job::result result = run(long_song_path(), TAVO_MODE_BEATS);
    EXPECT_EQ(result.hl_pos, 0);
    ASSERT_GT(result.beat_count, 20);
    const auto on_hits = std::count_if(result.beats.begin(), result.beats.end(), on_a_hit);
    EXPECT_GE(on_hits * 10, result.beat_count * 9);
    EXPECT_TRUE(std::is_sorted(result.beats.begin(), result.beats.end()));
    // At most 3 by the threshold; the gaps may bring back five each, 50 in all.
    EXPECT_LE(run(long_song_path(), TAVO_MODE_BEATS, 3).beat_count, 53);
}

// Mode 2 equals mode 1 of a file that starts where mode 2's highlight does.
TEST(Jobs, BothIsBeatsOfTheRestOfTheFile) {
    const job::result both = run(long_song_path(), TAVO_MODE_BOTH);
    ASSERT_GT(both.hl_pos, 1000);
    EXPECT_EQ(both.hl_pos % 1000, 0);  // WAV seeks land on whole seconds
    ASSERT_GT(both.beat_count, 5);

    support::song rest = long_song();
    const auto cut =
        static_cast<std::ptrdiff_t>(both.hl_pos) * rest.plan.rate / 1000 * rest.plan.channels;
    rest.pcm.erase(rest.pcm.begin(), rest.pcm.begin() + cut);
    job::result beats = run(write_song("tavo_jobs_rest.wav", rest), TAVO_MODE_BEATS);
    for (float &ms : beats.beats) ms += static_cast<float>(both.hl_pos);
    EXPECT_EQ(both.beats, beats.beats);
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

    std::vector<float> beats[2];
    for (int32_t mode : {TAVO_MODE_BEATS, TAVO_MODE_BOTH}) {
        SCOPED_TRACE(mode);
        TAVO_CTX *ctx = job::create(long_song_path(), mode);
        ASSERT_NE(ctx, nullptr);
        ctx->ana_len = static_cast<int64_t>(song.pcm.size());
        ctx->ana = static_cast<double *>(malloc(song.pcm.size() * sizeof(double)));
        ASSERT_NE(ctx->ana, nullptr);
        std::copy(song.pcm.begin(), song.pcm.end(), ctx->ana);
        if (ctx->hl != nullptr) ctx->hl->hl_pos = 29'980;
        EXPECT_EQ(analyzeOnsetenv(ctx), 0);
        EXPECT_EQ(job::last.calls, 1);
        EXPECT_EQ(job::last.status, 0);
        EXPECT_EQ(job::last.hl_pos, mode == TAVO_MODE_BOTH ? 29'980 : 0);
        beats[mode - 1] = job::last.beats;
        EXPECT_EQ(tavo_deinit(ctx), 0);
    }
    EXPECT_GT(beats[0].size(), 3U);
    for (float &ms : beats[0]) ms += 29'980.0F;
    EXPECT_EQ(beats[0], beats[1]);
}

}  // namespace
