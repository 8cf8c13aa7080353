#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <random>

#include "media_source/wexaaudio.h"
#include "tests/platform/codec_test.h"

namespace {

using codec_test::bytes;
using codec_test::expect_same;
using codec_test::fixture;
using codec_test::kUnits;
using codec_test::load;
using codec_test::read_all;
using codec_test::samples;
using codec_test::save;

constexpr int32_t kDelay = 529;    // sample pairs that the source drops at 44.1 kHz stereo
constexpr int32_t kFrame = 1152;   // samples of a Layer II or MPEG-1 Layer III frame
constexpr size_t kCbrFrame = 417;  // bytes at 128 kbit/s, 44.1 kHz, unpadded

// Sizes of the frames of a constant-rate 128-kbit/s file at 44.1 kHz: 417 and the padding bit.
std::vector<size_t> cbr_frames(const bytes &file) {
    std::vector<size_t> at;
    for (size_t i = 0; i + 4 <= file.size(); i += kCbrFrame + (file[i + 2] >> 1 & 1)) {
        EXPECT_EQ(file[i], 0xFF);
        at.push_back(i);
    }
    return at;
}

bytes joined(const bytes &a, const bytes &b) {
    bytes out = a;
    out.insert(out.end(), b.begin(), b.end());
    return out;
}

// An ID3v2.3 tag whose body looks like frames of another stream.
bytes false_tag(size_t size) {
    bytes tag = {'I', 'D', '3', 3, 0, 0, 0, 0};
    tag.push_back(static_cast<uint8_t>(size >> 7));
    tag.push_back(static_cast<uint8_t>(size & 0x7F));
    while (tag.size() < 10 + size) {
        tag.push_back(tag.size() % 104 == 10 ? 0xFF : tag.size() % 104 == 11 ? 0xFB : 0x10);
    }
    return tag;
}

// The encoder delays by 576 samples, the decoder by 529 of which the source drops as many: the song
// comes 576 samples late, at no other offset so near.
TEST(MpegAudio, DropsTheDecodersDelay) {
    const samples song = read_all(fixture("song.wav"));
    bytes raw = load(fixture("song.wav"));
    const samples at44 = read_all(fixture("vbr.mp3"));
    // The source averages the channels of MPEG audio; the left one alone is in song.
    samples mean;
    for (size_t i = 44; i + 4 <= raw.size(); i += 4) {
        int16_t pair[2];
        memcpy(pair, raw.data() + i, 4);
        mean.push_back(static_cast<int16_t>((pair[0] + pair[1]) / 2));
    }
    ASSERT_EQ(mean.size(), song.size());
    double best = 1e300;
    int best_offset = -1;
    for (int offset = 560; offset < 592; ++offset) {
        double error = 0;
        for (size_t i = 200000; i < 260000; ++i) {
            const double d = at44[i + static_cast<size_t>(offset)] - mean[i];
            error += d * d;
        }
        if (error < best) {
            best = error;
            best_offset = offset;
        }
    }
    EXPECT_EQ(best_offset, 576);
}

// With and without the encoder's table the same music follows; all three kinds of table are known.
TEST(MpegAudio, SkipsTheEncodersTable) {
    const samples plain = read_all(fixture("vbr_no_table.mp3"));
    EXPECT_EQ(read_all(fixture("vbr.mp3")), plain);
    bytes file = load(fixture("vbr.mp3"));
    const size_t at = 36;  // behind the side information of MPEG-1 stereo, as it happens VBRI's too
    ASSERT_EQ(memcmp(file.data() + at, "Xing", 4), 0);
    for (const char *name : {"Info", "VBRI"}) {
        memcpy(file.data() + at, name, 4);
        EXPECT_EQ(read_all(save("table.mp3", file)), plain) << name;
    }
}

TEST(MpegAudio, PassesTagsAndGarbage) {
    const bytes file = load(fixture("cbr.mp3"));
    const std::vector<size_t> at = cbr_frames(file);
    const samples plain = read_all(fixture("cbr.mp3"));
    bytes id3v1(128, 0);
    memcpy(id3v1.data(), "TAG", 3);
    bytes ape(32 + 64, 0x20);
    memcpy(ape.data() + 64, "APETAGEX", 8);
    const uint8_t ape_tail[] = {0xD0, 7, 0, 0, 96, 0, 0, 0, 1, 0, 0, 0, 0, 0, 0, 0};
    memcpy(ape.data() + 72, ape_tail, sizeof ape_tail);
    EXPECT_EQ(read_all(save("tag.mp3", joined(false_tag(5000), file))), plain);
    EXPECT_EQ(read_all(save("tag.mp3", joined(false_tag(300), joined(false_tag(5000), file)))),
              plain);
    EXPECT_EQ(read_all(save("tag.mp3", joined(file, joined(ape, id3v1)))), plain);
    // In the middle: a tag, and bytes that are no whole number of frames.
    std::mt19937 random(3);
    bytes noise(1000);
    std::generate(noise.begin(), noise.end(), [&] { return static_cast<uint8_t>(random()); });
    for (const bytes &between : {false_tag(5000), noise}) {
        bytes split(file.begin(), file.begin() + static_cast<ptrdiff_t>(at[100]));
        split = joined(split, between);
        split.insert(split.end(), file.begin() + static_cast<ptrdiff_t>(at[100]), file.end());
        EXPECT_EQ(read_all(save("tag.mp3", split)), plain);
    }
}

// What is destroyed becomes silence or noise of the same length; the rest of the song stays in its
// place and comes out as before, also behind a seek.
TEST(MpegAudio, KeepsTheTimeOfDamagedFrames) {
    const bytes file = load(fixture("cbr.mp3"));
    const std::vector<size_t> at = cbr_frames(file);
    const samples plain = read_all(fixture("cbr.mp3"));
    std::mt19937 random(5);
    for (const bool headers : {true, false}) {
        SCOPED_TRACE(headers);
        bytes damaged = file;
        for (size_t i = 100; i < 150; ++i) {
            const size_t from = at[i] + (headers ? 0 : 4);
            for (size_t k = from; k < at[i + 1]; ++k) {
                damaged[k] = headers ? uint8_t{0} : static_cast<uint8_t>(random());
            }
        }
        const std::string path = save("damaged.mp3", damaged);
        const samples got = read_all(path);
        ASSERT_EQ(got.size(), plain.size());
        expect_same(got, plain, 0, 100 * kFrame - kDelay);
        expect_same(got, plain, 160 * kFrame, plain.size());
        if (headers) {
            const auto silent = got.begin() + 102 * kFrame;
            EXPECT_TRUE(
                std::all_of(silent, silent + 40 * kFrame, [](int16_t s) { return s == 0; }));
        }
        if (headers) {
            codec_test::expect_exact_seams(path);
        }
        // Behind noise that passes for frames, seams are exact again.
        codec_test::opened file_again(path);
        ASSERT_NE(file_again.source, nullptr);
        int64_t reached = 0;
        ASSERT_EQ(mtsrc_seekstream(file_again.source, 155 * kFrame * kUnits / 44100, &reached), 0);
        const size_t sample = static_cast<size_t>(reached * 44100 / kUnits);
        const samples behind = codec_test::read(file_again.source, 100000);
        expect_same(behind, samples(got.begin() + static_cast<ptrdiff_t>(sample), got.end()), 0,
                    100000);
    }
}

TEST(MpegAudio, CountsWhatACutFileHolds) {
    const bytes file = load(fixture("cbr.mp3"));
    const std::vector<size_t> at = cbr_frames(file);
    const samples plain = read_all(fixture("cbr.mp3"));
    // Cut inside the last frame kept: it is not there.
    bytes head(file.begin(), file.begin() + static_cast<ptrdiff_t>(at[200] + 300));
    const samples first = read_all(save("cut.mp3", head));
    ASSERT_EQ(first.size(), 200U * kFrame - kDelay);
    expect_same(first, plain, 0, first.size());
    codec_test::opened cut(save("cut.mp3", head));
    ASSERT_NE(cut.source, nullptr);
    EXPECT_EQ(cut.format.duration * 44100 / kUnits, 200 * kFrame - kDelay);
    // Cut at the front, inside a frame: the bits that the first frames reach back to are missing.
    bytes tail(file.begin() + static_cast<ptrdiff_t>(at[200] + 100), file.end());
    const samples rest = read_all(save("tail.mp3", tail));
    const size_t frames = at.size() - 201;
    ASSERT_EQ(rest.size(), frames * kFrame - kDelay);
    const size_t offset = plain.size() - rest.size();
    for (size_t i = 12 * kFrame; i < rest.size(); ++i) {
        ASSERT_EQ(rest[i], plain[i + offset]) << i;
    }
    codec_test::expect_exact_seams(save("tail.mp3", tail));
}

using direct = codec_test::direct<xmp123_info, int64_t, xmp123fd_create, xmp123fd_delete>;

TEST(MpegAudio, MarksTheFirstFrameOnly) {
    direct file(fixture("vbr.mp3"));
    ASSERT_NE(file.reader, nullptr);
    bytes buf(19200);
    for (int round = 0; round < 2; ++round) {
        for (int i = 0; i < 100; ++i) {
            int32_t got = 0;
            int64_t first = -1;
            int64_t second = -1;
            ASSERT_EQ(xmp123fd_get_frm(file.reader, buf.data(), 19200, &got, &first, &second), 0);
            EXPECT_EQ(first == 0, i == 0) << i;
        }
        const int64_t start = 0;
        int64_t reached = -1;
        ASSERT_EQ(xmp123fd_seek(file.reader, &start, &reached), 0);
        EXPECT_EQ(reached, 0);
    }
}

TEST(MpegAudio, FillsTheRestOfTheTagRecord) {
    direct file(fixture("tagged.mp3"));
    ASSERT_NE(file.reader, nullptr);
    wexa_tags *tags = file.info.tags;
    ASSERT_NE(tags, nullptr);
    EXPECT_STREQ(static_cast<char *>(tags->text[4].data), "1999");
    EXPECT_STREQ(static_cast<char *>(tags->text[5].data), "3/9");
    EXPECT_STREQ(static_cast<char *>(tags->text[7].data), "A comment");
    EXPECT_NE(tags->last, nullptr);  // the encoder names itself
    free(tags->text[0].data);        // as a source does; the rest is the reader's to free
    tags->text[0].data = nullptr;
}

TEST(MpegAudio, ReadsTagsOfEveryVersionAndEncoding) {
    struct tag {
        const char *name;
        bytes contents;
        const char *title;
    };
    const tag tags[] = {
        {"2.2 latin",
         {'I', 'D', '3', 2, 0, 0, 0, 0, 0, 10, 'T', 'T', '2', 0, 0, 4, 0, 'A', 0xE9, 'b'},
         "A\xC3\xA9"
         "b"},
        {"2.3 utf-16",
         {'I', 'D', '3', 3, 0, 0, 0,    0,    0,   19, 'T',  'I',  'T',  '2', 0,
          0,   0,   9,   0, 0, 1, 0xFF, 0xFE, 'A', 0,  0x3D, 0xD8, 0x00, 0xDE},
         "A\xF0\x9F\x98\x80"},
        {"2.3 unsynchronised",
         {'I', 'D', '3', 3, 0, 0x80, 0, 0, 0,    16,   'T',  'I', 'T',
          '2', 0,   0,   0, 5, 0,    0, 1, 0xFF, 0x00, 0xFE, 'B', 0},
         "B"},
        {"2.4 utf-8",
         {'I', 'D', '3', 4, 0, 0, 0, 0, 0, 14,   'T',  'I',
          'T', '2', 0,   0, 0, 4, 0, 0, 3, 0xC3, 0xA9, 'x'},
         "\xC3\xA9x"},
        {"size beyond the tag",
         {'I', 'D', '3', 4, 0, 0,  0, 0, 0, 14,  'T', 'I',
          'T', '2', 0,   0, 0, 40, 0, 0, 3, 'a', 'b', 'c'},
         nullptr},
    };
    const bytes file = load(fixture("cbr.mp3"));
    for (const tag &each : tags) {
        SCOPED_TRACE(each.name);
        direct opened(save("tags.mp3", joined(each.contents, file)));
        ASSERT_NE(opened.reader, nullptr);
        ASSERT_NE(opened.info.tags, nullptr);
        EXPECT_STREQ(static_cast<char *>(opened.info.tags->text[0].data), each.title);
    }
}

TEST(MpegAudio, RefusesFreeFormat) {
    bytes free_format = load(fixture("cbr.mp3"));
    for (const size_t i : cbr_frames(free_format)) {
        free_format[i + 2] &= 0x0F;
    }
    EXPECT_EQ(direct(save("free.mp3", free_format)).reader, nullptr);
}

// Layer I frames of 448 kbit/s in which every subband of both channels has 3-bit samples: any bits
// are valid, so random ones make a signal. No encoder here writes this layer.
bytes layer1(int frames, int rate_index, int rate) {
    std::mt19937 random(11);
    const size_t size = static_cast<size_t>(4 * (12 * 448000 / rate));
    bytes out;
    for (int i = 0; i < frames; ++i) {
        const size_t start = out.size();
        out.insert(out.end(), {0xFF, 0xFF, static_cast<uint8_t>(0xE0 | rate_index << 2), 0x00});
        out.insert(out.end(), 32, 0x22);  // allocation: 4 bits for each of 2 x 32 subbands
        while (out.size() < start + size) {
            out.push_back(static_cast<uint8_t>((random() & 0x3F) | 0x40));
        }
    }
    return out;
}

TEST(MpegAudio, DecodesLayerOne) {
    for (const int rate : {44100, 48000}) {
        const std::string path = save("layer1.mp1", layer1(300, rate == 44100 ? 0 : 1, rate));
        const samples got = read_all(path);
        // At 44.1 kHz the first frame is shorter than the delay and goes whole, nothing more.
        EXPECT_EQ(got.size(), (rate == 44100 ? 299U : 300U) * 384);
        EXPECT_TRUE(std::any_of(got.begin(), got.end(), [](int16_t s) { return s > 100; }));
        codec_test::expect_exact_seams(path);
    }
}

}  // namespace
