#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <string>

#include "tests/beat/beat_fixture.h"

namespace {

// Whether a drum is hit within a hop of a time in milliseconds.
bool near_a_hit(float ms, const std::vector<size_t> &hits) {
    return std::any_of(hits.begin(), hits.end(), [&](size_t hit) {
        const double seconds = static_cast<double>(hit) / 11025.0;
        return std::fabs(static_cast<double>(ms) / 1000.0 - seconds) <= kHop;
    });
}

// The tempi of the periods that lie within a frame of a tempo's own.
bool within_a_frame(int32_t bpm, double tempo) {
    const double period = 60.0 / (tempo * kHop);
    return bpm >= std::floor(60.0 / ((period + 1.0) * kHop)) &&
           bpm <= std::floor(60.0 / ((period - 1.0) * kHop));
}

}  // namespace

// Above about 144 BPM the prior favours the half tempo, which a period between two frames may
// outweigh. Beats lie at least 3 s apart up to 95 BPM, or 1 s: 40 s have room for 12 at the
// slowest.
TEST(Beats, DrumsOfKnownTempo) {
    for (const double tempo : {60.0, 72.0, 80.0, 96.0, 110.0, 120.0, 128.0, 160.0, 174.0, 190.0}) {
        analysis of(drum_song(tempo, 40));
        const std::vector<size_t> hits = drum_hits(tempo, 40);
        const int32_t count = getBeatPosition(&of.ctx);
        const int32_t bpm = of.ctx.onset->bpm;
        EXPECT_TRUE(within_a_frame(bpm, tempo) || (tempo > 144 && within_a_frame(bpm, tempo / 2)))
            << tempo << ": " << bpm;
        EXPECT_EQ(of.ctx.state, kStateFinished);
        ASSERT_GE(count, 6) << tempo;

        const std::vector<float> beats = of.beats();
        EXPECT_TRUE(std::is_sorted(beats.begin(), beats.end()));
        for (const float beat : beats) EXPECT_TRUE(near_a_hit(beat, hits)) << tempo << ": " << beat;
    }
}

// The last minute decides, and in a song of more than two minutes the second one. Before and behind
// it are louder drums of another tempo.
TEST(Beats, OneMinuteDecidesTheTempo) {
    for (const std::vector<double> &seconds : {std::vector<double>{50, 60, 0}, {60, 60, 70}}) {
        std::vector<double> song;
        for (size_t k = 0; k < 3; ++k) {
            const bool decides = k == 1;
            for (const double x : drum_song(decides ? 96 : 128, seconds[k])) {
                song.push_back(decides ? x : 4.0 * x);
            }
        }
        analysis of(song);
        getBeatPosition(&of.ctx);
        EXPECT_TRUE(within_a_frame(of.ctx.onset->bpm, 96)) << of.ctx.onset->bpm;
    }
}

// The onset at ten seconds is a beat although only one beat is asked for and much sharper onsets
// follow it.
TEST(Beats, RiseForcesABeat) {
    analysis of(rising_song());
    EXPECT_GT(getBeatPosition(&of.ctx), 1);
    of.ctx.onset->max_beats = 1;
    ASSERT_EQ(getBeatPosition(&of.ctx), 1);
    EXPECT_NEAR(of.beats()[0], 10000.0, 300.0);
}

TEST(Beats, StopBeforeTheEnvelope) {
    analysis of(drum_song(120, 10));
    of.ctx.quit = 1;
    const std::string path = testing::TempDir() + "stopped_" + std::to_string(getpid()) + ".wav";
    fnamedec = path.c_str();
    EXPECT_EQ(getBeatPosition(&of.ctx), 0);
    fnamedec = "";
    EXPECT_NE(unlink(path.c_str()), 0);  // no click track
    EXPECT_EQ(of.ctx.onset->beat_count, 0);
    EXPECT_EQ(of.ctx.onset->bpm, -7);
    EXPECT_EQ(of.ctx.state, kStateRunning);
    EXPECT_EQ(feat_mutex_mt, nullptr);
}

// Silence, and signals too short for an envelope.
TEST(Beats, NothingHasNinetyAndNoBeats) {
    for (const size_t n : {0u, 1u, 255u, 256u, 257u, 511u, 512u, 767u, 20u * 11025u}) {
        analysis of(n < 768 ? noise(n, 10000.0) : std::vector<double>(n));
        EXPECT_EQ(getBeatPosition(&of.ctx), 0) << n;
        EXPECT_EQ(of.ctx.onset->bpm, 90) << n;
        EXPECT_EQ(of.ctx.onset->beat_times, nullptr) << n;
        EXPECT_EQ(of.ctx.state, kStateFinished) << n;
    }
    EXPECT_EQ(getBeatPosition(nullptr), 0);
    clearOnsetCtx(nullptr);
}
