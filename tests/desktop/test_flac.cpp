#include <algorithm>
#include <functional>

#include "tests/desktop/codec_test.h"

namespace codec_test {
namespace {

constexpr size_t kBlock = 4096;  // samples of a frame of long_blocks.flac

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

// Bytes of a frame's header behind the number, without the check sum: the length of the block,
// where it is none of the usual ones.
size_t length_bytes(const uint8_t *frame) {
    const int code = frame[2] >> 4;
    return code == 7 ? 2 : code == 6 ? 1 : 0;
}

bool is_frame(const bytes &file, size_t at, uint64_t number) {
    const bytes text = coded(number);
    if (at + 6 + text.size() > file.size() || file[at] != 0xFF || file[at + 1] != 0xF8)
        return false;
    const size_t header = 4 + text.size() + length_bytes(&file[at]);
    return at + header < file.size() && std::equal(text.begin(), text.end(), &file[at + 4]) &&
           crc(&file[at], header, 0x07, 8) == file[at + header];
}

// The frames of a fixed-block file of an encoder, and what goes before them, which is the first of
// the pieces.
std::vector<bytes> split(const bytes &file) {
    std::vector<bytes> pieces;
    size_t from = 0;
    for (size_t at = 1; at < file.size(); ++at) {
        if (!is_frame(file, at, pieces.size())) continue;
        pieces.push_back(part(file, from, at));
        from = at;
    }
    pieces.push_back(part(file, from));
    return pieces;
}

// The frame under another number, in a stream of fixed or variable blocks.
bytes renumbered(const bytes &frame, uint64_t old_number, uint64_t number, bool variable) {
    const size_t extra = 4 + coded(old_number).size();
    const size_t sum = extra + length_bytes(frame.data());
    bytes out = joined({{0xFF, static_cast<uint8_t>(variable ? 0xF9 : 0xF8), frame[2], frame[3]},
                        coded(number),
                        part(frame, extra, sum)});
    out.push_back(static_cast<uint8_t>(crc(out.data(), out.size(), 0x07, 8)));
    out = joined({out, part(frame, sum + 1, frame.size() - 2)});
    const uint32_t whole_sum = crc(out.data(), out.size(), 0x8005, 16);
    out.push_back(static_cast<uint8_t>(whole_sum >> 8));
    out.push_back(static_cast<uint8_t>(whole_sum));
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

// 24 bits at 96 kHz; and noise in blocks of 65,535 samples, whose frames no buffer of the source
// can hold.
TEST(Flac, RoundsTwentyFourBits) {
    expect_same(read_all(fixture("wide.flac")), rounded_left(fixture("wide.wav")));
    expect_same(read_all(fixture("noise.flac")), rounded_left(fixture("noise.wav")));
    EXPECT_EQ(opened(fixture("wide.flac")).format.sample_rate, 96000);
}

TEST(Flac, FollowsBlocksOfAnyLengthAndGapsInNumbers) {
    const std::vector<bytes> blocks = split(load(fixture("long_blocks.flac")));
    const std::vector<bytes> shorter = split(load(fixture("short_blocks.flac")));
    const samples song = read_all(fixture("song.wav"));
    const size_t frames = blocks.size() - 1;
    ASSERT_EQ(frames, (song.size() + kBlock - 1) / kBlock);
    // 36,864 is 9 blocks of 4096 and 32 of 1152: the two kinds by turns.
    std::vector<bytes> mixed = {blocks[0]};
    for (size_t start = 0; start < 36864 * 14; start += 36864) {
        const bool use_long = start / 36864 % 2 == 0;
        const size_t block = use_long ? kBlock : 1152;
        for (size_t at = start; at < start + 36864; at += block) {
            const bytes &frame = (use_long ? blocks : shorter)[1 + at / block];
            mixed.push_back(renumbered(frame, at / block, at, true));
        }
    }
    // Numbers that start late and jump: nothing is missing between the frames.
    std::vector<bytes> jumping = {blocks[0]};
    for (size_t i = 0; i < frames; ++i) {
        const uint64_t number =
            1000 + i + (i >= 20 ? 1 : 0) + (i >= 50 ? 70000 : 0) - (i >= 90 ? 300 : 0);
        jumping.push_back(renumbered(blocks[1 + i], i, number, false));
    }
    // The smallest last frame, a few bytes: stereo, two constant subframes of one sample.
    const bytes tiny = {0xFF, 0xF8, 0x69, 0x18, 0, 0, 0, 0, 0x12, 0x34, 0, 0x56, 0x78, 0, 0};
    std::vector<bytes> tiny_end(blocks.begin(), blocks.begin() + 21);
    tiny_end.push_back(renumbered(tiny, 0, 20, false));
    expect_changed(song, {{"variable", joined(mixed), 36864 * 14, 36864 * 14},
                          {"gaps", joined(jumping), song.size(), song.size()},
                          {"tiny", joined(tiny_end), 20 * kBlock + 1, 20 * kBlock}});
    EXPECT_EQ(read_all(save("tiny.flac", joined(tiny_end))).back(), 0x1234);
}

// Silence of the right length in place of what is damaged; everything else as it was. A last frame
// that is cut is not there, nor is what surrounds the stream.
TEST(Flac, KeepsTheTimeOfDamagedFrames) {
    const std::vector<bytes> blocks = split(load(fixture("long_blocks.flac")));
    const samples song = read_all(fixture("song.wav"));
    const bytes junk = noise(20'000);
    const struct {
        const char *name;
        size_t lost;  // frames
        std::function<void(bytes &)> apply;
    } kinds[] = {
        {"header", 1, [](bytes &f) { f[0] = 0; }},
        {"one bit", 1, [](bytes &f) { f[f.size() / 2] ^= 4; }},
        {"check sum", 1, [](bytes &f) { f.back() ^= 1; }},
        {"run of noise", 20, [&](bytes &f) { f = part(junk, 0, f.size()); }},
        {"run of zeros", 20, [](bytes &f) { std::fill(f.begin(), f.end(), 0); }},
        {"frames gone, junk left", 3, [&](bytes &f) { f = part(junk, 0, 30); }},
    };
    std::vector<changed_file> files;
    for (const auto &each : kinds) {
        std::vector<bytes> changed = blocks;
        for (size_t i = 40; i < 40 + each.lost; ++i) each.apply(changed[1 + i]);
        const size_t behind = (40 + each.lost) * kBlock;
        files.push_back(
            {each.name, joined(changed), song.size(), 40 * kBlock, behind, 40 * kBlock, behind});
    }
    const size_t last = blocks[31].size();
    for (const size_t kept : {size_t{3}, last / 2, last - 1}) {
        std::vector<bytes> cut(blocks.begin(), blocks.begin() + 32);
        cut[31].resize(kept);
        files.push_back({"cut", joined(cut), 30 * kBlock, 30 * kBlock});
    }
    bytes id3v2 = {'I', 'D', '3', 4, 0, 0, 0, 0, 0, 100};
    id3v2.resize(110, 0xFF);
    bytes id3v1 = {'T', 'A', 'G'};
    id3v1.resize(128);
    const bytes file = joined(blocks);
    files.push_back({"tags", joined({id3v2, file, id3v1}), song.size(), song.size()});
    files.push_back({"junk", joined({file, bytes(500, 0x5A)}), song.size(), song.size()});
    expect_changed(song, files);
}

TEST(Flac, RefusesFilesWithoutAStream) {
    const bytes file = load(fixture("song.flac"));
    bytes no_information = file;
    no_information[4] = 1;  // a padding block in its place
    for (const bytes &contents : {part(file, 0, 4), part(file, 0, 30),
                                  split(load(fixture("long_blocks.flac")))[0], no_information}) {
        const direct_flac none(save("none.flac", contents));
        EXPECT_EQ(none.reader, nullptr);
        EXPECT_EQ(none.info.tags, nullptr);
    }
}

}  // namespace
}  // namespace codec_test
