#include <fcntl.h>

#include "tests/media_source/source_case.h"

namespace {

using Frame = SourceTest;

TEST_F(Frame, HandlesWithoutTheMarkAreRefused) {
    mtsrc_format format = {};
    ASSERT_EQ(open_row(source_row_of("aac"), {}), 0);
    EXPECT_EQ(memcmp(&src->mark, "KOVA", 4), 0);
    EXPECT_EQ(mtsrc_getstream_format(src, nullptr), -4);
    mtsrc_ctx zeroed = {};
    memcpy(&zeroed.mark, "KOVB", 4);
    for (mtsrc_ctx *bad : {static_cast<mtsrc_ctx *>(nullptr), &zeroed}) {
        int64_t reached = 77;
        char byte = 0;
        mtsrc_frame frame = {&byte, 77};
        EXPECT_EQ(mtsrc_getstream_format(bad, &format), -4);
        EXPECT_EQ(mtsrc_seekstream(bad, 5, &reached), -4);
        EXPECT_EQ(mtsrc_getstream(bad, 1, &frame), -4);
        EXPECT_EQ(mtsrc_reset(bad), -4);
        EXPECT_EQ(mtsrc_deinit(bad), -4);
        EXPECT_EQ(reached, 77);
        EXPECT_EQ(frame.size, 77);
    }
}

TEST_F(Frame, PathsUpTo511Bytes) {
    write(source_row_of("aac").file);
    const size_t slash = path.rfind('/');
    std::string longest = path;
    longest.insert(slash, 511 - path.size(), '/');
    EXPECT_EQ(open_path(longest), 0);
    close_source();
    longest.insert(slash, "/");
    EXPECT_EQ(open_path(longest), -3);
    EXPECT_EQ(open_path(std::string(100'000, 'a')), -3);
}

TEST_F(Frame, FilesThatDoNotOpen) {
    EXPECT_EQ(open_path(path), -7);
    EXPECT_EQ(open_path(testing::TempDir()), -6);  // a directory opens, but cannot be read
    write(zeros(15));
    EXPECT_EQ(open_path(path), -6);
    write(zeros(100));
    EXPECT_EQ(open_path(path), -3);
    write(
        {0x30, 0x26, 0xB2, 0x75, 0x8E, 0x66, 0xCF, 0x11, 0xA6, 0xD9, 0, 0xAA, 0, 0x62, 0xCE, 0x6C});
    EXPECT_EQ(open_path(path), -3);
    EXPECT_EQ(scripted::call_names(), names{});
    const mtsrc_param no_path = {nullptr};
    EXPECT_EQ(mtsrc_init(&no_path, &err), nullptr);
    EXPECT_EQ(err, -4);
}

TEST_F(Frame, LayersIAndIIOpenAsMpeg) {
    for (const byte_run &content :
         {byte_run{0xFF, 0xFF, 0x10} + zeros(29) + byte_run{0xFF, 0xFF, 0x10, 0},
          byte_run{0xFF, 0xFD, 0xA4} + zeros(573) + byte_run{0xFF, 0xFD, 0xA4, 0}}) {
        write(content);
        EXPECT_EQ(open_path(path), 0);
        EXPECT_EQ(src->codec, 305);
        close_source();
    }
}

// The caller's record: a descriptor, read from its start, and callbacks that count what is open.
int opened = 0;

TEST_F(Frame, OpensACallersOwnRecord) {
    write(source_row_of("flac").file);
    const int fd = open(path.c_str(), O_RDONLY);
    ASSERT_EQ(lseek(fd, 7, SEEK_SET), 7);
    mtsrc_io io = probe_io();
    io.open = [](const mtsrc_io *of, int32_t mode) {
        ++opened;
        EXPECT_EQ(mode, 0);
        return mtsrc_file_open(of, mode);
    };
    io.close = [](mtsrc_file *file) {
        --opened;
        return mtsrc_file_close(file);
    };
    io.fd = fd;
    io.path = strdup("fd");
    scripted::answer("xflacfd_create", {-1});
    EXPECT_EQ(mtsrc_open_mfal(&io, 0, &err), nullptr);
    EXPECT_EQ(err, -7);
    EXPECT_EQ(opened, 0);
    EXPECT_STREQ(io.path, "fd");  // the caller's after a failure
    src = mtsrc_open_mfal(&io, 0, &err);
    ASSERT_NE(src, nullptr);
    EXPECT_EQ(opened, 1);
    EXPECT_NE(src->probe_file->fd, fd);
    // The codec library got the handle's own copy of the record.
    const scripted::call made = scripted::calls_of("xflacfd_create").back();
    EXPECT_EQ(made.addresses[0], &src->io);
    EXPECT_EQ(memcmp(made.records[0].data(), &io, sizeof(io)), 0);
    close_source();
    EXPECT_EQ(opened, 0);
    EXPECT_EQ(close(fd), 0);
    std::string closed = "fd";
    io.path = closed.data();
    EXPECT_EQ(mtsrc_file_open(&io, 0), nullptr);
    EXPECT_EQ(mtsrc_open_mfal(nullptr, 0, &err), nullptr);
    EXPECT_EQ(err, -4);
}

}  // namespace
