// Decoded in four parts side by side, a file gives what it gives in one go.
#include <algorithm>
#include <cstring>
#include <filesystem>

#include "pcm/decode.h"
#include "tests/platform/codec_test.h"

namespace {

constexpr size_t kLeastFiles = 35;  // that are long enough, of the fixtures

std::vector<std::string> fixtures() {
    std::vector<std::string> paths;
    for (const char *folder : {CODEC_FIXTURES, FORMAT_SONGS}) {
        for (const auto &each : std::filesystem::directory_iterator(folder)) {
            paths.push_back(each.path().string());
        }
    }
    std::sort(paths.begin(), paths.end());
    return paths;
}

bool is_wav(const std::string &path) {
    return std::filesystem::path(path).extension() == ".wav";
}

TEST(Segments, GiveWhatALinearReadGives) {
    size_t compared = 0;
    for (const std::string &path : fixtures()) {
        SCOPED_TRACE(path);
        const TAVO_PARAM param = {path.c_str(), TAVO_MODE_HIGHLIGHT};
        int32_t err = 0;
        TAVO_CTX *ctx = tavo_init(&param, &err);
        if (ctx == nullptr) continue;
        // A WAV file is positioned in whole seconds: only there its quarters have no gaps.
        const bool whole = !is_wav(path) || ctx->duration / 4 % kUnitsPerSecond == 0;
        if (ctx->seg_count == 4 && whole) {
            const std::vector<int16_t> linear = codec_test::read_all(path);
            const int64_t bytes = static_cast<int64_t>(linear.size() * sizeof(int16_t));
            EXPECT_EQ(ctx->pcm_bytes, bytes);
            const int64_t got = DecodePcmMT(ctx, ctx->pcm, ctx->pcm_bytes);
            EXPECT_EQ(got, bytes);
            const auto differs =
                std::mismatch(linear.begin(), linear.begin() + got / 2, ctx->pcm).first;
            EXPECT_EQ(differs - linear.begin(), got / 2);
            ++compared;
        }
        EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
    }
    EXPECT_GE(compared, kLeastFiles);
}

}  // namespace
