#include "tests/desktop/codec_test.h"
#include "tests/support/song.h"

namespace {

using namespace std::string_literals;

constexpr size_t kFormat = 12;  // offset of the format chunk in a plain file
constexpr size_t kData = 36;    // offset of the data chunk

// Returns the file with a little-endian number of `size` bytes written at offset `at`.
std::string patch(std::string file, size_t at, uint64_t value, size_t size = 2) {
    return file.replace(at, size, reinterpret_cast<const char *>(&value), size);
}

TEST(Wav, ReadsUnusualHeadersAndSeeks) {
    samples pcm(60000);
    for (size_t i = 0; i < pcm.size(); ++i) pcm[i] = static_cast<int16_t>(i * 7919);
    const std::string file = support::wav_bytes(pcm, 44100, 2), data = file.substr(kData);
    const auto with_size = [&](uint64_t bytes) { return patch(file, kData + 4, bytes, 4); };
    // An extensible format adds these bytes: 16 valid bits, no speaker positions, PCM.
    const std::string extension = "\26\0\20\0\0\0\0\0\1\0\0\0\0\0\20\0\x80\0\0\xAA\0\x38\x9B\x71"s;
    const std::string plain = file.substr(0, kData);
    const std::string format = patch(patch(plain, kFormat + 8, 0xFFFE), kFormat + 4, 40);
    // A reader that ignores the padding after an odd chunk finds a false data chunk in these.
    const std::string odd = "LIST\15\0\0\0INFOdata\1\0\0\0\7\0JUNK\5\0\0\0ddddd\0"s;
    const struct {
        const char *name;
        std::string contents;
        size_t channels, frames;
    } shapes[] = {
        {"plain", file, 2, 30000},
        {"mono", support::wav_bytes(pcm, 44100, 1), 1, 60000},
        {"six", support::wav_bytes(pcm, 44100, 6), 6, 10000},
        {"extensible", format + extension + data, 2, 30000},
        {"odd", plain + odd + data + odd, 2, 30000},
        {"format last",
         file.substr(0, kFormat) + "fmt \0\0\0\0"s + with_size(119'999).substr(kData) +
             plain.substr(kFormat),
         2, 29999},
        {"zero", with_size(0), 2, 30000},
        {"ones", with_size(0xFFFFFFFF), 2, 30000},
        {"large", with_size(1'120'000), 2, 30000},
        {"cut", file.substr(0, file.size() - 5), 2, 29998},
    };
    const std::pair<int64_t, int64_t> seeks[] = {
        {-5 * kUnits, 0}, {kUnits, 44100}, {INT64_MAX, 60000}};
    for (const auto &each : shapes) {
        SCOPED_TRACE(each.name);
        const open_source source(save("shape.wav", each.contents));
        ASSERT_NE(source.source, nullptr);
        EXPECT_EQ(static_cast<size_t>(source.format.channels), each.channels);
        EXPECT_EQ(static_cast<size_t>(source.format.duration * 44100 / kUnits), each.frames);
        samples first(each.frames);
        for (size_t i = 0; i < each.frames; ++i) first[i] = pcm[i * each.channels];
        expect_equal(read(source.source), first);
        for (const auto &[units, frame] : seeks) {
            const int64_t at = std::min(frame, static_cast<int64_t>(each.frames));
            int64_t reached = -1;
            ASSERT_EQ(mtsrc_seekstream(source.source, units, &reached), 0);
            EXPECT_EQ(reached * 44100 / kUnits, at);
            expect_equal(read(source.source), {first.begin() + at, first.end()});
        }
    }
}

// Offsets in these sparse files exceed 31 or 32 bits. All samples of the last second are 1000. If
// the size of the data exceeds 32 bits, the header states 0xFFFFFFFF.
TEST(Wav, ReadsTheEndOfLargeFiles) {
    constexpr int64_t kRate = 48'000, kSecondBytes = kRate * 8 * 2;
    const std::string last = support::wav_bytes(samples(kRate * 8, 1000), kRate, 8);
    for (const int64_t gib : {2, 4}) {
        const int64_t seconds = (gib << 30) / kSecondBytes + 2;
        const auto size = std::min<int64_t>(seconds * kSecondBytes, UINT32_MAX);
        const std::string path =
            save("sparse.wav", patch(last.substr(0, kData + 8), kData + 4, uint64_t(size), 4));
        std::fstream out(path, std::ios::in | std::ios::out | std::ios::binary);
        out.seekp(int64_t{kData} + 8 + (seconds - 1) * kSecondBytes) << last.substr(kData + 8);
        ASSERT_TRUE(out.flush().good());
        const open_source file(path);
        ASSERT_NE(file.source, nullptr) << file.error;
        EXPECT_EQ(file.format.duration, seconds * kUnits);
        int64_t reached = -1;
        ASSERT_EQ(mtsrc_seekstream(file.source, (seconds - 1) * kUnits, &reached), 0);
        EXPECT_EQ(reached, (seconds - 1) * kUnits);
        EXPECT_EQ(read(file.source), samples(kRate, 1000));
    }
}

}  // namespace
