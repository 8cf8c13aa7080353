// Damaged files: every format's reader and the whole analysis go through them, in bounded time.
#include <chrono>

#include "tests/core/job_harness.h"
#include "tests/platform/codec_test.h"

namespace {

constexpr int kFiles = 50;  // of each format
constexpr std::chrono::seconds kLongest{5};

struct format {
    const char *name;
    std::vector<const char *> fixtures;
};

void PrintTo(const format &each, std::ostream *out) {
    *out << each.name;
}

class Damage : public testing::TestWithParam<format> {};

TEST_P(Damage, IsSurvived) {
    const std::vector<const char *> &fixtures = GetParam().fixtures;
    std::mt19937 random(2024);
    int opened = 0;
    for (int i = 0; i < kFiles; ++i) {
        const char *name = fixtures[static_cast<size_t>(i) % fixtures.size()];
        SCOPED_TRACE(std::string(name) + ", damage " + std::to_string(i));
        const codec_test::bytes whole = codec_test::load(codec_test::fixture(name));
        const std::string path = codec_test::save("damaged", codec_test::damaged(whole, random));
        const auto start = std::chrono::steady_clock::now();
        opened += codec_test::reads_consistently(path, random) ? 1 : 0;
        const auto between = std::chrono::steady_clock::now();
        int32_t err = 0;
        TAVO_CTX *ctx = job::create(path, TAVO_MODE_BOTH, &err);
        if (ctx != nullptr) {
            EXPECT_EQ(tavo_analyze(ctx, 5, 0, 0), TAVO_OK);
            job::wait();
            EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
        }
        EXPECT_LT(between - start, kLongest);
        EXPECT_LT(std::chrono::steady_clock::now() - between, kLongest);
    }
    EXPECT_GT(opened, kFiles / 5);  // the others lost what says where the audio is
}

INSTANTIATE_TEST_SUITE_P(
    Formats, Damage,
    testing::Values(
        format{"wav", {"song.wav", "mono.wav", "six.wav"}},
        format{"flac", {"song.flac", "short_blocks.flac", "huge_blocks.flac", "six.flac"}},
        format{"mpeg", {"vbr.mp3", "tagged.mp3", "low.mp3", "checked.mp3", "layer2.mp2"}},
        format{"aac", {"low.aac", "noisy.aac", "mono.aac", "six.aac", "core.aac"}},
        format{"mp4", {"first.m4a", "last.m4a", "fragmented.mp4", "video.mp4", "layer3.mp4"}},
        format{"ogg", {"song.ogg", "other.ogg", "six.ogg", "video.ogv"}}),
    [](const testing::TestParamInfo<format> &each) { return std::string(each.param.name); });

}  // namespace
