#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <thread>

#include "beat/beats.h"
#include "tests/beat/beat_fixture.h"

namespace {

// Distance of a time to the nearest drum hit, in hops.
double hops_to_hit(double ms, const std::vector<size_t> &hits) {
    double nearest = 1e9;
    for (const size_t hit : hits) {
        nearest = std::min(nearest, std::fabs(ms / 1000.0 - static_cast<double>(hit) / 11025.0));
    }
    return nearest / kHop;
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
        for (const float beat : beats) {
            EXPECT_LE(hops_to_hit(static_cast<double>(beat), hits), 1.0) << tempo << ": " << beat;
        }
    }
}

TEST(Beats, MaxBeats) {
    analysis of(drum_song(120, 30));
    const int32_t all = getBeatPosition(&of.ctx);
    of.ctx.onset->max_beats = 3;
    const int32_t some = getBeatPosition(&of.ctx);
    EXPECT_LT(some, all);
    EXPECT_LE(some, 3 + 50);
    for (const int32_t none : {-1, INT32_MIN, INT32_MAX}) {
        of.ctx.onset->max_beats = none;
        EXPECT_EQ(getBeatPosition(&of.ctx), all);
    }
}

// Ten seconds of a quiet drum, then ten loud ones: the onset at ten seconds is a beat although only
// one beat is asked for and much sharper onsets follow it.
TEST(Beats, RiseForcesABeat) {
    std::vector<double> song = drum_song(120, 24);
    const std::vector<double> hiss = noise(song.size(), 1.0, 9);
    const size_t rise = 10 * 11025;
    for (size_t i = 0; i < song.size(); ++i) song[i] *= i < rise ? 0.05 : 1.0;
    for (size_t i = rise; i < song.size(); ++i) song[i] += 16000.0 * hiss[i];
    analysis of(song);
    of.ctx.onset->max_beats = 1;
    ASSERT_EQ(getBeatPosition(&of.ctx), 1);
    EXPECT_NEAR(of.beats()[0], 10000.0, 300.0);
}

TEST(Beats, StopBeforeTheEnvelope) {
    analysis of(drum_song(120, 10));
    of.ctx.quit = 1;
    fnamedec = "stopped_analysis.wav";
    EXPECT_EQ(getBeatPosition(&of.ctx), 0);
    FILE *file = fopen(fnamedec, "rb");
    fnamedec = "";
    EXPECT_EQ(file, nullptr);
    if (file != nullptr) fclose(file);
    EXPECT_EQ(of.ctx.onset->beat_count, 0);
    EXPECT_EQ(of.ctx.onset->bpm, -7);
    EXPECT_EQ(of.ctx.state, kStateRunning);
    EXPECT_EQ(feat_mutex_mt, nullptr);
}

// A stop from another thread at any moment leaves all of the beats or none.
TEST(Beats, StopAtAnyMoment) {
    analysis of(drum_song(120, 20));
    const int32_t all = getBeatPosition(&of.ctx);
    for (int delay = 0; delay < 12; ++delay) {
        of.ctx.state = kStateRunning;
        store_flag(&of.ctx.quit, 0);
        std::thread stopper([&] {
            std::this_thread::sleep_for(std::chrono::milliseconds(delay));
            store_flag(&of.ctx.quit, 1);
        });
        const int32_t count = getBeatPosition(&of.ctx);
        stopper.join();
        EXPECT_EQ(count, of.ctx.state == kStateFinished ? all : 0);
    }
}

TEST(Beats, SilenceHasNinetyAndNoBeats) {
    analysis of(std::vector<double>(20 * 11025));
    EXPECT_EQ(getBeatPosition(&of.ctx), 0);
    EXPECT_EQ(of.ctx.onset->bpm, 90);
    EXPECT_EQ(of.ctx.onset->beat_times, nullptr);
    EXPECT_EQ(of.ctx.state, kStateFinished);
}

TEST(Beats, TooShortForAnEnvelope) {
    for (const size_t n : {0u, 1u, 255u, 256u, 257u, 511u, 512u, 767u}) {
        analysis of(noise(n, 10000.0));
        EXPECT_EQ(getBeatPosition(&of.ctx), 0) << n;
        EXPECT_EQ(of.ctx.onset->bpm, 90) << n;
        EXPECT_EQ(of.ctx.state, kStateFinished) << n;
    }
    EXPECT_EQ(getBeatPosition(nullptr), 0);
    clearOnsetCtx(nullptr);
}

// Short, extreme and slow signals, for the checks of a sanitised build; beats lie in the signal.
TEST(Beats, EveryLengthAndExtreme) {
    const auto check = [](const std::vector<double> &samples) {
        analysis of(samples);
        const int32_t count = getBeatPosition(&of.ctx);
        EXPECT_EQ(of.ctx.state, kStateFinished);
        EXPECT_GE(of.ctx.onset->bpm, 30);
        EXPECT_LE(of.ctx.onset->bpm, 200);
        const std::vector<float> beats = of.beats();
        ASSERT_EQ(static_cast<int32_t>(beats.size()), count);
        EXPECT_TRUE(std::is_sorted(beats.begin(), beats.end()));
        const double end = static_cast<double>(samples.size()) / 11.025;
        for (const float beat : beats) EXPECT_TRUE(beat > 0.0f && static_cast<double>(beat) < end);
    };
    for (size_t n = 768; n < 16000; n += 509) check(noise(n, 32767.0));
    check(std::vector<double>(60000, -32768.0));
    for (double seconds = 1.0; seconds <= 8.0; seconds += 0.31) {
        check(noise(static_cast<size_t>(seconds * 11025), 32767.0));
        for (const double tempo : {31.0, 38.0, 46.0, 55.0}) check(drum_song(tempo, seconds));
    }
    std::vector<double> square(100000);
    for (size_t i = 0; i < square.size(); ++i) square[i] = i / 3000 % 2 == 0 ? 32767.0 : -32768.0;
    check(square);
}
