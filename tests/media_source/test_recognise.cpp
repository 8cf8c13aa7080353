#include <gtest/gtest.h>

#include "tests/media_source/memory_file.h"

namespace {

constexpr int64_t kBefore = 5;  // bytes before the content: recognition starts at any offset

int32_t type_of(byte_run content) {
    const mtsrc_io io = probe_io();
    content.resize(std::max<size_t>(content.size(), 16));  // the head that is always read
    memory_file file(zeros(kBefore) + content, kBefore);
    int32_t type = -1;
    EXPECT_EQ(mtsrc_get_file_type(&io, &file.file, &type), 0);
    EXPECT_EQ(file.at(), kBefore);
    return type;
}

const byte_run kAsf = {0x30, 0x26, 0xB2, 0x75, 0x8E, 0x66, 0xCF, 0x11,
                       0xA6, 0xD9, 0x00, 0xAA, 0x00, 0x62, 0xCE, 0x6C};

TEST(Recognise, FilesByTheirHeads) {
    byte_run near_asf = kAsf;
    near_asf[15] = 0x6D;
    const byte_run size = {1, 2, 3, 4};
    byte_run long_tag = id3((1 << 21) + (3 << 14) + (2 << 7) + 5);
    long_tag[6] |= 0x80;  // the top bits of the size's bytes are not looked at
    long_tag[8] |= 0x80;
    struct {
        const char *name;
        byte_run content;
        int32_t type;
    } const cases[] = {
        {"asf", kAsf, 2002},
        {"asf, last byte differs", near_asf, 2199},
        {"ftyp", size + text("ftyp"), 2000},
        {"mdat", size + text("mdat"), 2000},
        {"moov", size + text("moov"), 2000},
        {"free", size + text("free"), 2199},
        {"flac", text("fLaC"), 322},
        {"flac behind a tag", id3(300) + text("fLaC"), 322},
        {"flac behind a long tag", long_tag + text("fLaC"), 322},
        {"flac, a byte later", long_tag + zeros(1) + text("fLaC"), 2199},
        {"flac cut off behind a tag", id3(300) + text("fLa"), 2199},
        {"ogg", text("OggS") + byte_run{0, 2}, 2005},
        {"ogg, all flags", text("OggS") + byte_run{0, 6}, 2005},
        {"ogg, flags too large", text("OggS") + byte_run{0, 7}, 2199},
        {"ogg, version 1", text("OggS") + byte_run{1, 2}, 2199},
        {"ogg, position not 0", text("OggS") + zeros(9) + byte_run{1}, 2199},
        {"ogg, serial number", text("OggS") + zeros(10) + byte_run{1}, 2005},
        {"wav", text("RIFF") + zeros(4) + text("WAVEfmt "), 2006},
        {"wav with another chunk first", text("RIFF") + zeros(4) + text("WAVELIST"), 2199},
        {"adif", text("ADIF"), 2007},
        {"adts, MPEG-4, checksum", {0xFF, 0xF0}, 2007},
        {"adts, MPEG-4", {0xFF, 0xF1}, 2007},
        {"adts, MPEG-2, checksum", {0xFF, 0xF8}, 2007},
        {"adts, MPEG-2", {0xFF, 0xF9}, 2007},
        {"no adts, layer bits", {0xFF, 0xF2}, 2199},
        {"adts behind a tag", id3(130) + byte_run{0xFF, 0xF1, 0, 0, 0, 0, 0}, 2007},
        {"adts cut off behind a tag", id3(130) + byte_run{0xFF, 0xF1, 0, 0, 0, 0}, 2199},
        {"mpeg", layer3_pair(), 305},
        {"mpeg behind a tag", id3(5000) + layer3_pair(), 305},
        {"nothing", zeros(100), 2199},
    };
    for (const auto &one : cases) {
        EXPECT_EQ(type_of(one.content), one.type) << one.name;
    }
}

// The callbacks may come from another binary that knows no const.
TEST(Recognise, CallbacksMayWriteThroughTheirArguments) {
    mtsrc_io io = probe_io();
    io.seek = [](mtsrc_file *file, const int64_t *offset) {
        const int32_t result = mtsrc_file_seek(file, offset);
        *const_cast<int64_t *>(offset) = *offset;
        return result;
    };
    io.skip = [](mtsrc_file *file, const int64_t *distance) {
        const int32_t result = mtsrc_file_skip(file, distance);
        *const_cast<int64_t *>(distance) = -1;
        return result;
    };
    for (const byte_run &content : {id3(20) + layer3_pair(), byte_run{0x47} + layer3_pair()}) {
        memory_file file(content);
        int32_t type = 0;
        EXPECT_EQ(mtsrc_get_file_type(&io, &file.file, &type), 0);
        EXPECT_EQ(type, 305);
    }
}

TEST(Recognise, CallbacksThatFail) {
    mtsrc_io no_tell = probe_io();
    no_tell.tell = [](mtsrc_file *, int64_t *) { return -1; };
    mtsrc_io no_seek = probe_io();
    no_seek.seek = [](mtsrc_file *, const int64_t *) { return -1; };
    mtsrc_io no_skip = probe_io();
    no_skip.skip = [](mtsrc_file *, const int64_t *) { return -1; };
    const struct {
        const char *name;
        mtsrc_io io;
        byte_run content;
        int32_t code;
        int32_t type;
    } cases[] = {
        {"head cut off", probe_io(), zeros(15), -6, 77},
        {"tell", no_tell, kAsf, -6, 77},
        {"seek", no_seek, kAsf, -6, 77},
        {"skip: the next probe is asked", no_skip, id3(20) + text("fLaC") + zeros(20), 0, 2199},
    };
    for (const auto &one : cases) {
        SCOPED_TRACE(one.name);
        memory_file file(one.content);
        int32_t type = 77;
        EXPECT_EQ(mtsrc_get_file_type(&one.io, &file.file, &type), one.code);
        EXPECT_EQ(type, one.type);
        EXPECT_TRUE(one.code != 0 || file.at() == 0);
    }
}

}  // namespace
