// The same song gives the same result in every format, up to what its encoder changes.
//
// An encoder's delay moves the song between the frames of the analysis, which moves beats by a
// frame of 23 ms either way, with nothing lost. So an encoded song is compared with one that comes
// as late.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <map>
#include <string>
#include <vector>

#include "tests/support/job_harness.h"

namespace {

constexpr int32_t kStep = 400;  // ms of the highlight's finest search
constexpr float kNear = 25.0F;  // ms between beats that are the same
constexpr double kSame = 0.95;  // of the beats
constexpr int32_t kModes[] = {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH};

struct analysis {
    job::result result;
    int32_t bpm = 0;
};

// Of a file in a mode, analysed once.
const analysis &analysis_of(const std::string &name, int32_t mode) {
    static std::map<std::pair<std::string, int32_t>, analysis> known;
    const auto [place, is_new] = known.try_emplace({name, mode});
    if (!is_new) return place->second;
    int32_t err = 0;
    TAVO_CTX *ctx = job::create(std::string(FORMAT_SONGS) + "/" + name, mode, &err);
    EXPECT_NE(ctx, nullptr) << name << ": " << err;
    if (ctx == nullptr) return place->second;
    EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), TAVO_OK);
    place->second.result = job::wait();
    if (ctx->onset != nullptr) place->second.bpm = ctx->onset->bpm;
    EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
    return place->second;
}

// Share of beats that have one of others near.
double share_near(const std::vector<float> &beats, const std::vector<float> &others) {
    const auto is_near = [&](float beat) {
        return std::any_of(others.begin(), others.end(),
                           [&](float other) { return std::fabs(other - beat) <= kNear; });
    };
    const auto count = std::count_if(beats.begin(), beats.end(), is_near);
    return static_cast<double>(count) / static_cast<double>(std::max<size_t>(beats.size(), 1));
}

TEST(SameSong, GivesTheSameResultInEveryFormat) {
    const struct {
        const char *name;
        const char *late;  // the song without loss, as late as the encoder makes it
    } songs[] = {
        {"constant.mp3", "late_576.flac"},      {"variable.mp3", "late_576.flac"},
        {"variable_bare.mp3", "late_576.flac"}, {"song.aac", "late_1024.flac"},
        {"song.m4a", "late_1024.flac"},         {"song.ogg", "song.flac"},
    };
    for (const auto &song : songs) {
        for (const int32_t mode : kModes) {
            SCOPED_TRACE(std::string(song.name) + " in mode " + std::to_string(mode));
            const analysis &plain = analysis_of("song.wav", mode);
            const analysis &late = analysis_of(song.late, mode);
            const analysis &got = analysis_of(song.name, mode);
            ASSERT_EQ(got.result.status, 0);
            EXPECT_LE(std::abs(got.result.hl_pos - plain.result.hl_pos), kStep);
            EXPECT_EQ(got.bpm, plain.bpm);
            if (mode == TAVO_MODE_HIGHLIGHT) continue;
            EXPECT_GE(share_near(late.result.beats, got.result.beats), kSame);
            EXPECT_GE(share_near(got.result.beats, late.result.beats), kSame);
        }
    }
}

// The song's highlight is a whole second, which a seek in the WAV file reaches as well.
TEST(SameSong, IsTheSameToTheBitWithoutLoss) {
    for (const int32_t mode : kModes) {
        SCOPED_TRACE(mode);
        const analysis &plain = analysis_of("song.wav", mode);
        const analysis &got = analysis_of("song.flac", mode);
        EXPECT_EQ(plain.result.status, 0);
        EXPECT_EQ(plain.result.hl_pos, mode == TAVO_MODE_BEATS ? 0 : 31000);
        EXPECT_EQ(plain.result.beats.size() > 20, mode != TAVO_MODE_HIGHLIGHT);
        EXPECT_EQ(got.result.hl_pos, plain.result.hl_pos);
        EXPECT_EQ(got.bpm, plain.bpm);
        EXPECT_EQ(got.result.beats, plain.result.beats);
    }
}

}  // namespace
