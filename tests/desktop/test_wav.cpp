#include <fcntl.h>
#include <unistd.h>

#include "tests/desktop/codec_test.h"
#include "tests/support/song.h"

namespace codec_test {
namespace {

constexpr int32_t kChunk = 16384;  // bytes, the source's buffer
constexpr size_t kFormat = 12;     // offsets in a plain header: of the format
constexpr size_t kData = 36;       // of the data

// A reader of the codec library itself, without a source around it; null when it refuses the file.
struct direct_wav {
    xwav_info info = {};
    void *reader = nullptr;

    explicit direct_wav(const std::string &path) {
        const mtsrc_io io = io_for(path);
        int32_t word = 0;
        reader = xwavd_create(&io, &info, &word);
    }
    ~direct_wav() { xwavd_delete(reader); }
    direct_wav(const direct_wav &) = delete;
    direct_wav &operator=(const direct_wav &) = delete;
};

// Everything from where the reader stands; each chunk must hold whole sample frames and fit.
samples rest(const direct_wav &from) {
    samples all;
    samples chunk(kChunk / 2);
    for (;;) {
        int32_t got = 0;
        int64_t first = 0;
        int64_t second = 0;
        const int32_t code =
            xwavd_get_frm(from.reader, chunk.data(), kChunk, &got, &first, &second);
        if (code != 0 || got <= 0 || got > kChunk) {
            EXPECT_EQ(code, 1) << got << " bytes";
            return all;
        }
        EXPECT_EQ(got % (2 * from.info.channels), 0);
        all.insert(all.end(), chunk.begin(), chunk.begin() + got / 2);
    }
}

samples numbers(size_t count) {
    samples pcm(count);
    for (size_t i = 0; i < count; ++i) pcm[i] = static_cast<int16_t>(i * 7919);
    return pcm;
}

// The file with another number of so many bytes at an offset.
bytes patched(bytes file, size_t at, uint64_t value, size_t size = 2) {
    for (size_t i = 0; i < size; ++i) file[at + i] = static_cast<uint8_t>(value >> 8 * i);
    return file;
}

TEST(WavReader, ReadsEveryShapeOfHeader) {
    const samples pcm = numbers(60000);
    const auto wav = [&](auto change) {
        support::wav_spec plan;
        change(plan);
        return support::wav_bytes(pcm, plan);
    };
    using support::wav_data_size;
    using support::wav_spec;
    const bytes plain = support::wav_bytes(pcm, {});
    const bytes swapped =
        joined({part(plain, 0, kFormat), part(plain, kData), part(plain, kFormat, kData)});
    const struct {
        const char *name;
        bytes contents;
        int32_t channels;
        ptrdiff_t frames;
    } shapes[] = {
        {"plain", plain, 2, 30000},
        {"data before format", swapped, 2, 30000},
        {"mono", wav([](wav_spec &s) { s.channels = 1; }), 1, 60000},
        {"six", wav([](wav_spec &s) { s.channels = 6; }), 6, 10000},
        {"extensible", wav([](wav_spec &s) { s.extensible = true; }), 2, 30000},
        {"odd", wav([](wav_spec &s) { s.other_chunks = s.junk_first = true; }), 2, 30000},
        {"zero", wav([](wav_spec &s) { s.data_size = wav_data_size::zero; }), 2, 30000},
        {"ones", wav([](wav_spec &s) { s.data_size = wav_data_size::all_ones; }), 2, 30000},
        {"large", wav([](wav_spec &s) { s.data_size = wav_data_size::too_large; }), 2, 30000},
        {"cut", wav([](wav_spec &s) { s.cut_bytes = 5; }), 2, 29998},
    };
    for (const auto &each : shapes) {
        SCOPED_TRACE(each.name);
        const direct_wav file(save("shape.wav", each.contents));
        ASSERT_NE(file.reader, nullptr);
        EXPECT_EQ(file.info.codec, kWexaPcm);
        EXPECT_EQ(file.info.bits, 16);
        EXPECT_EQ(file.info.sample_rate, 44100);
        ASSERT_EQ(file.info.channels, each.channels);
        EXPECT_EQ(file.info.duration * 44100 / kUnits, each.frames);
        expect_same(rest(file), {pcm.begin(), pcm.begin() + each.frames * each.channels});
    }
}

// A refused file says why where it can; a header too broken to say anything leaves the record
// empty.
TEST(WavReader, RefusesWhatTheSourceCannotUse) {
    const bytes file = support::wav_bytes(numbers(2000), {});
    const auto coded = [&](uint64_t tag, uint64_t bits) {
        return patched(patched(file, kFormat + 8, tag), kFormat + 22, bits);
    };
    const struct {
        const char *name;
        bytes contents;
        int32_t codec;
        int32_t bits;
    } refusals[] = {
        {"8 bits", coded(1, 8), kWexaPcm, 8},
        {"24 bits", coded(1, 24), kWexaPcm, 24},
        {"float", coded(3, 32), 3, 32},
        {"mu-law", coded(7, 8), 7, 8},
        // The tag that the library's own code for linear PCM would be mistaken for.
        {"tag 300", coded(300, 16), 300 | 0x10000, 16},
        {"no data", part(file, 0, kData), kWexaPcm, 16},
        {"no channels", patched(file, kFormat + 10, 0), 0, 0},
        {"no rate", patched(file, kFormat + 12, 0, 4), 0, 0},
        {"no format", joined({part(file, 0, kFormat), part(file, kData)}), 0, 0},
        {"cut format", part(file, 0, kFormat + 20), 0, 0},
        {"nothing", part(file, 0, kFormat), 0, 0},
        {"text", bytes(100, 'x'), 0, 0},
    };
    for (const auto &each : refusals) {
        SCOPED_TRACE(each.name);
        const direct_wav refused(save("refused.wav", each.contents));
        EXPECT_EQ(refused.reader, nullptr);
        EXPECT_EQ(refused.info.codec, each.codec);
        EXPECT_EQ(refused.info.bits, each.bits);
    }
}

TEST(WavReader, SeeksToWholeSecondsAndReportsTimes) {
    const samples pcm = numbers(2 * 22051);  // one sample frame beyond 2 s at 11025 Hz
    support::wav_spec plan;
    plan.rate = 11025;
    const direct_wav file(save("seek.wav", support::wav_bytes(pcm, plan)));
    ASSERT_NE(file.reader, nullptr);
    const struct {
        int64_t seconds, sample;
    } landings[] = {{1, 11025}, {0, 0}, {2, 22050}, {3, 22051}, {INT64_MAX, 22051}, {-5, 0}};
    for (const auto &each : landings) {
        SCOPED_TRACE(each.seconds);
        int64_t reached = -1;
        ASSERT_EQ(xwavd_seek(file.reader, &each.seconds, &reached, 0), 0);
        EXPECT_EQ(reached * 11025 / kUnits, each.sample);
        expect_same(rest(file), {pcm.begin() + 2 * each.sample, pcm.end()});
    }
    samples one(1);
    int32_t got = 0;
    int64_t unused = 0;
    EXPECT_EQ(xwavd_get_frm(file.reader, one.data(), 2, &got, &unused, &unused), -1);
}

// The long form of the header states the size in 64 bits. A sparse file, whose last sample frame
// lies behind the reach of 32-bit offsets; one byte of a following chunk is not part of the data.
TEST(WavReader, ReadsBeyondFourGibibytes) {
    const int64_t size = int64_t{5} << 30;
    const bytes plain = patched(support::wav_bytes({}, {}), kData + 4, 0xFFFFFFFF, 4);
    bytes sizes = {'d', 's', '6', '4', 28};
    sizes.resize(8 + 28);
    sizes = patched(sizes, 16, static_cast<uint64_t>(size), 8);
    const bytes head =
        joined({{'R', 'F', '6', '4'}, part(plain, 4, kFormat), sizes, part(plain, kFormat)});
    const std::string path = save("large.wav", head);
    const int fd = open(path.c_str(), O_RDWR);
    const auto end = static_cast<int64_t>(head.size()) + size;
    const samples mark = {1234, -4321};
    ASSERT_EQ(pwrite(fd, mark.data(), 4, end - 4), 4);
    ASSERT_EQ(ftruncate(fd, end + 1), 0);
    close(fd);
    const direct_wav file(path);
    ASSERT_NE(file.reader, nullptr);
    EXPECT_EQ(file.info.duration * 44100 / kUnits, size / 4);
    const int64_t seconds = size / 4 / 44100;
    int64_t reached = 0;
    ASSERT_EQ(xwavd_seek(file.reader, &seconds, &reached, 0), 0);
    EXPECT_EQ(reached, seconds * kUnits);
    samples wanted(static_cast<size_t>(2 * (size / 4 - seconds * 44100)));
    std::copy(mark.begin(), mark.end(), wanted.end() - 2);
    expect_same(rest(file), wanted);
}

}  // namespace
}  // namespace codec_test
