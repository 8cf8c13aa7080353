#include "tests/desktop/codec_test.h"
#include "tests/support/song.h"

namespace codec_test {
namespace {

using namespace std::string_literals;

constexpr size_t kFormat = 12;  // offset of the format in a plain header
constexpr size_t kData = 36;    // offset of the data

samples make_samples(size_t count) {
    samples pcm(count);
    for (size_t i = 0; i < count; ++i) pcm[i] = static_cast<int16_t>(i * 7919);
    return pcm;
}

// Returns the file with the number of `size` bytes at offset `at` replaced.
std::string patch(std::string file, size_t at, uint64_t value, size_t size = 2) {
    return file.replace(at, size, reinterpret_cast<const char *>(&value), size);  // little-endian
}

TEST(Wav, ReadsUnusualHeaders) {
    const samples pcm = make_samples(60000);
    const std::string file = support::wav_bytes(pcm, 44100, 2), data = file.substr(kData);
    const auto with_size = [&](uint64_t bytes) { return patch(file, kData + 4, bytes, 4); };
    // 22 more bytes: 16 bits in use, no speakers, PCM.
    const std::string extension = "\26\0\20\0\0\0\0\0\1\0\0\0\0\0\20\0\x80\0\0\xAA\0\x38\x9B\x71"s;
    const std::string plain = file.substr(0, kData);
    const std::string format = patch(patch(plain, kFormat + 8, 0xFFFE), kFormat + 4, 40);
    // The bodies of odd length spell "data": a reader that ignores the padding finds a false chunk.
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
    for (const auto &each : shapes) {
        SCOPED_TRACE(each.name);
        const open_source source(save("shape.wav", each.contents));
        ASSERT_NE(source.source, nullptr);
        EXPECT_EQ(static_cast<size_t>(source.format.channels), each.channels);
        EXPECT_EQ(static_cast<size_t>(source.format.duration * 44100 / kUnits), each.frames);
        samples first(each.frames);
        for (size_t i = 0; i < each.frames; ++i) first[i] = pcm[i * each.channels];
        expect_equal(read(source.source), first);
    }
}

// With a readable header, the code of an unusable format differs from that of unusable data.
TEST(Wav, RefusesUnsupportedFormats) {
    const std::string file = support::wav_bytes(make_samples(2000), 44100, 2);
    const auto with_format = [&](uint64_t tag, uint64_t bits) {
        return patch(patch(file, kFormat + 8, tag), kFormat + 22, bits);
    };
    const struct {
        std::string contents;
        int32_t error;
    } refusals[] = {
        {with_format(1, 8), -3},
        {with_format(1, 24), -3},
        {with_format(3, 32), -3},    // float
        {with_format(7, 8), -3},     // mu-law
        {with_format(300, 16), -3},  // the interface's own code for linear PCM
        {file.substr(0, kData), -7},
        {patch(file, kFormat + 10, 0), -3},     // no channels
        {patch(file, kFormat + 12, 0, 4), -3},  // no rate
        {file.substr(0, kFormat + 20), -3},
    };
    for (const auto &each : refusals) {
        EXPECT_EQ(open_source(save("refused.wav", each.contents)).error, each.error)
            << &each - refusals;
    }
}

TEST(Wav, SeeksToWholeSeconds) {
    const samples pcm = make_samples(22051);  // one sample past 2 s
    const open_source file(save("seek.wav", support::wav_bytes(pcm, 11025, 1)));
    ASSERT_NE(file.source, nullptr);
    const std::pair<int64_t, int64_t> seeks[] = {{19'999'999, 11025}, {0, 0},
                                                 {20'000'000, 22050}, {30'000'000, 22051},
                                                 {INT64_MAX, 22051},  {-50'000'000, 0}};
    for (const auto &[units, sample] : seeks) {
        SCOPED_TRACE(units);
        int64_t reached = -1;
        ASSERT_EQ(mtsrc_seekstream(file.source, units, &reached), 0);
        EXPECT_EQ(reached * 11025 / kUnits, sample);
        expect_equal(read(file.source), {pcm.begin() + sample, pcm.end()});
    }
}

}  // namespace
}  // namespace codec_test
