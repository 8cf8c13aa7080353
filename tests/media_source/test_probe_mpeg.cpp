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

TEST(ProbeMpeg, TwoHeadersOneFrameLengthApart) {
    struct {
        const char *name;
        byte_run header;
        size_t length;
        int32_t type;
    } const cases[] = {
        {"MPEG-1 III, 128 kbit/s, 44.1 kHz", {0xFF, 0xFB, 0x90}, 417, 305},
        {"the same, padded", {0xFF, 0xFB, 0x92}, 418, 305},
        {"MPEG-1 I, 32 kbit/s, 44.1 kHz", {0xFF, 0xFF, 0x10}, 32, 303},
        {"the same, padded", {0xFF, 0xFF, 0x12}, 36, 303},
        {"MPEG-1 I, 448 kbit/s, 32 kHz", {0xFF, 0xFF, 0xE8}, 672, 303},
        {"MPEG-1 II, 192 kbit/s, 48 kHz", {0xFF, 0xFD, 0xA4}, 576, 304},
        {"MPEG-2 III, 64 kbit/s, 22.05 kHz", {0xFF, 0xF3, 0x80}, 208, 305},
        {"MPEG-2 II, 160 kbit/s, 16 kHz", {0xFF, 0xF5, 0xE8}, 1440, 304},
        {"MPEG-2 I, 256 kbit/s, 24 kHz", {0xFF, 0xF7, 0xE4}, 512, 303},
        {"MPEG-2.5 III, 8 kbit/s, 8 kHz", {0xFF, 0xE3, 0x18}, 72, 305},
    };
    for (const auto &one : cases) {
        EXPECT_EQ(probe(pair(one.header, one.length)), one.type) << one.name;
        EXPECT_EQ(probe(pair(one.header, one.length - 1)), 2199) << one.name;
        EXPECT_EQ(probe(pair(one.header, one.length + 1)), 2199) << one.name;
        byte_run cut = pair(one.header, one.length);
        cut.pop_back();
        EXPECT_EQ(probe(cut), 2199) << one.name << ", second header cut off";
    }
}

// Kilobits a second of each index from 1 on, as published; a frame of Layer I has 48 bytes for each
// at 12 kHz, those of the others 144 or, in MPEG-2's Layer III, 72.
TEST(ProbeMpeg, EveryBitrate) {
    struct {
        uint8_t second;  // byte of the header
        size_t unit;     // bytes a frame of 1 kbit/s takes at 1 kHz
        size_t khz;
        std::vector<size_t> kilobits;
    } const rows[] = {
        {0xFB, 144, 48, {32, 40, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320}},
        {0xFD, 144, 48, {32, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320, 384}},
        {0xFF, 12, 48, {32, 64, 96, 128, 160, 192, 224, 256, 288, 320, 352, 384, 416, 448}},
        {0xF3, 72, 24, {8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160}},
        {0xF5, 144, 24, {8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160}},
        {0xF7, 12, 24, {32, 48, 56, 64, 80, 96, 112, 128, 144, 160, 176, 192, 224, 256}},
    };
    for (const auto &row : rows) {
        for (size_t index = 1; index <= 14; ++index) {
            const byte_run header = {0xFF, row.second, static_cast<uint8_t>(index << 4 | 4)};
            const size_t slots = row.unit * row.kilobits[index - 1] / row.khz;
            const size_t length = row.unit == 12 ? 4 * slots : slots;
            EXPECT_NE(probe(pair(header, length)), 2199) << int{row.second} << ", " << index;
            EXPECT_EQ(probe(pair(header, length + 1)), 2199) << int{row.second} << ", " << index;
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
