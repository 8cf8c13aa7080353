// The file callbacks, and the recognition of formats by hand-made heads.
#include <sys/mman.h>
#include <sys/stat.h>

#include <new>

#include "tests/media_source/source_case.h"

namespace {

constexpr size_t kScanBytes = 32768;
constexpr int64_t kBefore = 5;  // bytes before the content that is recognised

TEST(FileIo, Callbacks) {
    std::string path = testing::TempDir() + "tavo_file_io_" + std::to_string(getpid());
    mtsrc_io io = {};
    io.path = path.data();
    EXPECT_EQ(mtsrc_file_open(&io, 0), nullptr);
    const mode_t mask = umask(0);
    mtsrc_file *file = mtsrc_file_open(&io, 1);
    umask(mask);
    ASSERT_NE(file, nullptr);
    EXPECT_EQ(mtsrc_file_write(file, "0123456789", 10), 10);
    EXPECT_EQ(mtsrc_file_close(file), 0);
    struct stat status = {};
    EXPECT_TRUE(stat(path.c_str(), &status) == 0 && (status.st_mode & 0777) == 0644);

    file = mtsrc_file_open(&io, 2);  // bit 0 alone decides
    ASSERT_NE(file, nullptr);
    unlink(path.c_str());
    char buf[16] = {};
    EXPECT_EQ(mtsrc_file_write(file, "x", 1), -1);
    EXPECT_TRUE(mtsrc_file_read(file, buf, 16) == 10 && buf == "0123456789"s);
    EXPECT_EQ(mtsrc_file_read(file, buf, 16), 0);
    EXPECT_EQ(mtsrc_file_read(file, buf, -1), -1);
    const int64_t one = 1, seven = 7, zero = 0, before_start = -1;
    int64_t value = 77;
    EXPECT_TRUE(mtsrc_file_seek(file, &seven) == 0 && mtsrc_file_skip(file, &one) == 0);
    EXPECT_EQ(mtsrc_file_skip(file, &zero), -1);
    EXPECT_EQ(mtsrc_file_seek(file, &before_start), -1);
    EXPECT_TRUE(mtsrc_file_size(file, &value) == 0 && value == 10);
    EXPECT_TRUE(mtsrc_file_tell(file, &value) == 0 && value == 8);
    EXPECT_EQ(mtsrc_file_close(file), 0);

    // One call of the system each: the rest of what is asked of a pipe may never come.
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    ASSERT_EQ(write(ends[1], "123456", 6), 6);
    mtsrc_file handle = {ends[0]};
    EXPECT_EQ(mtsrc_file_read(&handle, buf, 16), 6);
    EXPECT_EQ(mtsrc_file_size(&handle, &value), -1);
    close(ends[0]);
    close(ends[1]);
    handle.fd = -1;
    EXPECT_EQ(mtsrc_file_read(&handle, buf, 1), -1);
    EXPECT_TRUE(mtsrc_file_tell(&handle, &value) == -1 && value == 8);
    EXPECT_EQ(mtsrc_file_close(new (malloc(sizeof handle)) mtsrc_file{-1}), 0);
}

// Only what probes may use. The callbacks may come from another binary that writes through their
// arguments.
mtsrc_io probe_io() {
    mtsrc_io io = {};
    io.read = mtsrc_file_read;
    io.tell = mtsrc_file_tell;
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
    return io;
}

// The type of a file that stands at the content, or the code of a failure.
int32_t type_of(std::string content, const mtsrc_io &io = probe_io()) {
    content.resize(std::max<size_t>(content.size(), 16));  // the head that is always read
    content = zeros(kBefore) + content;
    mtsrc_file file = {memfd_create("content", 0)};
    EXPECT_GT(write(file.fd, content.data(), content.size()), kBefore);
    lseek(file.fd, kBefore, SEEK_SET);
    int32_t type = 77;
    const int32_t code = mtsrc_get_file_type(&io, &file, &type);
    EXPECT_TRUE(code == 0 ? lseek(file.fd, 0, SEEK_CUR) == kBefore : type == 77);
    close(file.fd);
    return code == 0 ? type : code;
}

// A tag of version 2.3 with a body of so many zero bytes.
std::string id3(int32_t body) {
    std::string tag = "ID3\3\0\0"s;
    for (const int shift : {21, 14, 7, 0}) tag += static_cast<char>(body >> shift & 0x7F);
    return tag + zeros(static_cast<size_t>(body));
}

std::string put(std::string content, size_t at, const std::string &piece) {
    content.resize(std::max(content.size(), at + piece.size()));
    return content.replace(at, piece.size(), piece);
}

TEST(Recognise, FilesByTheirHeads) {
    std::string long_tag = id3((1 << 21) + (3 << 14) + (2 << 7) + 5);
    for (const size_t at : {6, 8}) long_tag[at] |= '\x80';  // its top bits are not looked at
    const std::map<int32_t, std::vector<std::string>> cases = {
        {2002, {kAsf}},
        {2000, {"1234ftyp", "1234mdat", "1234moov"}},
        {322, {"fLaC", long_tag + "fLaC"}},
        // Flags up to 6, any serial number.
        {2005, {"OggS\0\6"s, "OggS" + zeros(10) + "\1"}},
        {2006, {kWavFile}},
        {2007,
         {"ADIF", "\xFF\xF0", "\xFF\xF1", "\xFF\xF8", "\xFF\xF9",
          id3(130) + "\xFF\xF1" + zeros(5)}},
        {305, {id3(5000) + kLayer3Pair}},
        {2199,
         {put(kAsf, 15, "\x6D"), "1234free", long_tag + "\0fLaC"s, id3(300) + "fLa",
          // Flags above 6, version 1, a position.
          "OggS\0\7"s, "OggS\1\2", "OggS" + zeros(9) + "\1", "RIFF1234WAVELIST", "\xFF\xF2",
          id3(130) + "\xFF\xF1" + zeros(4)}}};
    for (const auto &[type, contents] : cases) {
        for (const std::string &each : contents) EXPECT_EQ(type_of(each), type) << each;
    }
    mtsrc_io no_tell = probe_io(), no_seek = probe_io(), no_skip = probe_io();
    no_tell.tell = [](mtsrc_file *, int64_t *) { return -1; };
    no_seek.seek = no_skip.skip = [](mtsrc_file *, const int64_t *) { return -1; };
    EXPECT_EQ(type_of(kAsf, no_tell), -6);
    EXPECT_EQ(type_of(kAsf, no_seek), -6);
    EXPECT_EQ(type_of(id3(20) + "fLaC" + zeros(20), no_skip), 2199);
}

// The header, and the same header so many bytes later, the last of the file.
std::string pair(const std::string &header, size_t distance) {
    return put(header, distance, header + zeros(1));
}

// As published: kilobits a second of each bitrate index from 1 on, and what a frame of 1 kbit/s
// takes at 1 kHz, in slots of one byte or, in Layer I, of four. Padding is one slot more.
TEST(ProbeMpeg, TwoHeadersOneFrameLengthApart) {
    using list = std::vector<size_t>;
    const list mpeg1 = {44100, 48000, 32000}, mpeg2 = {22050, 24000, 16000};
    const list mpeg25 = {11025, 12000, 8000};
    const list kbit1 = {32, 64, 96, 128, 160, 192, 224, 256, 288, 320, 352, 384, 416, 448};
    const list kbit2 = {32, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320, 384};
    const list kbit3 = {32, 40, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320};
    const list low_kbit1 = {32, 48, 56, 64, 80, 96, 112, 128, 144, 160, 176, 192, 224, 256};
    const list low_kbit = {8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160};
    const struct {
        char second;  // byte of the header
        int32_t type;
        size_t slots, slot_bytes;
        list hertz, kilobits;
    } rows[] = {{'\xFF', 303, 12, 4, mpeg1, kbit1},     {'\xFD', 304, 144, 1, mpeg1, kbit2},
                {'\xFB', 305, 144, 1, mpeg1, kbit3},    {'\xF7', 303, 12, 4, mpeg2, low_kbit1},
                {'\xF5', 304, 144, 1, mpeg2, low_kbit}, {'\xF3', 305, 72, 1, mpeg2, low_kbit},
                {'\xE3', 305, 72, 1, mpeg25, low_kbit}};
    for (const auto &row : rows) {
        for (size_t k = 0; k < 14 * 3 * 2; ++k) {
            const size_t bitrate = k / 6, rate = k / 2 % 3, padding = k % 2;
            const size_t third = (bitrate + 1) << 4 | rate << 2 | padding << 1;
            const std::string header = {'\xFF', row.second, static_cast<char>(third)};
            SCOPED_TRACE(testing::PrintToString(header));
            const size_t slots = row.slots * 1000 * row.kilobits[bitrate] / row.hertz[rate];
            const size_t length = row.slot_bytes * (slots + padding);
            std::string right = pair(header, length);
            EXPECT_EQ(type_of(right), row.type);
            right.pop_back();  // the follower is cut off
            EXPECT_EQ(type_of(right), 2199);
            EXPECT_EQ(type_of(pair(header, length - 1)), 2199);
            EXPECT_EQ(type_of(pair(header, length + 1)), 2199);
        }
    }
}

// As a follower, its length and free format do not matter.
TEST(ProbeMpeg, WhatIsNoHeader) {
    const struct {
        const char *name, *header;
        int32_t as_follower;
    } cases[] = {{"free format", "\xFF\xFB\x01", 305},       {"bitrate", "\xFF\xFB\xF0", 2199},
                 {"MPEG-2.5 Layer II", "\xFF\xE5\x90", 304}, {"rate", "\xFF\xFB\x9C", 2199},
                 {"MPEG-2.5 Layer I", "\xFF\xE7\x90", 303},  {"version", "\xFF\xEB\x90", 2199},
                 {"sync of 10 bits", "\xFF\xDB\x90", 2199},  {"layer", "\xFF\xF9\x90", 2199},
                 {"sync byte", "\xFE\xFB\x90", 2199}};
    for (const auto &each : cases) {
        EXPECT_EQ(type_of(zeros(1) + put(kLayer3Pair, 0, each.header)), 2199) << each.name;
        EXPECT_EQ(type_of(put(kLayer3Pair, 417, each.header)), each.as_follower) << each.name;
    }
}

TEST(ProbeMpeg, WhereTheScanGoesOnAndEnds) {
    // Two candidates overlap: at 0 a Layer I frame of 488 bytes without a follower, at 1 a Layer
    // III frame of 52.
    const std::string overlap = put("\xFF\xFF\xE2\x10", 53, "\xFF\xE2\x10\0"s) + zeros(600);
    // A follower at 32,764 ends the scan: a shorter pair behind the candidate counts no more.
    const std::string late = put(zeros(kScanBytes), 32500, pair("\xFF\xFF\x10", 32));
    // The headers within a tag do not count, those in what only looks like one do.
    const std::string tag = put(id3(1000), 20, kLayer3Pair), sync = "\x47" + kLayer3Pair;
    const struct {
        const char *name;
        std::string content;
        int32_t type;
    } cases[] = {
        {"a header without a follower first", "\xFF\xFB\x90" + kLayer3Pair, 305},
        {"overlap", overlap, 305},
        {"follower at 32,763", put(zeros(kScanBytes), 32763 - 417, kLayer3Pair), 305},
        {"late", late, 303},
        {"follower at 32,764", put(late, 32764 - 417, "\xFF\xFB\x90"), 2199},
        {"tag in the middle", zeros(100) + id3(40000) + kLayer3Pair, 305},
        {"tags", id3(3) + id3(0) + zeros(7) + id3(50) + kLayer3Pair, 305},
        {"nothing behind a tag", zeros(100) + id3(40000), 2199},
        {"pair within a tag", id3(3) + tag + zeros(20), 2199},
        {"version 2", put(tag, 3, "\2"), 2199},
        {"version 4", put(tag, 3, "\4"), 2199},
        {"version 5", put(tag, 3, "\5"), 305},
        {"tag cut off", zeros(kScanBytes - 8) + "ID3\3" + zeros(5), 2199},
        {"Ogg", "OggS" + kLayer3Pair, 2199},
        {"program stream", "\0\0\1\xBA"s + kLayer3Pair, 2199},
        {"video", "\0\0\1\xB9"s + kLayer3Pair, 305},
        {"transport stream: 188 counts from the file's start", put(sync, 183, "\x47"), 2199},
        {"one sync byte", put(sync, 188, "\x47"), 305},
        {"one sync byte, nothing at 188", "\x47", 2199},
    };
    for (const auto &each : cases) EXPECT_EQ(type_of(each.content), each.type) << each.name;
    for (const size_t inside : {4u, 6u, 9u, 10u}) {  // bytes of a tag that are in the buffer
        const std::string before = zeros(kScanBytes - inside) + id3(700);
        EXPECT_EQ(type_of(before + kLayer3Pair), 305) << inside;
        EXPECT_EQ(type_of(before), 2199) << inside;
    }
}

}  // namespace
