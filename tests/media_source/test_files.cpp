// Tests the file callbacks, and the recognition of formats with hand-made files.
#include <sys/mman.h>
#include <sys/stat.h>

#include <new>

#include "tests/media_source/source_case.h"

namespace {

constexpr size_t kScanBytes = 32768;
constexpr int64_t kBefore = 5;  // bytes of the file before the content

TEST(FileIo, CallbacksReadWriteAndSeek) {
    std::string path = testing::TempDir() + "tavo_file_io_" + std::to_string(getpid());
    mtsrc_io io = {};
    io.path = path.data();
    const mode_t mask = umask(0);
    mtsrc_file *file = mtsrc_file_open(&io, 1);
    umask(mask);
    struct stat status = {};
    EXPECT_TRUE(stat(path.c_str(), &status) == 0 && (status.st_mode & 0777) == 0644);
    EXPECT_EQ(mtsrc_file_write(file, "0123456789", 10), 10);
    EXPECT_EQ(mtsrc_file_close(file), 0);

    file = mtsrc_file_open(&io, 2);  // only bit 0 of the mode is used
    unlink(path.c_str());
    char buf[16] = {};
    EXPECT_EQ(mtsrc_file_write(file, "x", 1), -1);
    EXPECT_TRUE(mtsrc_file_read(file, buf, 16) == 10 && buf == "0123456789"s);
    EXPECT_TRUE(mtsrc_file_read(file, buf, 16) == 0 && mtsrc_file_read(file, buf, -1) == -1);
    const int64_t one = 1, seven = 7, zero = 0, before_start = -1;
    int64_t value = 77;
    EXPECT_TRUE(mtsrc_file_seek(file, &seven) == 0 && mtsrc_file_skip(file, &one) == 0);
    EXPECT_TRUE(mtsrc_file_skip(file, &zero) == -1 && mtsrc_file_seek(file, &before_start) == -1);
    EXPECT_TRUE(mtsrc_file_size(file, &value) == 0 && value == 10);
    EXPECT_TRUE(mtsrc_file_tell(file, &value) == 0 && value == 8);
    EXPECT_EQ(mtsrc_file_close(file), 0);

    // A short read returns at once, because a pipe may never deliver the rest of the bytes.
    int ends[2];
    EXPECT_TRUE(pipe(ends) == 0 && write(ends[1], "123456", 6) == 6);
    mtsrc_file handle = {ends[0]};
    EXPECT_EQ(mtsrc_file_read(&handle, buf, 16), 6);
    for (const int end : ends) close(end);
    handle.fd = -1;
    EXPECT_TRUE(mtsrc_file_read(&handle, buf, 1) == -1 && mtsrc_file_read(nullptr, buf, 1) == -1);
    EXPECT_TRUE(mtsrc_file_tell(&handle, &value) == -1 && mtsrc_file_size(&handle, &value) == -1);
    EXPECT_EQ(value, 8);
    EXPECT_EQ(mtsrc_file_close(new (malloc(sizeof handle)) mtsrc_file{-1}), 0);
}

// Returns the recognised type or an error code. Recognition needs only these callbacks.
int32_t type_of(std::string content, decltype(mtsrc_io::seek) seek = mtsrc_file_seek) {
    mtsrc_io io = {};
    io.read = mtsrc_file_read;
    io.tell = mtsrc_file_tell;
    io.seek = seek;
    io.skip = mtsrc_file_skip;
    content.resize(std::max<size_t>(content.size(), 16));  // recognition refuses shorter files
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

// Returns an ID3v2.3 tag whose body consists of `body` zeros.
std::string id3(int32_t body) {
    std::string tag = "ID3\3\0\0"s;
    for (const int shift : {21, 14, 7, 0}) tag += static_cast<char>(body >> shift & 0x7F);
    return tag + zeros(static_cast<size_t>(body));
}

std::string put(std::string content, size_t at, const std::string &bytes) {
    content.resize(std::max(content.size(), at + bytes.size()));
    return content.replace(at, bytes.size(), bytes);
}

void expect_type(int32_t type, const std::vector<std::string> &contents) {
    for (const std::string &content : contents) {
        EXPECT_EQ(type_of(content), type)
            << &content - contents.data() << ": " << content.substr(0, 16);
    }
}

TEST(Recognise, FirstBytesDetermineTheType) {
    std::string long_tag = id3((1 << 21) + (3 << 14) + (2 << 7) + 5);
    for (const size_t at : {6u, 8u}) long_tag[at] |= '\x80';  // a size byte's top bit is ignored
    expect_type(2002, {kAsf});
    expect_type(2000, {"1234ftyp", "1234mdat", "1234moov"});
    expect_type(322, {"fLaC", long_tag + "fLaC"});
    expect_type(2005, {"OggS\0\6"s, "OggS" + zeros(10) + "\1"});  // header flags, any serial number
    expect_type(2006, {kWavFile});
    expect_type(2007, {"ADIF", "\xFF\xF0", "\xFF\xF1", "\xFF\xF8", "\xFF\xF9"});
    expect_type(2007, {id3(130) + "\xFF\xF1" + zeros(5)});
    expect_type(305, {id3(5000) + kLayer3Pair});
    expect_type(2199, {put(kAsf, 15, "\x6D"), "1234free", long_tag + "\0fLaC"s, id3(300) + "fLa"});
    expect_type(2199, {"OggS\0\7"s, "OggS\1\2", "OggS" + zeros(9) + "\1", "RIFF1234WAVELIST"});
    expect_type(2199, {"\xFF\xF2", id3(130) + "\xFF\xF1" + zeros(4)});
    EXPECT_EQ(type_of(kAsf, [](mtsrc_file *, const int64_t *) { return -1; }), -6);
}

// Returns a file with the header twice, `distance` bytes apart. The second one ends the file.
std::string pair(const std::string &header, size_t distance) {
    return put(header, distance, header + zeros(1));
}

// A frame consists of slots of one byte, or of four bytes in Layer I. Padding adds one slot.
TEST(ProbeMpeg, FindsTwoHeadersOneFrameLengthApart) {
    using list = std::vector<size_t>;
    const list kbit1 = {32, 64, 96, 128, 160, 192, 224, 256, 288, 320, 352, 384, 416, 448};
    const list kbit2 = {32, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320, 384};
    const list kbit3 = {32, 40, 48, 56, 64, 80, 96, 112, 128, 160, 192, 224, 256, 320};
    const list low_kbit1 = {32, 48, 56, 64, 80, 96, 112, 128, 144, 160, 176, 192, 224, 256};
    const list low_kbit = {8, 16, 24, 32, 40, 48, 56, 64, 80, 96, 112, 128, 144, 160};
    const struct {
        char second;  // second byte of the header
        int32_t type;
        size_t slots;       // of a frame with 1 kbit/s at 1 kHz
        size_t slot_bytes;  // bytes per slot
        size_t divisor;     // MPEG-1's sample rates are divided by it
        list kilobits;      // bitrates of the indexes from 1 on
    } rows[] = {{'\xFF', 303, 12, 4, 1, kbit1},     {'\xFD', 304, 144, 1, 1, kbit2},
                {'\xFB', 305, 144, 1, 1, kbit3},    {'\xF7', 303, 12, 4, 2, low_kbit1},
                {'\xF5', 304, 144, 1, 2, low_kbit}, {'\xF3', 305, 72, 1, 2, low_kbit},
                {'\xE3', 305, 72, 1, 4, low_kbit}};
    for (const auto &row : rows) {
        for (size_t k = 0; k < 14 * 3 * 2; ++k) {
            const size_t bitrate = k / 6, rate = k / 2 % 3, padding = k % 2;
            const size_t hertz = list{44100, 48000, 32000}[rate] / row.divisor;
            const size_t third = (bitrate + 1) << 4 | rate << 2 | padding << 1;
            const std::string header = {'\xFF', row.second, static_cast<char>(third)};
            SCOPED_TRACE(testing::PrintToString(header));
            const size_t slots = row.slots * 1000 * row.kilobits[bitrate] / hertz;
            const size_t length = row.slot_bytes * (slots + padding);
            const std::string right = pair(header, length), cut = right.substr(0, length + 3);
            expect_type(row.type, {right});
            expect_type(2199, {cut, pair(header, length - 1), pair(header, length + 1)});
        }
    }
}

// The frame length of the first three headers (free format, MPEG-2.5 Layers II and I) is unknown,
// so they are accepted only as a second header. The others have an invalid field or no sync word.
TEST(ProbeMpeg, InvalidHeadersAreRejected) {
    const std::pair<const char *, int32_t> cases[] = {
        {"\xFF\xFB\x01", 305},  {"\xFF\xE5\x90", 304},  {"\xFF\xE7\x90", 303},
        {"\xFF\xFB\xF0", 2199}, {"\xFF\xFB\x9C", 2199}, {"\xFF\xEB\x90", 2199},
        {"\xFF\xF9\x90", 2199}, {"\xFF\xDB\x90", 2199}, {"\xFE\xFB\x90", 2199}};
    for (const auto &[header, as_second] : cases) {
        expect_type(2199, {zeros(1) + put(kLayer3Pair, 0, header)});
        expect_type(as_second, {put(kLayer3Pair, 417, header)});
    }
}

TEST(ProbeMpeg, ScanContinuesAfterARejectedCandidate) {
    // Two candidates overlap. The first, at 0, has no second header; the other, at 1, has one.
    const std::string overlap = put("\xFF\xFF\xE2\x10", 53, "\xFF\xE2\x10\0"s) + zeros(600);
    expect_type(305, {"\xFF\xFB\x90" + kLayer3Pair, overlap});
    // A pair is found only if its second header starts more than four bytes before the limit.
    const std::string late = put(zeros(kScanBytes), 32500, pair("\xFF\xFF\x10", 32));
    expect_type(305, {put(zeros(kScanBytes), 32763 - 417, kLayer3Pair)});
    expect_type(303, {late});
    expect_type(2199, {put(late, 32764 - 417, "\xFF\xFB\x90")});
    // Headers inside a tag are skipped. Bytes that only resemble a tag are scanned.
    const std::string tag = put(id3(1000), 20, kLayer3Pair), long_tag = zeros(100) + id3(40000);
    const std::string tags = id3(3) + id3(0) + zeros(7) + id3(50);
    expect_type(305,
                {long_tag + kLayer3Pair, tags + kLayer3Pair, put(tag, 3, "\1"), put(tag, 3, "\5")});
    expect_type(2199, {long_tag, id3(3) + tag + zeros(20), put(tag, 3, "\2"), put(tag, 3, "\4")});
    for (const size_t inside : {4u, 6u, 9u, 10u}) {  // bytes of a tag in the scan's buffer
        const std::string before = zeros(kScanBytes - inside) + id3(700);
        expect_type(305, {before + kLayer3Pair});
        expect_type(2199, {before, zeros(kScanBytes - inside) + "ID3\3" + zeros(5)});
    }
    // Ogg files, program streams and transport streams (sync byte at 188) are not scanned.
    const std::string sync = "\x47" + kLayer3Pair;
    expect_type(2199, {"OggS" + kLayer3Pair, "\0\0\1\xBA"s + kLayer3Pair});
    expect_type(2199, {put(sync, 188 - kBefore, "\x47"), "\x47"});
    expect_type(305, {"\0\0\1\xB9"s + kLayer3Pair, put(sync, 188, "\x47")});
}

}  // namespace
