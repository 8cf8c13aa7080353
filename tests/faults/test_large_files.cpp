// Sparse WAV files larger than 2 and 4 GiB: positions and lengths of more than 31 and 32 bits.
// Their jobs, which read everything, only run with TAVO_FAULTS=all and need 10 GiB of memory.
#include <cstring>

#include "tests/desktop/codec_test.h"
#include "tests/support/job_harness.h"
#include "tests/support/song.h"

namespace {

constexpr int64_t kGiB = int64_t{1} << 30;
constexpr int64_t kRate = 48'000;

// All samples of the last second are 1000. A size that does not fit the header is all ones.
std::string sparse_wav(int32_t channels, int64_t seconds) {
    const auto second = static_cast<size_t>(kRate * channels);
    std::string file = support::wav_bytes(std::vector<int16_t>(second, 1000), kRate, channels);
    constexpr size_t kHead = 44;
    const int64_t data = seconds * 2 * static_cast<int64_t>(second);
    const auto shown = static_cast<uint32_t>(std::min<int64_t>(data, UINT32_MAX));
    memcpy(&file[40], &shown, sizeof shown);
    const std::string path = codec_test::save("sparse.wav", file.substr(0, kHead));
    std::fstream out(path, std::ios::in | std::ios::out | std::ios::binary);
    out.seekp(static_cast<int64_t>(2 * kHead - file.size()) + data) << file.substr(kHead);
    EXPECT_TRUE(out.flush().good());
    return path;
}

TEST(LargeFiles, OffsetsExceed31And32Bits) {
    constexpr int64_t kUnits = codec_test::kUnits;
    for (const int64_t gib : {2, 4}) {
        const int64_t seconds = gib * kGiB / (kRate * 8 * 2) + 2;
        const std::string path = sparse_wav(8, seconds);
        const codec_test::open_source file(path);
        ASSERT_NE(file.source, nullptr) << file.error;
        EXPECT_EQ(file.format.duration, seconds * kUnits);
        int64_t reached = -1;
        ASSERT_EQ(mtsrc_seekstream(file.source, (seconds - 1) * kUnits, &reached), 0);
        EXPECT_EQ(reached, (seconds - 1) * kUnits);
        EXPECT_EQ(codec_test::read(file.source, SIZE_MAX), codec_test::samples(kRate, 1000));
        TAVO_CTX *ctx = job::create(path, TAVO_MODE_HIGHLIGHT);
        ASSERT_NE(ctx, nullptr);
        EXPECT_EQ(ctx->duration, seconds * kUnits);
        if (getenv("TAVO_FAULTS") != nullptr) {
            EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), TAVO_OK);
            EXPECT_EQ(job::wait().status, 0);
        }
        EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
    }
}

}  // namespace
