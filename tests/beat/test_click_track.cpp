#include <gtest/gtest.h>
#include <unistd.h>

#include <fstream>
#include <iterator>
#include <string>

#include "beat/click_track.h"
#include "tests/beat/beat_fixture.h"

namespace {

using namespace std::string_literals;

constexpr int kBlip = 1102;  // samples, 100 ms

// Runs an analysis and gives the file that it writes.
std::string click_file(analysis *of) {
    const std::string path = testing::TempDir() + "click_" + std::to_string(getpid()) + ".wav";
    fnamedec = path.c_str();
    getBeatPosition(&of->ctx);
    fnamedec = "";
    EXPECT_EQ(of->ctx.state, kStateFinished);
    std::ifstream file(path, std::ios::binary);
    std::string bytes{std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
    unlink(path.c_str());
    return bytes;
}

int sample_at(const std::string &file, size_t i) {
    int16_t sample = 0;
    memcpy(&sample, file.data() + 44 + 2 * i, sizeof(sample));
    return sample;
}

std::vector<float> track_of(const std::vector<float> &beats, int64_t n) {
    std::vector<float> track(static_cast<size_t>(n));
    makeBlipTrack(beats.data(), static_cast<int32_t>(beats.size()), 11025, n, track.data());
    return track;
}

}  // namespace

TEST(ClickTrack, Header) {
    const struct {
        uint32_t n;
        std::string riff, data;
    } cases[] = {{1000, "\xF4\x07\0\0"s, "\xD0\x07\0\0"s},  // 2036, 2000
                 {0, "\x24\0\0\0"s, "\0\0\0\0"s},
                 {0xFFFFFFFF, "\x22\0\0\0"s, "\xFE\xFF\xFF\xFF"s}};  // 32 bits wrap
    for (const auto &c : cases) {
        char buffer[64] = {};
        FILE *stream = fmemopen(buffer, sizeof buffer, "wb");
        EXPECT_EQ(makeWaveHeader(c.n, stream), 1);
        EXPECT_EQ(ftell(stream), 44);
        fclose(stream);
        // 16 bytes: PCM, mono, 11025 Hz, 22050 bytes a second, 2 a frame, 16 bits
        const std::string format =
            "WAVEfmt \x10\0\0\0\1\0\1\0"s + "\x11\x2B\0\0"s + "\x22\x56\0\0"s + "\2\0\x10\0"s;
        EXPECT_EQ(std::string(buffer, 44), "RIFF" + c.riff + format + "data" + c.data);
    }
}

// i e^(-i/110) cos(2 pi 4000 i / 11025) / 160.
TEST(ClickTrack, BlipIsPlacedAtTheNearestSample) {
    const std::vector<float> track = track_of({1000.04f}, 20000);  // sample 11025.44
    const auto blip = track.begin() + 11025;
    EXPECT_EQ(blip[-1], 0.0f);
    EXPECT_EQ(blip[0], 0.0f);
    EXPECT_NEAR(blip[1], -0.0040316, 1e-6);
    EXPECT_NEAR(blip[2], -0.0018710, 2e-6);
    float top = 0.0f;
    for (int i = 0; i < kBlip; ++i) top = std::max(top, std::fabs(blip[i]));
    EXPECT_NEAR(top, 0.253, 0.002);
    EXPECT_NE(blip[kBlip - 1], 0.0f);
    EXPECT_EQ(blip[kBlip], 0.0f);
}

// A tenth of a millisecond before the start is 1.1 samples; with the half that rounds, 0.6 of one,
// which truncation takes to 0. Two tenths lie a whole sample before it.
TEST(ClickTrack, ABeatJustBeforeTheStart) {
    EXPECT_NE(track_of({-0.1f}, 20000)[1], 0.0f);
    EXPECT_EQ(track_of({-0.2f}, 20000), std::vector<float>(20000));
}

// 50 ms are 551.25 samples: the second blip begins at 1654 and ends the first.
TEST(ClickTrack, LaterBlipReplacesTheTail) {
    const std::vector<float> one = track_of({100.0f}, 5000);
    const std::vector<float> two = track_of({100.0f, 150.0f}, 5000);
    for (size_t i = 0; i < 5000; ++i) {
        const float expected = i < 1654 ? one[i] : i < 1654 + kBlip ? one[i - 551] : 0.0f;
        ASSERT_EQ(two[i], expected) << i;
    }
}

// A blip cut short ends one sample before the end; beats at the end or past it add nothing.
TEST(ClickTrack, AtTheEnd) {
    const std::vector<float> whole = track_of({100.0f}, 5000);
    const struct {
        int64_t n;
        size_t length;
    } cases[] = {{1103 + kBlip, kBlip},
                 {1102 + kBlip, kBlip - 2},
                 {1105, 1},
                 {1104, 0},
                 {1103, 0},
                 {1000, 0},
                 {0, 0}};
    for (const auto &c : cases) {
        const std::vector<float> track = track_of({100.0f, 200.0f, 1e9f}, c.n);
        for (size_t i = 0; i < track.size() && i < 2205; ++i) {
            const bool in_blip = i >= 1103 && i < 1103 + c.length;
            ASSERT_EQ(track[i], in_blip ? whole[i] : 0.0f) << c.n << " samples, " << i;
        }
    }
}

TEST(ClickTrack, FileHoldsHalfTheSignalAndTheBlips) {
    analysis of(drum_song(120, 12));
    const std::string file = click_file(&of);
    ASSERT_GT(of.beats().size(), 2u);
    const std::vector<float> track = track_of(of.beats(), of.ctx.ana_len);
    ASSERT_EQ(file.size(), 44 + 2 * of.ana.size());
    for (size_t i = 0; i < of.ana.size(); ++i) {
        const double blip = 2.5 * 32767.0 * static_cast<double>(track[i]);
        ASSERT_NEAR(sample_at(file, i), (of.ana[i] + blip) / 2, 1.0) << i;
    }
}

// Whatever the length; 1001 and -1001 halve towards zero.
TEST(ClickTrack, WithoutBeatsHalfTheSignalAlone) {
    for (const size_t n : {size_t{0}, size_t{300}, size_t{11025}}) {
        std::vector<double> samples(n, 1001.0);
        if (n > 0) samples[1] = -1001.0;
        analysis of(samples);
        const std::string file = click_file(&of);
        EXPECT_TRUE(of.beats().empty());
        ASSERT_EQ(file.size(), 44 + 2 * n);
        for (size_t i = 0; i < n; ++i) ASSERT_EQ(sample_at(file, i), i == 1 ? -500 : 500);
    }
}

TEST(ClickTrack, NoFileNoHarm) {
    for (const char *path : {"", "/nowhere/at/all.wav", static_cast<const char *>(nullptr)}) {
        analysis of(drum_song(120, 6));
        fnamedec = path;
        EXPECT_GT(getBeatPosition(&of.ctx), 0);
        EXPECT_EQ(of.ctx.state, kStateFinished);
        fnamedec = "";
    }
}
