#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <random>

#include "media_source/wexaaudio.h"
#include "tests/platform/codec_test.h"

namespace {

using codec_test::bytes;
using codec_test::fixture;
using codec_test::kUnits;
using codec_test::load;
using codec_test::read_all;
using codec_test::samples;
using codec_test::save;

// Check sums by the definition, bit for bit.
uint32_t crc(const uint8_t *p, size_t n, uint32_t poly, int bits) {
    uint32_t sum = 0;
    for (size_t i = 0; i < n; ++i) {
        sum ^= static_cast<uint32_t>(p[i]) << (bits - 8);
        for (int k = 0; k < 8; ++k) {
            sum = (sum >> (bits - 1) & 1) != 0 ? (sum << 1) ^ poly : sum << 1;
        }
        sum &= (1U << bits) - 1;
    }
    return sum;
}

// A frame number as FLAC writes it.
bytes coded(uint64_t number) {
    if (number < 0x80) {
        return {static_cast<uint8_t>(number)};
    }
    int more = 1;
    while (number >> (6 * more + 6 - more) != 0) {
        ++more;
    }
    bytes out = {static_cast<uint8_t>((0xFF00 >> (more + 1)) | number >> (6 * more))};
    while (more-- > 0) {
        out.push_back(static_cast<uint8_t>(0x80 | (number >> (6 * more) & 0x3F)));
    }
    return out;
}

struct parts {
    bytes head;  // everything before the first frame
    std::vector<bytes> frames;
};

// Takes a fixed-block file of an encoder apart, by its frames' running numbers.
parts split(const bytes &file) {
    size_t at = 4;
    bool last = false;
    while (!last) {
        last = (file[at] & 0x80) != 0;
        at += 4 + (static_cast<size_t>(file[at + 1]) << 16 |
                   static_cast<size_t>(file[at + 2]) << 8 | file[at + 3]);
    }
    parts out = {bytes(file.begin(), file.begin() + static_cast<ptrdiff_t>(at)), {}};
    for (uint64_t number = 1; at < file.size(); ++number) {
        const bytes next_number = coded(number);
        size_t end = at + 1;
        for (; end < file.size(); ++end) {
            const size_t header = 4 + next_number.size() + (file[end + 2] >> 4 == 7 ? 2 : 0) +
                                  (file[end + 2] >> 4 == 6 ? 1 : 0);
            if (end + header < file.size() && file[end] == 0xFF && file[end + 1] == 0xF8 &&
                std::equal(next_number.begin(), next_number.end(),
                           file.begin() + static_cast<ptrdiff_t>(end) + 4) &&
                crc(file.data() + end, header, 0x07, 8) == file[end + header]) {
                break;
            }
        }
        out.frames.emplace_back(file.begin() + static_cast<ptrdiff_t>(at),
                                file.begin() + static_cast<ptrdiff_t>(end));
        at = end;
    }
    return out;
}

// The frame under another number, in a stream of fixed or variable blocks.
bytes renumbered(const bytes &frame, uint64_t number, bool variable) {
    size_t old_number = 1;
    while ((frame[4] << old_number & 0x80) != 0 && (frame[4] & 0x80) != 0) {
        ++old_number;
    }
    const size_t tail = (frame[2] >> 4 == 7 ? 2U : 0U) + (frame[2] >> 4 == 6 ? 1U : 0U);
    bytes out = {0xFF, static_cast<uint8_t>(variable ? 0xF9 : 0xF8), frame[2], frame[3]};
    const bytes text = coded(number);
    out.insert(out.end(), text.begin(), text.end());
    const auto extra = frame.begin() + 4 + static_cast<ptrdiff_t>(old_number);
    out.insert(out.end(), extra, extra + static_cast<ptrdiff_t>(tail));
    out.push_back(static_cast<uint8_t>(crc(out.data(), out.size(), 0x07, 8)));
    out.insert(out.end(), extra + static_cast<ptrdiff_t>(tail) + 1, frame.end() - 2);
    const uint32_t sum = crc(out.data(), out.size(), 0x8005, 16);
    out.push_back(static_cast<uint8_t>(sum >> 8));
    out.push_back(static_cast<uint8_t>(sum));
    return out;
}

bytes joined(const bytes &head, const std::vector<bytes> &frames) {
    bytes out = head;
    for (const bytes &frame : frames) {
        out.insert(out.end(), frame.begin(), frame.end());
    }
    return out;
}

// Left channel of a 24-bit stereo WAV file, rounded to 16 bits.
samples rounded_left(const std::string &path) {
    const bytes file = load(path);
    const uint8_t name[] = {'d', 'a', 't', 'a'};
    const auto data = std::search(file.begin(), file.end(), name, name + 4) + 8;
    samples out;
    for (auto at = data; at + 6 <= file.end(); at += 6) {
        const int32_t wide = at[0] << 8 | at[1] << 16 | static_cast<int32_t>(at[2]) << 24;
        out.push_back(
            static_cast<int16_t>(std::min((int64_t{wide} + 0x8000) >> 16, int64_t{32767})));
    }
    return out;
}

TEST(Flac, GivesTheSamplesThatWereEncoded) {
    const samples song = read_all(fixture("song.wav"));
    for (const char *name :
         {"song.flac", "no_table.flac", "short_blocks.flac", "huge_blocks.flac"}) {
        EXPECT_EQ(read_all(fixture(name)), song) << name;
    }
    EXPECT_EQ(read_all(fixture("mono.flac")), read_all(fixture("mono.wav")));
    EXPECT_EQ(read_all(fixture("six.flac")), read_all(fixture("six.wav")));
}

// 24 bits at 96 kHz; and noise in blocks of 65,535 samples, whose frames no buffer of the source
// can hold.
TEST(Flac, RoundsTwentyFourBits) {
    EXPECT_EQ(read_all(fixture("wide.flac")), rounded_left(fixture("wide.wav")));
    EXPECT_EQ(read_all(fixture("noise.flac")), rounded_left(fixture("noise.wav")));
    codec_test::opened wide(fixture("wide.flac"));
    ASSERT_NE(wide.source, nullptr);
    EXPECT_EQ(wide.format.sample_rate, 96000);
}

TEST(Flac, FollowsBlocksOfAnyLengthAndGapsInNumbers) {
    const parts blocks = split(load(fixture("long_blocks.flac")));
    const parts shorter = split(load(fixture("short_blocks.flac")));
    const samples song = read_all(fixture("song.wav"));
    ASSERT_EQ(blocks.frames.size(), (song.size() + 4095) / 4096);
    // 36,864 is 9 blocks of 4096 and 32 of 1152: the two kinds by turns.
    std::vector<bytes> mixed;
    for (uint64_t start = 0; start < 36864 * 14; start += 36864) {
        const bool use_long = start / 36864 % 2 == 0;
        const uint64_t block = use_long ? 4096 : 1152;
        for (uint64_t at = start; at < start + 36864; at += block) {
            const std::vector<bytes> &from = use_long ? blocks.frames : shorter.frames;
            mixed.push_back(renumbered(from[at / block], at, true));
        }
    }
    const std::string variable = save("variable.flac", joined(blocks.head, mixed));
    EXPECT_EQ(read_all(variable), samples(song.begin(), song.begin() + 36864 * 14));
    codec_test::expect_exact_seams(variable);
    // Numbers that start late and jump: nothing is missing between the frames.
    std::vector<bytes> jumping;
    for (size_t i = 0; i < blocks.frames.size(); ++i) {
        const uint64_t number =
            1000 + i + (i >= 20 ? 1 : 0) + (i >= 50 ? 70000 : 0) - (i >= 90 ? 300 : 0);
        jumping.push_back(renumbered(blocks.frames[i], number, false));
    }
    const std::string gaps = save("gaps.flac", joined(blocks.head, jumping));
    EXPECT_EQ(read_all(gaps), song);
    codec_test::expect_exact_seams(gaps);
}

// The smallest last frame: one sample, a few bytes.
TEST(Flac, ReadsATinyLastFrame) {
    // A stereo frame of one sample, two constant subframes of 16 bits.
    bytes tiny = {0xFF, 0xF8, 0x69, 0x18, 0x00, 0x00, 0x00, 0x00, 0x12, 0x34, 0x00, 0x56, 0x78};
    tiny[6] = static_cast<uint8_t>(crc(tiny.data(), 6, 0x07, 8));
    tiny.resize(15);
    parts blocks = split(load(fixture("long_blocks.flac")));
    blocks.frames.resize(20);
    blocks.frames.push_back(renumbered(tiny, 20, false));
    const samples got = read_all(save("tiny.flac", joined(blocks.head, blocks.frames)));
    ASSERT_EQ(got.size(), 20U * 4096 + 1);
    EXPECT_EQ(got.back(), 0x1234);
}

// Silence of the right length in place of what is damaged; everything else as it was.
TEST(Flac, KeepsTheTimeOfDamagedFrames) {
    const parts blocks = split(load(fixture("long_blocks.flac")));
    const samples song = read_all(fixture("song.wav"));
    std::mt19937 random(9);
    struct damage {
        const char *name;
        size_t first, last;  // frames lost, last excluded
        void (*apply)(bytes *frame, std::mt19937 *random);
    };
    const damage kinds[] = {
        {"header", 40, 41, [](bytes *f, std::mt19937 *) { (*f)[0] = 0; }},
        {"one bit", 40, 41, [](bytes *f, std::mt19937 *) { (*f)[f->size() / 2] ^= 4; }},
        {"check sum", 40, 41, [](bytes *f, std::mt19937 *) { f->back() ^= 1; }},
        {"run of noise", 40, 60,
         [](bytes *f, std::mt19937 *r) {
             for (uint8_t &b : *f) {
                 b = static_cast<uint8_t>((*r)());
             }
         }},
        {"run of zeros", 40, 60,
         [](bytes *f, std::mt19937 *) { std::fill(f->begin(), f->end(), 0); }},
        {"frames gone, junk left", 40, 43,
         [](bytes *f, std::mt19937 *r) {
             f->resize(30);
             for (uint8_t &b : *f) {
                 b = static_cast<uint8_t>((*r)());
             }
         }},
    };
    for (const damage &each : kinds) {
        SCOPED_TRACE(each.name);
        std::vector<bytes> frames = blocks.frames;
        samples wanted = song;
        for (size_t i = each.first; i < each.last; ++i) {
            each.apply(&frames[i], &random);
            std::fill_n(wanted.begin() + static_cast<ptrdiff_t>(i) * 4096, 4096, int16_t{0});
        }
        const std::string path = save("damaged.flac", joined(blocks.head, frames));
        const samples got = read_all(path);
        ASSERT_EQ(got.size(), wanted.size());
        const auto differs = std::mismatch(got.begin(), got.end(), wanted.begin());
        EXPECT_EQ(differs.first - got.begin(), static_cast<ptrdiff_t>(got.size()));
        codec_test::expect_exact_seams(path);
    }
}

TEST(Flac, PassesWhatSurroundsTheStreamAndCountsWhatACutFileHolds) {
    const bytes file = load(fixture("song.flac"));
    const samples song = read_all(fixture("song.wav"));
    bytes tagged = {'I', 'D', '3', 4, 0, 0, 0, 0, 0, 100};
    tagged.resize(110, 0xFF);
    tagged.insert(tagged.end(), file.begin(), file.end());
    bytes id3v1(128, 0);
    memcpy(id3v1.data(), "TAG", 3);
    tagged.insert(tagged.end(), id3v1.begin(), id3v1.end());
    EXPECT_EQ(read_all(save("tagged.flac", tagged)), song);
    bytes junk = file;
    junk.resize(file.size() + 500, 0x5A);
    EXPECT_EQ(read_all(save("junk.flac", junk)), song);

    const parts blocks = split(load(fixture("long_blocks.flac")));
    std::vector<bytes> frames(blocks.frames.begin(), blocks.frames.begin() + 31);
    for (const size_t kept : {size_t{3}, frames[30].size() / 2, frames[30].size() - 1}) {
        frames[30].resize(kept);
        const std::string path = save("cut.flac", joined(blocks.head, frames));
        EXPECT_EQ(read_all(path), samples(song.begin(), song.begin() + 30 * 4096)) << kept;
        codec_test::opened cut(path);
        ASSERT_NE(cut.source, nullptr);
        EXPECT_EQ(cut.format.duration * 44100 / kUnits, 30 * 4096);
        frames[30] = blocks.frames[30];
    }
}

TEST(Flac, FillsTheTagRecord) {
    const std::string path = fixture("no_table.flac");
    const mtsrc_io io = codec_test::io_for(path);
    int64_t word = 0;
    xflac_info info = {};
    void *reader = xflacfd_create(&io, &word, &info, nullptr);
    ASSERT_NE(reader, nullptr);
    ASSERT_NE(info.tags, nullptr);
    EXPECT_STREQ(static_cast<char *>(info.tags->entry[0].first), "KEY");
    EXPECT_STREQ(static_cast<char *>(info.tags->entry[0].second), "Am");
    EXPECT_NE(info.tags->last, nullptr);
    static_cast<uint8_t *>(reader)[kFlacReaderFlag] = 1;  // the source's privilege
    free(info.tags->entry[0].first);
    info.tags->entry[0].first = nullptr;
    xflacfd_delete(reader);
}

TEST(Flac, RefusesFilesWithoutAStream) {
    const bytes file = load(fixture("song.flac"));
    const parts blocks = split(load(fixture("long_blocks.flac")));
    bytes no_information = file;
    no_information[4] = 1;  // a padding block in its place
    for (const bytes &contents : {bytes{'f', 'L', 'a', 'C'}, bytes(file.begin(), file.begin() + 30),
                                  blocks.head, no_information}) {
        const std::string path = save("none.flac", contents);
        const mtsrc_io io = codec_test::io_for(path);
        int64_t word = 0;
        xflac_info info = {};
        EXPECT_EQ(xflacfd_create(&io, &word, &info, nullptr), nullptr);
        EXPECT_EQ(info.tags, nullptr);
    }
}

}  // namespace
