// A file decoded in four segments has the same samples as in one pass.
#include <filesystem>

#include "pcm/decode.h"
#include "tests/desktop/codec_test.h"

namespace {

constexpr size_t kMinFiles = 50;  // fewest files that are long enough

TEST(Segments, EqualALinearRead) {
    size_t compared = 0;
    for (const auto &file : std::filesystem::recursive_directory_iterator(SONGS)) {
        const std::filesystem::path &path = file.path();
        SCOPED_TRACE(path);
        const TAVO_PARAM param = {path.c_str(), TAVO_MODE_HIGHLIGHT};
        TAVO_CTX *ctx = tavo_init(&param, nullptr);
        if (ctx == nullptr) continue;
        // WAV seeks in whole seconds, so its quarters only join if they are whole seconds.
        const bool whole = path.extension() != ".wav" || ctx->duration / 4 % kUnitsPerSecond == 0;
        if (ctx->seg_count == 4 && whole) {
            const codec_test::samples linear = codec_test::read_all(path);
            const auto bytes = static_cast<int64_t>(linear.size() * sizeof(int16_t));
            EXPECT_EQ(DecodePcmMT(ctx, ctx->pcm, ctx->pcm_bytes), bytes);
            EXPECT_EQ(ctx->pcm_bytes, bytes);
            codec_test::expect_equal({ctx->pcm, ctx->pcm + ctx->pcm_bytes / 2}, linear);
            ++compared;
        }
        EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
    }
    EXPECT_GE(compared, kMinFiles);
}

}  // namespace
