// The file callbacks, and the recognition of formats by hand-made heads.
#include <sys/stat.h>

#include <algorithm>

#include "tests/media_source/source_case.h"

namespace {

constexpr size_t kScanBytes = 32768;
const byte_run kAsf = {0x30, 0x26, 0xB2, 0x75, 0x8E, 0x66, 0xCF, 0x11,
                       0xA6, 0xD9, 0x00, 0xAA, 0x00, 0x62, 0xCE, 0x6C};

// A file without a name, opened at an offset.
struct memory_file {
    FILE *stream = tmpfile();
    mtsrc_file file = {fileno(stream)};

    explicit memory_file(const byte_run &content, int64_t offset = 0) {
        fwrite(content.data(), 1, content.size(), stream);
        fflush(stream);
        mtsrc_file_seek(&file, &offset);
    }
    ~memory_file() { fclose(stream); }
    int64_t at() {
        int64_t offset = -1;
        EXPECT_EQ(mtsrc_file_tell(&file, &offset), 0);
        return offset;
    }
};

// Only what probes may use.
mtsrc_io probe_io() {
    mtsrc_io io = {};
    io.read = mtsrc_file_read;
    io.tell = mtsrc_file_tell;
    io.seek = mtsrc_file_seek;
    io.skip = mtsrc_file_skip;
    return io;
}

// A tag of version 2.3 with a body of so many zero bytes.
byte_run id3(int32_t body) {
    const auto seven = [body](int shift) { return static_cast<uint8_t>(body >> shift & 0x7F); };
    return text("ID3") + byte_run{3, 0, 0, seven(21), seven(14), seven(7), seven(0)} +
           zeros(static_cast<size_t>(body));
}

TEST(FileIo, ModesOfOpening) {
    std::string path = testing::TempDir() + "tavo_file_io_" + std::to_string(getpid());
    mtsrc_io io = {};
    io.path = path.data();
    EXPECT_EQ(mtsrc_file_open(&io, 0), nullptr);
    const mode_t mask = umask(0);
    mtsrc_file *writer = mtsrc_file_open(&io, 1);
    umask(mask);
    ASSERT_NE(writer, nullptr);
    EXPECT_EQ(mtsrc_file_write(writer, "0123456789", 10), 10);
    EXPECT_EQ(mtsrc_file_close(writer), 0);
    struct stat status = {};
    ASSERT_EQ(stat(path.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777, 0644u);

    mtsrc_file *reader = mtsrc_file_open(&io, 2);  // bit 0 alone decides
    ASSERT_NE(reader, nullptr);
    char buf[16] = {};
    EXPECT_EQ(mtsrc_file_write(reader, "x", 1), -1);
    EXPECT_EQ(mtsrc_file_read(reader, buf, 16), 10);
    EXPECT_STREQ(buf, "0123456789");
    EXPECT_EQ(mtsrc_file_read(reader, buf, 16), 0);
    EXPECT_EQ(mtsrc_file_read(reader, buf, -1), -1);
    EXPECT_EQ(mtsrc_file_close(reader), 0);
    unlink(path.c_str());
}

TEST(FileIo, SeekSkipTellAndSize) {
    memory_file ten(zeros(10), 7);
    const int64_t one = 1, zero = 0, before_start = -1;
    EXPECT_EQ(mtsrc_file_skip(&ten.file, &one), 0);
    EXPECT_EQ(mtsrc_file_skip(&ten.file, &zero), -1);
    EXPECT_EQ(mtsrc_file_seek(&ten.file, &before_start), -1);
    EXPECT_EQ(ten.at(), 8);
    const int64_t far = 5'000'000'000;  // more than 32 bits hold
    EXPECT_EQ(mtsrc_file_seek(&ten.file, &far), 0);
    EXPECT_EQ(mtsrc_file_write(&ten.file, "x", 1), 1);
    EXPECT_EQ(mtsrc_file_seek(&ten.file, &one), 0);
    int64_t length = 0;
    EXPECT_EQ(mtsrc_file_size(&ten.file, &length), 0);
    EXPECT_EQ(length, far + 1);
    EXPECT_EQ(ten.at(), 1);
}

// One call of the system each: the rest of what is asked of a pipe may never come.
TEST(FileIo, PipesAndHandlesWithoutADescriptor) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    ASSERT_EQ(write(ends[1], "123456", 6), 6);
    mtsrc_file file = {ends[0]};
    char buf[100];
    int64_t value = 77;
    EXPECT_EQ(mtsrc_file_read(&file, buf, 100), 6);
    EXPECT_EQ(mtsrc_file_tell(&file, &value), -1);
    EXPECT_EQ(mtsrc_file_size(&file, &value), -1);
    close(ends[0]);
    close(ends[1]);
    file.fd = -1;
    EXPECT_EQ(mtsrc_file_read(&file, buf, 1), -1);
    EXPECT_EQ(mtsrc_file_tell(&file, &value), -1);
    EXPECT_EQ(value, 77);
    auto *cell = static_cast<mtsrc_file *>(malloc(sizeof(mtsrc_file)));
    cell->fd = -1;
    EXPECT_EQ(mtsrc_file_close(cell), 0);
}

// At any offset, which is kept.
int32_t type_of(byte_run content) {
    constexpr int64_t kBefore = 5;
    const mtsrc_io io = probe_io();
    content.resize(std::max<size_t>(content.size(), 16));  // the head that is always read
    memory_file file(zeros(kBefore) + content, kBefore);
    int32_t type = -1;
    EXPECT_EQ(mtsrc_get_file_type(&io, &file.file, &type), 0);
    EXPECT_EQ(file.at(), kBefore);
    return type;
}

TEST(Recognise, FilesByTheirHeads) {
    byte_run near_asf = kAsf;
    near_asf[15] = 0x6D;
    const byte_run size = {1, 2, 3, 4};
    byte_run long_tag = id3((1 << 21) + (3 << 14) + (2 << 7) + 5);
    long_tag[6] |= 0x80;  // the top bits of the size's bytes are not looked at
    long_tag[8] |= 0x80;
    const struct {
        const char *name;
        byte_run content;
        int32_t type;
    } cases[] = {
        {"asf", kAsf, 2002},
        {"asf, last byte differs", near_asf, 2199},
        {"ftyp", size + text("ftyp"), 2000},
        {"mdat", size + text("mdat"), 2000},
        {"moov", size + text("moov"), 2000},
        {"free", size + text("free"), 2199},
        {"flac", text("fLaC"), 322},
        {"flac behind a long tag", long_tag + text("fLaC"), 322},
        {"flac, a byte later", long_tag + zeros(1) + text("fLaC"), 2199},
        {"flac cut off behind a tag", id3(300) + text("fLa"), 2199},
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
    for (const auto &each : cases) EXPECT_EQ(type_of(each.content), each.type) << each.name;
}

// Callbacks may fail, and may come from another binary that writes through their arguments.
TEST(Recognise, CallersOwnCallbacks) {
    mtsrc_io no_tell = probe_io(), no_seek = probe_io(), no_skip = probe_io(), writes = probe_io();
    no_tell.tell = [](mtsrc_file *, int64_t *) { return -1; };
    no_seek.seek = [](mtsrc_file *, const int64_t *) { return -1; };
    no_skip.skip = [](mtsrc_file *, const int64_t *) { return -1; };
    writes.seek = [](mtsrc_file *file, const int64_t *offset) {
        const int32_t result = mtsrc_file_seek(file, offset);
        *const_cast<int64_t *>(offset) = *offset;
        return result;
    };
    writes.skip = [](mtsrc_file *file, const int64_t *distance) {
        const int32_t result = mtsrc_file_skip(file, distance);
        *const_cast<int64_t *>(distance) = -1;
        return result;
    };
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
        {"writes, tag", writes, id3(20) + layer3_pair(), 0, 305},
        {"writes, transport sync", writes, byte_run{0x47} + layer3_pair(), 0, 305},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.name);
        memory_file file(each.content);
        int32_t type = 77;
        EXPECT_EQ(mtsrc_get_file_type(&each.io, &file.file, &type), each.code);
        EXPECT_EQ(type, each.type);
        EXPECT_TRUE(each.code != 0 || file.at() == 0);
    }
}

int32_t probe(const byte_run &content) {
    const mtsrc_io io = probe_io();
    memory_file file(content);
    byte_run head = content;
    head.resize(16);
    const int32_t type = mtsrc_probe_mpeg(head.data(), &io, &file.file);
    EXPECT_EQ(file.at(), 0);
    return type;
}

byte_run put(byte_run content, size_t at, const byte_run &piece) {
    content.resize(std::max(content.size(), at + piece.size()));
    std::copy(piece.begin(), piece.end(), content.begin() + static_cast<std::ptrdiff_t>(at));
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
            const size_t bitrate = k / 6, rate = k / 2 % 3, padding = k % 2;
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
    const struct {
        const char *name;
        byte_run header;
        int32_t as_follower;  // whose length and free format do not matter
    } cases[] = {
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
    for (const auto &each : cases) {
        EXPECT_EQ(probe(put(layer3_pair(), 0, each.header)), 2199) << each.name;
        EXPECT_EQ(probe(put(layer3_pair(), 417, each.header)), each.as_follower) << each.name;
    }
}

TEST(ProbeMpeg, WhereTheScanGoesOnAndEnds) {
    EXPECT_EQ(probe(byte_run{0xFF, 0xFB, 0x90} + layer3_pair()), 305);
    // Two candidates overlap: at 0 a Layer I frame of 488 bytes without a follower, at 1 a Layer
    // III frame of 52.
    byte_run overlap = put({0xFF, 0xFF, 0xE2, 0x10}, 53, {0xFF, 0xE2, 0x10, 0});
    overlap.resize(600);
    EXPECT_EQ(probe(overlap), 305);
    // A follower at 32,764 ends the scan: a shorter pair behind the candidate counts no more.
    EXPECT_EQ(probe(put(zeros(kScanBytes), 32763 - 417, layer3_pair())), 305);
    const byte_run late = put(zeros(kScanBytes), 32500, pair({0xFF, 0xFF, 0x10}, 32));
    EXPECT_EQ(probe(late), 303);
    EXPECT_EQ(probe(put(late, 32764 - 417, {0xFF, 0xFB, 0x90})), 2199);
}

TEST(ProbeMpeg, TagsInsideTheScannedBytes) {
    EXPECT_EQ(probe(zeros(100) + id3(40000) + layer3_pair()), 305);
    EXPECT_EQ(probe(id3(3) + id3(0) + zeros(7) + id3(50) + layer3_pair()), 305);
    EXPECT_EQ(probe(zeros(100) + id3(40000)), 2199);
    // The headers within a tag do not count, those in what only looks like one do.
    byte_run tag = put(id3(1000), 20, layer3_pair());
    EXPECT_EQ(probe(id3(3) + tag + zeros(20)), 2199);  // a tag right behind a tag
    for (const int version : {2, 4, 5}) {
        tag[3] = static_cast<uint8_t>(version);
        EXPECT_EQ(probe(tag), version == 5 ? 305 : 2199);
    }
    // The size lies beyond the scanned bytes.
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
    EXPECT_EQ(probe(put(byte_run{0x47} + layer3_pair(), 188, {0x47})), 2199);
    EXPECT_EQ(probe({0x47, 0, 0}), 2199);  // nothing at 188
}

}  // namespace
