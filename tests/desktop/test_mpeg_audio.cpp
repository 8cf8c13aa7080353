#include <algorithm>
#include <cstring>

#include "tests/desktop/codec_test.h"

namespace codec_test {
namespace {

constexpr size_t kDelay = 529;     // sample pairs that the source drops at 44.1 kHz stereo
constexpr size_t kFrame = 1152;    // samples of a Layer II or MPEG-1 Layer III frame
constexpr size_t kCbrFrame = 417;  // bytes at 128 kbit/s, 44.1 kHz, unpadded

// Offsets of the frames of a constant-rate 128-kbit/s file at 44.1 kHz: 417 and the padding bit.
std::vector<size_t> cbr_frames(const bytes &file) {
    std::vector<size_t> at;
    for (size_t i = 0; i + 4 <= file.size(); i += kCbrFrame + (file[i + 2] >> 1 & 1)) {
        EXPECT_EQ(file[i], 0xFF);
        at.push_back(i);
    }
    return at;
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

TEST(MpegAudio, KnowsEveryKindOfEncodersTable) {
    bytes file = load(fixture("vbr.mp3"));
    const size_t at = 36;  // behind the side information of MPEG-1 stereo, as it happens VBRI's too
    ASSERT_EQ(memcmp(file.data() + at, "Xing", 4), 0);
    for (const char *name : {"Info", "VBRI"}) {
        memcpy(file.data() + at, name, 4);
        EXPECT_EQ(read_all(save("table.mp3", file)), read_all(fixture("vbr_no_table.mp3"))) << name;
    }
}

TEST(MpegAudio, PassesTagsAndGarbage) {
    const bytes file = load(fixture("cbr.mp3"));
    const samples plain = read_all(fixture("cbr.mp3"));
    bytes id3v1 = {'T', 'A', 'G'};
    id3v1.resize(128);
    bytes ape_end = {'A', 'P', 'E', 'T', 'A', 'G', 'E', 'X', 0xD0, 7, 0, 0, 64 + 32, 0, 0, 0, 1};
    ape_end.resize(32);
    const bytes ape = joined({bytes(64, 0x20), ape_end});
    const bytes front = part(file, 0, cbr_frames(file)[100]);
    const bytes back = part(file, front.size());
    const size_t all = plain.size();
    expect_changed(plain,
                   {{"tag in front", joined({false_tag(5000), file}), all, all},
                    {"two tags", joined({false_tag(300), false_tag(5000), file}), all, all},
                    {"tags behind", joined({file, ape, id3v1}), all, all},
                    {"tag in the middle", joined({front, false_tag(5000), back}), all, all},
                    {"no whole number of frames", joined({front, noise(1000), back}), all, all}});
}

// What is destroyed becomes silence or noise of the same length; the rest of the song stays in its
// place and comes out as before, also behind a seek. What is cut off is not there; cut at the
// front, the bits that the first frames reach back to are missing.
TEST(MpegAudio, KeepsTheTimeOfDamagedFrames) {
    const bytes file = load(fixture("cbr.mp3"));
    const std::vector<size_t> at = cbr_frames(file);
    const samples plain = read_all(fixture("cbr.mp3"));
    const bytes junk = noise(file.size());
    bytes zeros = file;
    bytes noisy = file;
    for (size_t i = 100; i < 150; ++i) {
        std::fill(&zeros[at[i]], &zeros[at[i + 1]], uint8_t{0});
        std::copy(&junk[at[i] + 4], &junk[at[i + 1]], &noisy[at[i] + 4]);
    }
    const size_t all = plain.size();
    const size_t sound = 100 * kFrame - kDelay;
    const size_t head = 200 * kFrame - kDelay;
    const size_t tail = (at.size() - 201) * kFrame - kDelay;
    expect_changed(
        plain,
        {{"zeros", zeros, all, sound, 160 * kFrame, 102 * kFrame, 142 * kFrame},
         {"noise that passes for frames", noisy, all, sound, 160 * kFrame, 0, 0, false},
         {"cut in a frame", part(file, 0, at[200] + 300), head, head},
         {"front cut in a frame", part(file, at[200] + 100), tail, 0, all - tail + 12 * kFrame}});

    // Behind the noise, seams are exact again.
    const samples linear = read_all(save("noisy.mp3", noisy));
    const opened again(save("noisy.mp3", noisy));
    ASSERT_NE(again.source, nullptr);
    int64_t reached = 0;
    ASSERT_EQ(mtsrc_seekstream(again.source, 155 * kFrame * kUnits / 44100, &reached), 0);
    const auto from = linear.begin() + reached * 44100 / kUnits;
    expect_same(read(again.source, 100'000), {from, from + 100'000});
}

TEST(MpegAudio, RefusesFreeFormat) {
    bytes free_format = load(fixture("cbr.mp3"));
    for (const size_t i : cbr_frames(free_format)) free_format[i + 2] &= 0x0F;
    EXPECT_EQ(direct_mpeg(save("free.mp3", free_format)).reader, nullptr);
}

// Layer I frames of 448 kbit/s in which every subband of both channels has 3-bit samples: any bits
// are valid, so random ones make a signal. No encoder here writes this layer.
bytes layer1(size_t frames, int rate_index, size_t rate) {
    const size_t size = 4 * (12 * 448'000 / rate);
    const bytes junk = noise(frames * size);
    bytes out;
    for (size_t i = 0; i < frames; ++i) {
        out.insert(out.end(), {0xFF, 0xFF, static_cast<uint8_t>(0xE0 | rate_index << 2), 0x00});
        out.insert(out.end(), 32, 0x22);  // allocation: 4 bits for each of 2 x 32 subbands
        while (out.size() < (i + 1) * size) {
            out.push_back(static_cast<uint8_t>((junk[out.size()] & 0x3F) | 0x40));
        }
    }
    return out;
}

TEST(MpegAudio, DecodesLayerOne) {
    for (const bool slow : {true, false}) {
        const std::string path =
            save("layer1.mp1", layer1(300, slow ? 0 : 1, slow ? 44100 : 48000));
        const samples got = read_all(path);
        // At 44.1 kHz the first frame is shorter than the delay and goes whole, nothing more.
        EXPECT_EQ(got.size(), (slow ? 299U : 300U) * 384);
        EXPECT_TRUE(std::any_of(got.begin(), got.end(), [](int16_t s) { return s > 100; }));
        expect_exact_seams(path);
    }
}

}  // namespace
}  // namespace codec_test
