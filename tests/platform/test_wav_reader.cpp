#include <fcntl.h>
#include <unistd.h>

#include <cstring>

#include "media_source/wexaaudio.h"
#include "tests/platform/codec_test.h"
#include "tests/support/song.h"

namespace {

using codec_test::bytes;
using codec_test::kUnits;
using codec_test::samples;

constexpr int32_t kChunk = 16384;  // bytes, the source's buffer

struct reader {
    std::string path;
    xwav_info info = {};
    void *handle = nullptr;

    explicit reader(const std::string &file) : path(file) {
        const mtsrc_io io = codec_test::io_for(path);
        int32_t word = 0;
        handle = xwavd_create(&io, &info, &word);
    }
    ~reader() { xwavd_delete(handle); }
    reader(const reader &) = delete;
    reader &operator=(const reader &) = delete;
};

// Everything from where the reader stands; each chunk must hold whole sample frames and fit.
std::vector<int16_t> rest(reader &from, int32_t size = kChunk) {
    std::vector<int16_t> all;
    std::vector<int16_t> chunk(static_cast<size_t>(size) / 2);
    for (;;) {
        int32_t got = 0;
        int64_t first = 0;
        int64_t second = 0;
        const int32_t code = xwavd_get_frm(from.handle, chunk.data(), size, &got, &first, &second);
        if (code != 0) {
            EXPECT_EQ(code, 1);
            return all;
        }
        EXPECT_GT(got, 0);
        EXPECT_LE(got, size);
        EXPECT_EQ(got % (2 * from.info.channels), 0);
        if (got <= 0 || got > size) {
            return all;
        }
        all.insert(all.end(), chunk.begin(), chunk.begin() + got / 2);
    }
}

std::vector<int16_t> numbers(size_t count) {
    std::vector<int16_t> pcm(count);
    for (size_t i = 0; i < count; ++i) {
        pcm[i] = static_cast<int16_t>(i * 7919);
    }
    return pcm;
}

void put(bytes &out, uint64_t value, int count) {
    for (int i = 0; i < count; ++i) {
        out.push_back(static_cast<uint8_t>(value >> (8 * i)));
    }
}

void put(bytes &out, const char *text) {
    out.insert(out.end(), text, text + strlen(text));
}

bytes format_chunk(uint32_t tag, uint32_t channels, uint32_t rate, uint32_t bits) {
    bytes out;
    put(out, "fmt ");
    put(out, 16, 4);
    put(out, tag, 2);
    put(out, channels, 2);
    put(out, rate, 4);
    put(out, rate * channels * bits / 8, 4);
    put(out, channels * bits / 8, 2);
    put(out, bits, 2);
    return out;
}

bytes riff(const std::vector<bytes> &chunks) {
    bytes out;
    put(out, "RIFF");
    put(out, 0, 4);
    put(out, "WAVE");
    for (const bytes &chunk : chunks) {
        out.insert(out.end(), chunk.begin(), chunk.end());
    }
    return out;
}

bytes data_chunk(const std::vector<int16_t> &pcm) {
    bytes out;
    put(out, "data");
    put(out, pcm.size() * 2, 4);
    for (const int16_t sample : pcm) {
        put(out, static_cast<uint16_t>(sample), 2);
    }
    return out;
}

TEST(WavReader, ReadsEveryShapeOfHeader) {
    struct shape {
        const char *name;
        support::wav_spec plan;
        size_t frames;  // expected
    };
    support::wav_spec base;
    std::vector<shape> shapes;
    const auto add = [&](const char *name, size_t frames, auto change) {
        support::wav_spec plan = base;
        change(plan);
        shapes.push_back({name, plan, frames});
    };
    using support::wav_data_size;
    add("plain", 30000, [](support::wav_spec &) {});
    add("mono", 60000, [](support::wav_spec &s) { s.channels = 1; });
    add("six", 10000, [](support::wav_spec &s) { s.channels = 6; });
    add("extensible", 30000, [](support::wav_spec &s) { s.extensible = true; });
    add("odd", 30000, [](support::wav_spec &s) { s.other_chunks = s.junk_first = true; });
    add("zero", 30000, [](support::wav_spec &s) { s.data_size = wav_data_size::zero; });
    add("ones", 30000, [](support::wav_spec &s) { s.data_size = wav_data_size::all_ones; });
    add("large", 30000, [](support::wav_spec &s) { s.data_size = wav_data_size::too_large; });
    add("cut", 29998, [](support::wav_spec &s) { s.cut_bytes = 5; });
    const std::vector<int16_t> pcm = numbers(60000);
    for (const shape &each : shapes) {
        SCOPED_TRACE(each.name);
        reader file(codec_test::save("shape.wav", support::wav_bytes(pcm, each.plan)));
        ASSERT_NE(file.handle, nullptr);
        EXPECT_EQ(file.info.codec, kWexaPcm);
        EXPECT_EQ(file.info.bits, 16);
        EXPECT_EQ(file.info.sample_rate, 44100);
        ASSERT_EQ(file.info.channels, each.plan.channels);
        EXPECT_EQ(file.info.duration * 44100 / kUnits, static_cast<int64_t>(each.frames));
        const auto count = static_cast<ptrdiff_t>(each.frames) * each.plan.channels;
        EXPECT_EQ(rest(file), std::vector<int16_t>(pcm.begin(), pcm.begin() + count));
    }
}

TEST(WavReader, TakesTheDataBeforeTheFormat) {
    const std::vector<int16_t> pcm = numbers(1000);
    reader file(
        codec_test::save("order.wav", riff({data_chunk(pcm), format_chunk(1, 1, 8000, 16)})));
    ASSERT_NE(file.handle, nullptr);
    EXPECT_EQ(rest(file), pcm);
}

// A refused file says why where it can; a header too broken to say anything leaves the record
// empty.
TEST(WavReader, RefusesWhatTheSourceCannotUse) {
    struct refusal {
        const char *name;
        bytes contents;
        int32_t codec;
        int32_t bits;
    };
    const bytes data = data_chunk(numbers(1000));
    bytes cut_format = format_chunk(1, 2, 44100, 16);
    cut_format.resize(20);
    std::vector<refusal> refusals = {
        {"8 bits", riff({format_chunk(1, 2, 44100, 8), data}), kWexaPcm, 8},
        {"24 bits", riff({format_chunk(1, 2, 44100, 24), data}), kWexaPcm, 24},
        {"float", riff({format_chunk(3, 2, 44100, 32), data}), 3, 32},
        {"mu-law", riff({format_chunk(7, 1, 8000, 8), data}), 7, 8},
        {"no data", riff({format_chunk(1, 2, 44100, 16)}), kWexaPcm, 16},
        {"no channels", riff({format_chunk(1, 0, 44100, 16), data}), 0, 0},
        {"no rate", riff({format_chunk(1, 2, 0, 16), data}), 0, 0},
        {"no format", riff({data}), 0, 0},
        {"cut format", riff({cut_format}), 0, 0},
        {"nothing", riff({}), 0, 0},
        {"text", bytes(100, 'x'), 0, 0},
    };
    // The tag that another library's code for linear PCM would be mistaken for.
    refusals.push_back(
        {"tag 300", riff({format_chunk(300, 2, 44100, 16), data}), 300 | 0x10000, 16});
    for (const refusal &each : refusals) {
        SCOPED_TRACE(each.name);
        reader file(codec_test::save("refused.wav", each.contents));
        EXPECT_EQ(file.handle, nullptr);
        EXPECT_EQ(file.info.codec, each.codec);
        EXPECT_EQ(file.info.bits, each.bits);
    }
}

TEST(WavReader, SeeksToWholeSecondsAndReportsTimes) {
    const std::vector<int16_t> pcm = numbers(2 * 22051);  // one sample frame beyond 2 s at 11025 Hz
    support::wav_spec plan;
    plan.rate = 11025;
    reader file(codec_test::save("seek.wav", support::wav_bytes(pcm, plan)));
    ASSERT_NE(file.handle, nullptr);
    struct landing {
        int64_t seconds;
        int64_t sample;
    };
    for (const landing &each :
         {landing{1, 11025}, {0, 0}, {2, 22050}, {3, 22051}, {INT64_MAX, 22051}, {-5, 0}}) {
        int64_t reached = -1;
        ASSERT_EQ(xwavd_seek(file.handle, &each.seconds, &reached, 0), 0);
        EXPECT_EQ(reached * 11025 / kUnits, each.sample) << each.seconds;
        EXPECT_EQ(rest(file), std::vector<int16_t>(pcm.begin() + 2 * each.sample, pcm.end()));
    }
}

// Sparse files: the samples looked for lie behind the reach of 32-bit offsets.
TEST(WavReader, ReadsBeyondTwoAndFourGibibytes) {
    struct large {
        const char *name;
        int64_t data_bytes;
        bytes head;
    };
    const int64_t three = int64_t{3} << 30;
    const int64_t five = int64_t{5} << 30;
    bytes wide = riff({});
    memcpy(wide.data(), "RF64", 4);
    put(wide, "ds64");
    put(wide, 28, 4);
    put(wide, 0, 8);
    put(wide, static_cast<uint64_t>(five), 8);
    put(wide, 0, 8);
    put(wide, 0, 4);
    const bytes format = format_chunk(1, 2, 44100, 16);
    wide.insert(wide.end(), format.begin(), format.end());
    put(wide, "data");
    put(wide, 0xFFFFFFFF, 4);
    bytes plain = riff({format});
    put(plain, "data");
    put(plain, static_cast<uint64_t>(three), 4);
    for (const large &each : {large{"3 GiB", three, plain}, large{"5 GiB", five, wide}}) {
        SCOPED_TRACE(each.name);
        const std::string path = codec_test::save("large.wav", each.head);
        const int64_t seconds = (each.data_bytes - 1) / (44100 * 4);
        const int64_t at = static_cast<int64_t>(each.head.size()) + seconds * 44100 * 4;
        const int16_t mark[2] = {1234, -4321};
        const int fd = open(path.c_str(), O_RDWR);
        ASSERT_GE(fd, 0);
        // One byte of a following chunk is not part of the data.
        ASSERT_EQ(ftruncate(fd, static_cast<int64_t>(each.head.size()) + each.data_bytes + 1), 0);
        ASSERT_EQ(pwrite(fd, mark, sizeof mark, at), static_cast<ssize_t>(sizeof mark));
        close(fd);
        reader file(path);
        ASSERT_NE(file.handle, nullptr);
        EXPECT_EQ(file.info.duration * 44100 / kUnits, each.data_bytes / 4);
        int64_t reached = 0;
        ASSERT_EQ(xwavd_seek(file.handle, &seconds, &reached, 0), 0);
        EXPECT_EQ(reached, seconds * kUnits);
        const std::vector<int16_t> got = rest(file);
        ASSERT_EQ(static_cast<int64_t>(got.size()), 2 * (each.data_bytes / 4 - seconds * 44100));
        EXPECT_EQ(got[0], mark[0]);
        EXPECT_EQ(got[1], mark[1]);
        unlink(path.c_str());
    }
}

TEST(WavReader, FailsOnABufferSmallerThanASampleFrame) {
    reader file(codec_test::save(
        "wide.wav", riff({format_chunk(1, 9000, 8000, 16), data_chunk(numbers(27000))})));
    ASSERT_NE(file.handle, nullptr);
    std::vector<uint8_t> buf(kChunk);
    int32_t got = 0;
    int64_t unused = 0;
    EXPECT_EQ(xwavd_get_frm(file.handle, buf.data(), kChunk, &got, &unused, &unused), -1);
}

}  // namespace
