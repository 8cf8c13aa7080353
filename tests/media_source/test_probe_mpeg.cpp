#include <gtest/gtest.h>

#include "tests/media_source/memory_file.h"

namespace {

constexpr size_t kScanBytes = 32768;

int32_t probe(const byte_run &content) {
    const mtsrc_io io = probe_io();
    memory_file file(content);
    byte_run head = content;
    head.resize(16);
    const int32_t type = mtsrc_probe_mpeg(head.data(), &io, &file.file);
    EXPECT_EQ(file.at(), 0);
    return type;
}

byte_run put(byte_run content, size_t at, const byte_run &what) {
    content.resize(std::max(content.size(), at + what.size()));
    std::copy(what.begin(), what.end(), content.begin() + static_cast<std::ptrdiff_t>(at));
    return content;
}

// The header, and the same header so many bytes later, the last of the file.
byte_run pair(const byte_run &header, size_t distance) {
    return put(header, distance, header + zeros(1));
}

// As published: kilobits a second of each bitrate index from 1 on, and what a frame of 1 kbit/s
// takes at 1 kHz, in slots of one byte or, in Layer I, of four. Padding is one slot more.
TEST(ProbeMpeg, TwoHeadersOneFrameLengthApart) {
    using list = std::vector<size_t>;
    const list mpeg1 = {44100, 48000, 32000};
    const list mpeg2 = {22050, 24000, 16000};
    const list mpeg25 = {11025, 12000, 8000};
    const list kbit1 = {32, 64, 96, 128, 160, 192, 224, 256, 288, 320, 352, 384, 416, 448};
    const list kbit2 = {32, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320, 384};
    const list kbit3 = {32, 40, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320};
    const list low_kbit1 = {32, 48, 56, 64, 80, 96, 112, 128, 144, 160, 176, 192, 224, 256};
    const list low_kbit = {8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160};
    const struct {
        uint8_t second;  // byte of the header
        int32_t type;
        size_t slots;
        size_t slot_bytes;
        list hertz;
        list kilobits;
    } rows[] = {
        {0xFF, 303, 12, 4, mpeg1, kbit1},     {0xFD, 304, 144, 1, mpeg1, kbit2},
        {0xFB, 305, 144, 1, mpeg1, kbit3},    {0xF7, 303, 12, 4, mpeg2, low_kbit1},
        {0xF5, 304, 144, 1, mpeg2, low_kbit}, {0xF3, 305, 72, 1, mpeg2, low_kbit},
        {0xE3, 305, 72, 1, mpeg25, low_kbit},
    };
    for (const auto &row : rows) {
        for (size_t k = 0; k < 14 * 3 * 2; ++k) {
            const size_t bitrate = k / 6;
            const size_t rate = k / 2 % 3;
            const size_t padding = k % 2;
            const size_t third = (bitrate + 1) << 4 | rate << 2 | padding << 1;
            const byte_run header = {0xFF, row.second, static_cast<uint8_t>(third)};
            SCOPED_TRACE(testing::PrintToString(header));
            const size_t slots = row.slots * 1000 * row.kilobits[bitrate] / row.hertz[rate];
            const size_t length = row.slot_bytes * (slots + padding);
            const byte_run right = pair(header, length);
            EXPECT_EQ(probe(right), row.type);
            EXPECT_EQ(probe(byte_run(right.begin(), right.end() - 1)), 2199);  // cut off
            EXPECT_EQ(probe(pair(header, length - 1)), 2199);
            EXPECT_EQ(probe(pair(header, length + 1)), 2199);
        }
    }
}

TEST(ProbeMpeg, WhatIsNoHeader) {
    struct {
        const char *name;
        byte_run header;
        int32_t as_follower;  // whose length and free format do not matter
    } const cases[] = {
        {"free format", {0xFF, 0xFB, 0x00, 0}, 305},
        {"Layer II of MPEG-2.5", {0xFF, 0xE5, 0x90, 0}, 304},
        {"Layer I of MPEG-2.5", {0xFF, 0xE7, 0x90, 0}, 303},
        {"bitrate index 15", {0xFF, 0xFB, 0xF0, 0}, 2199},
        {"sample-rate index 3", {0xFF, 0xFB, 0x9C, 0}, 2199},
        {"version bits 01", {0xFF, 0xEB, 0x90, 0}, 2199},
        {"layer bits 00", {0xFF, 0xF9, 0x90, 0}, 2199},
        {"sync of 10 bits", {0xFF, 0xDB, 0x90, 0}, 2199},
        {"sync byte", {0xFE, 0xFB, 0x90, 0}, 2199},
    };
    for (const auto &one : cases) {
        EXPECT_EQ(probe(put(layer3_pair(), 0, one.header)), 2199) << one.name;
        EXPECT_EQ(probe(put(layer3_pair(), 417, one.header)), one.as_follower) << one.name;
    }
}

TEST(ProbeMpeg, ScanGoesOnAfterARejectedCandidate) {
    EXPECT_EQ(probe(byte_run{0xFF, 0xFB, 0x90} + layer3_pair()), 305);
    // Two candidates overlap: at 0 a Layer I frame of 488 bytes without a follower, at 1 a Layer
    // III frame of 52.
    byte_run overlap = put({0xFF, 0xFF, 0xE2, 0x10}, 53, {0xFF, 0xE2, 0x10, 0});
    overlap.resize(600);
    EXPECT_EQ(probe(overlap), 305);
}

TEST(ProbeMpeg, AFollowerTooFarInEndsTheScan) {
    const byte_run near_end = put(zeros(kScanBytes), 32763 - 417, layer3_pair());
    EXPECT_EQ(probe(near_end), 305);
    EXPECT_EQ(probe(put(zeros(kScanBytes), 32764 - 417, layer3_pair())), 2199);
    // A shorter pair behind it would fit, but is no longer looked at.
    const byte_run short_pair = pair({0xFF, 0xFF, 0x10}, 32);
    const byte_run late = put(zeros(kScanBytes), 32500, short_pair);
    EXPECT_EQ(probe(late), 303);
    EXPECT_EQ(probe(put(late, 32764 - 417, {0xFF, 0xFB, 0x90})), 2199);
}

TEST(ProbeMpeg, TagsInsideTheScannedBytes) {
    EXPECT_EQ(probe(zeros(100) + id3(40000) + layer3_pair()), 305);
    EXPECT_EQ(probe(id3(3) + id3(0) + zeros(7) + id3(50) + layer3_pair()), 305);
    EXPECT_EQ(probe(zeros(100) + id3(40000)), 2199);
    // The headers within a tag do not count, those in what only looks like one do.
    byte_run tag = put(id3(1000), 20, layer3_pair());
    EXPECT_EQ(probe(tag), 2199);
    EXPECT_EQ(probe(id3(3) + tag + zeros(20)), 2199);  // a tag right behind a tag
    tag[3] = 4;
    EXPECT_EQ(probe(tag), 2199);
    tag[3] = 5;
    EXPECT_EQ(probe(tag), 305);
}

TEST(ProbeMpeg, ATagWhoseSizeLiesBeyondTheScannedBytes) {
    for (const size_t inside : {4u, 6u, 9u, 10u}) {
        const byte_run before = zeros(kScanBytes - inside);
        EXPECT_EQ(probe(before + id3(700) + layer3_pair()), 305) << inside;
        EXPECT_EQ(probe(before + id3(700)), 2199) << inside;
    }
    byte_run cut = zeros(kScanBytes - 8) + id3(0);
    cut.pop_back();
    EXPECT_EQ(probe(cut), 2199);
}

TEST(ProbeMpeg, OtherContainers) {
    EXPECT_EQ(probe(text("OggS") + layer3_pair()), 2199);
    EXPECT_EQ(probe(byte_run{0, 0, 1, 0xBA} + layer3_pair()), 2199);
    EXPECT_EQ(probe(byte_run{0, 0, 1, 0xB9} + layer3_pair()), 305);
    byte_run transport = byte_run{0x47} + layer3_pair();
    EXPECT_EQ(probe(transport), 305);
    transport[188] = 0x47;
    EXPECT_EQ(probe(transport), 2199);
    EXPECT_EQ(probe({0x47, 0, 0}), 2199);  // nothing at 188
}

}  // namespace
