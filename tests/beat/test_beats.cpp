// Tests whole analyses of songs with known beats, and the click track.
#include "beat/click_track.h"
#include "beat/onset_envelope.h"
#include "beat/threshold.h"
#include "tests/beat/beat_fixture.h"
#include "tests/support/fault_layer.h"

namespace {

using namespace std::string_literals;

int starts_until_stop = 0;  // the stop arrives after this many thread starts
int32_t *stop_flag = nullptr;

// Returns a song of drum hits. Each hit fades until the next one, which has a different level.
std::vector<double> drum_song(double bpm, double seconds) {
    std::vector<double> song(static_cast<size_t>(seconds * kAnalysisRate));
    std::mt19937 random(4);
    for (size_t i = 0; i < song.size(); ++i) {
        const double beats = static_cast<double>(i) / kAnalysisRate * bpm / 60.0;
        const double height = 2000.0 + 200.0 * (static_cast<int>(beats) * 7 % 10);
        song[i] = height * uniform(&random) * exp(-8.0 * (beats - floor(beats)));
    }
    return song;
}

// Runs the analysis and returns its click track file, or an empty string.
std::string analyse_to_file(analysis *run) {
    const support::temporary_file file("click");
    fnamedec = file.path.c_str();
    getBeatPosition(&run->ctx);
    fnamedec = "";
    return support::contents_of(file.path);
}

constexpr size_t kBlip = 1102;  // samples, 100 ms

std::vector<float> track_of(const std::vector<float> &beats, int64_t n) {
    std::vector<float> track(static_cast<size_t>(n));
    makeBlipTrack(beats.data(), static_cast<int32_t>(beats.size()), 11025, n, track.data());
    return track;
}

}  // namespace

TEST(Beats, StopIsCheckedBeforeTheEnvelopeAndAfterTheTempo) {
    for (const auto &[start, tempo, beats] :
         {std::tuple{0, false, false}, {1, true, false}, {5, true, true}}) {
        analysis run(drum_song(120, 10));
        stop_flag = &run.ctx.quit;
        run.ctx.quit = start == 0 ? 1 : 0;
        starts_until_stop = start;
        fault::arm({fault::kThread, INT64_MAX, false, EIO, [] {
                        if (--starts_until_stop == 0) store_flag(stop_flag, 1);
                    }});
        EXPECT_EQ(analyse_to_file(&run).empty(), !beats) << start;
        EXPECT_EQ(run.ctx.onset->beat_count > 3, beats) << start;
        EXPECT_EQ(run.ctx.onset->bpm > 0, tempo) << start;
        EXPECT_EQ(run.ctx.state, beats ? kStateFinished : kStateRunning) << start;
        EXPECT_EQ(feat_mutex_mt, nullptr);
    }
    analysis run(drum_song(120, 10));
    fault::arm({fault::kMemory, 0});
    EXPECT_EQ(getBeatPosition(&run.ctx), 0);
    fault::disarm();
}

// The file is the sum of the signal at half its level, rounded toward zero, and the blips with a
// gain of 1.25. A silent or very short signal has a tempo of 90 BPM and no beats.
TEST(Beats, FileContainsHalfTheSignalAndTheBlips) {
    for (const size_t n : {0u, 1u, 511u, 512u, 767u, 11025u, 132300u}) {
        std::vector<double> signal(n, n < 768 ? 1001.0 : 0.0);
        if (n > 1) signal[1] = -signal[0];
        if (n > 11025) signal = drum_song(120, 12);
        analysis run(signal);
        const std::string file = analyse_to_file(&run);
        const TAVO_ONSET_CTX *onset = run.ctx.onset;
        EXPECT_EQ(onset->bpm == 90 && onset->beat_times == nullptr, n <= 11025) << n;
        EXPECT_NEAR(onset->bpm, n > 11025 ? 120 : 90, 3);  // beat periods are whole hops
        EXPECT_EQ(run.ctx.state, kStateFinished) << n;
        ASSERT_EQ(file.size(), 44 + 2 * n);
        if (n == 512) {  // 16-bit PCM, mono, 11025 Hz
            EXPECT_EQ(file.substr(0, 44),
                      "RIFF\x24\4\0\0WAVEfmt \x10\0\0\0\1\0\1\0\x11\x2B\0\0"
                      "\x22\x56\0\0\2\0\x10\0"
                      "data\0\4\0\0"s);
        }
        std::vector<float> track(n);
        makeBlipTrack(onset->beat_times, onset->beat_count, 11025, run.ctx.ana_len, track.data());
        std::vector<int16_t> samples(n);
        file.copy(reinterpret_cast<char *>(samples.data()), 2 * n, 44);
        for (size_t i = 0; i < n; ++i) {
            ASSERT_TRUE(n >= 768 || samples[i] == (signal[i] > 0.0 ? 500 : -500)) << i;
            ASSERT_NEAR(samples[i], signal[i] / 2 + 1.25 * 32767.0 * track[i], 1.0) << i;
        }
        fnamedec = n % 2 == 0 ? "/nowhere/at/all.wav" : nullptr;
        EXPECT_EQ(getBeatPosition(&run.ctx) > 2, n > 11025);
    }
    EXPECT_EQ(getBeatPosition(nullptr), 0);
    clearOnsetCtx(nullptr);
}

// The expected samples are those of a 4 kHz tone with the envelope i e^(-i/110) / 160 at sample i.
TEST(ClickTrack, BlipIsADecayingTone) {
    const std::vector<float> track = track_of({1000.04f}, 20000);
    EXPECT_EQ(track[11025], 0.0f);
    EXPECT_NEAR(track[11026], -0.0040316, 1e-6);
    EXPECT_NEAR(track[11027], -0.0018710, 2e-6);
    EXPECT_NEAR(*std::max_element(track.begin(), track.end()), 0.253, 0.002);
}

// A blip starts at the sample nearest to its beat. If it does not fit, it is cut off one sample
// before the end of the track. A beat up to 1.5 samples before the track has its blip at sample 0.
TEST(ClickTrack, BlipsAreCutAtTheEnd) {
    struct part {
        size_t at, length;  // samples
    };
    const struct {
        std::vector<float> beats;
        int64_t n;
        std::vector<part> parts;
    } cases[] = {{{100}, 1103 + kBlip, {{1103, kBlip}}},
                 {{100}, 1102 + kBlip, {{1103, kBlip - 2}}},
                 {{100}, 1105, {{1103, 1}}},
                 {{100, 200, 1e9f}, 1104, {}},
                 {{100}, 1103, {}},
                 {{100}, 1000, {}},
                 {{100}, 0, {}},
                 {{100, 150}, 5000, {{1103, 551}, {1654, kBlip}}},
                 {{-0.1f}, 5000, {{0, kBlip}}},
                 {{-0.2f}, 5000, {}}};
    const std::vector<float> blip = track_of({0.0f}, 2000);
    for (const auto &c : cases) {
        std::vector<float> expected(static_cast<size_t>(c.n));
        for (const part &p : c.parts) {
            std::copy_n(blip.begin(), p.length, expected.begin() + static_cast<long>(p.at));
        }
        EXPECT_EQ(track_of(c.beats, c.n), expected) << c.beats[0] << " ms in " << c.n;
    }
}
