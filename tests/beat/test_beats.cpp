// Whole analyses of songs made of known beats.
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <iterator>
#include <string>

#include "beat/click_track.h"
#include "tests/beat/beat_fixture.h"

namespace {

using namespace std::string_literals;

int starts_until_stop = INT32_MAX;  // thread starts, with the one at which a stop arrives
int32_t *stop_flag = nullptr;

// Struck bells, each heard until the next, no two equally loud. They fade ever more slowly and in
// all bands alike, so that the envelope has its peaks at the hits alone. hits: their samples.
std::vector<double> drum_song(double bpm, double seconds, double loudness = 1.0,
                              std::vector<size_t> *hits = nullptr) {
    std::vector<double> song(static_cast<size_t>(seconds * kAnalysisRate));
    std::mt19937 random(4);
    double height = 0.0;
    size_t hit = 0;
    double next = 0.25;
    for (size_t i = 0; i < song.size(); ++i) {
        if (next + 0.2 < seconds && i == static_cast<size_t>(next * kAnalysisRate)) {
            height = loudness * (1500.0 + 500.0 * uniform(&random));
            hit = i;
            next += 60.0 / bpm;
            if (hits != nullptr) hits->push_back(hit);
        }
        const double t = static_cast<double>(i - hit) / kAnalysisRate;
        for (double hz = 150.0; hz < 5500.0 && height > 0.0; hz += 250.0)
            song[i] += height * cos(6.283185307179586 * hz * t) / (1.0 + t / 0.1);
    }
    return song;
}

// Whether a tempo's period lies within a frame of another tempo's.
bool within_a_frame(int32_t bpm, double tempo) {
    const double period = 60.0 / (tempo * kHop);
    return bpm >= std::floor(60.0 / ((period + 1.0) * kHop)) &&
           bpm <= std::floor(60.0 / ((period - 1.0) * kHop));
}

// Runs an analysis with a click track and gives the file, empty when there is none.
std::string analyse_to_file(analysis *of) {
    const std::string path = testing::TempDir() + "click_" + std::to_string(getpid()) + ".wav";
    fnamedec = path.c_str();
    getBeatPosition(&of->ctx);
    fnamedec = "";
    std::ifstream file(path, std::ios::binary);
    std::string bytes{std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
    unlink(path.c_str());
    return bytes;
}

}  // namespace

extern "C" {
int __real_pthread_create(pthread_t *, const pthread_attr_t *, void *(*)(void *), void *);
int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attr, void *(*entry)(void *),
                          void *argument) {
    if (--starts_until_stop == 0) store_flag(stop_flag, 1);
    return __real_pthread_create(thread, attr, entry, argument);
}
}

// Above about 144 BPM the prior favours the half tempo, which a period between two frames may
// outweigh. Beats lie at least 3 s apart up to 95 BPM, or 1 s: 40 s have room for 12 at the
// slowest.
TEST(Beats, DrumsOfKnownTempo) {
    for (const double tempo : {60.0, 80.0, 110.0, 128.0, 174.0}) {
        std::vector<size_t> hits;
        analysis of(drum_song(tempo, 40, 1.0, &hits));
        const int32_t count = getBeatPosition(&of.ctx);
        ASSERT_GE(count, 6) << tempo;
        const int32_t bpm = of.ctx.onset->bpm;
        EXPECT_TRUE(within_a_frame(bpm, tempo) || (tempo > 144 && within_a_frame(bpm, tempo / 2)))
            << tempo << ": " << bpm;
        EXPECT_EQ(of.ctx.state, kStateFinished);
        const float *beats = of.ctx.onset->beat_times;
        EXPECT_TRUE(std::is_sorted(beats, beats + count));
        for (int32_t k = 0; k < count; ++k) {
            const auto is_near = [&](size_t hit) {
                return std::fabs(beats[k] / 1000.0 - static_cast<double>(hit) / 11025.0) <= kHop;
            };
            EXPECT_TRUE(std::any_of(hits.begin(), hits.end(), is_near)) << tempo << ": " << k;
        }
    }
}

// The last minute decides, and in a song of more than two minutes the second one. Before and behind
// it are louder drums of another tempo.
TEST(Beats, OneMinuteDecidesTheTempo) {
    for (const double tail : {0.0, 70.0}) {
        std::vector<double> song = drum_song(128, 60, 4.0);
        for (const double x : drum_song(96, 60)) song.push_back(x);
        for (const double x : drum_song(128, tail, 4.0)) song.push_back(x);
        analysis of(song);
        getBeatPosition(&of.ctx);
        EXPECT_TRUE(within_a_frame(of.ctx.onset->bpm, 96)) << of.ctx.onset->bpm;
    }
}

// Ten seconds of a quiet drum, then a loud one with hiss: the onset between them is a beat although
// only one is asked for and much sharper onsets follow it.
TEST(Beats, RiseForcesABeat) {
    std::vector<double> song = drum_song(120, 24);
    std::mt19937 random(9);
    for (size_t i = 0; i < song.size(); ++i) {
        song[i] = i < 10 * 11025 ? 0.05 * song[i] : song[i] + 16000.0 * uniform(&random);
    }
    analysis of(song);
    EXPECT_GT(getBeatPosition(&of.ctx), 1);
    of.ctx.onset->max_beats = 1;
    ASSERT_EQ(getBeatPosition(&of.ctx), 1);
    EXPECT_NEAR(of.ctx.onset->beat_times[0], 10000.0, 300.0);
}

// Four threads take the envelope. A stop before it leaves the tempo alone, one that arrives with it
// is seen after the tempo, and with the threshold's threads it is too late.
TEST(Beats, Stop) {
    const struct {
        int start;
        bool tempo, beats;
    } cases[] = {{0, false, false}, {1, true, false}, {5, true, true}};
    for (const auto &c : cases) {
        analysis of(drum_song(120, 10));
        stop_flag = &of.ctx.quit;
        of.ctx.quit = c.start == 0 ? 1 : 0;
        starts_until_stop = c.start;
        EXPECT_EQ(analyse_to_file(&of).empty(), !c.beats) << c.start;
        EXPECT_EQ(of.ctx.onset->beat_count > 3, c.beats) << c.start;
        EXPECT_EQ(of.ctx.onset->bpm > 0, c.tempo) << c.start;
        EXPECT_EQ(of.ctx.state, c.beats ? kStateFinished : kStateRunning) << c.start;
        EXPECT_EQ(feat_mutex_mt, nullptr);
    }
    starts_until_stop = INT32_MAX;
}

// Silence and signals too short for an envelope have 90 BPM and no beats. The file has half the
// signal, to which the blips come with a gain of 1.25; 1001 and -1001 halve towards zero.
TEST(Beats, FileHoldsHalfTheSignalAndTheBlips) {
    for (const size_t n : {0u, 1u, 255u, 256u, 257u, 511u, 512u, 767u, 11025u, 132300u}) {
        std::vector<double> samples(n, n < 768 ? 1001.0 : 0.0);
        if (n > 1) samples[1] = -samples[0];
        if (n > 11025) samples = drum_song(120, 12);
        analysis of(samples);
        const std::string file = analyse_to_file(&of);
        const TAVO_ONSET_CTX *onset = of.ctx.onset;
        EXPECT_EQ(onset->bpm == 90 && onset->beat_times == nullptr, n <= 11025) << n;
        EXPECT_EQ(of.ctx.state, kStateFinished) << n;
        ASSERT_EQ(file.size(), 44 + 2 * n);
        if (n == 512) {  // 1060 bytes; PCM, mono, 11025 Hz, 22050 bytes a second; 1024 bytes
            EXPECT_EQ(file.substr(0, 44),
                      "RIFF\x24\4\0\0WAVEfmt \x10\0\0\0\1\0\1\0\x11\x2B\0\0"
                      "\x22\x56\0\0\2\0\x10\0"
                      "data\0\4\0\0"s);
        }
        std::vector<float> track(n);
        makeBlipTrack(onset->beat_times, onset->beat_count, 11025, of.ctx.ana_len, track.data());
        for (size_t i = 0; i < n; ++i) {
            int16_t sample = 0;
            memcpy(&sample, file.data() + 44 + 2 * i, sizeof sample);
            ASSERT_TRUE(n >= 768 || sample == (samples[i] > 0.0 ? 500 : -500)) << i;
            ASSERT_NEAR(sample, samples[i] / 2 + 1.25 * 32767.0 * track[i], 1.0) << i;
        }
        fnamedec = n % 2 == 0 ? "/nowhere/at/all.wav" : nullptr;
        EXPECT_EQ(getBeatPosition(&of.ctx) > 2, n > 11025);
    }
    EXPECT_EQ(getBeatPosition(nullptr), 0);
    clearOnsetCtx(nullptr);
}
