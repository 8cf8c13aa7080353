#include <fcntl.h>

#include <thread>

#include "tests/media_source/source_case.h"

namespace {

using Frame = SourceTest;

TEST_F(Frame, FormatLeavesTheGapAlone) {
    scripted::script what;
    what.duration = 123'456'789'012;
    ASSERT_EQ(open_row(source_row_of("aac"), what), 0);
    EXPECT_EQ(memcmp(&src->mark, "KOVA", 4), 0);
    mtsrc_format format;
    memset(&format, 0xAB, sizeof(format));
    EXPECT_EQ(mtsrc_getstream_format(src, &format), 0);
    EXPECT_EQ(format.sample_rate, 44100);
    EXPECT_EQ(format.channels, 2);
    EXPECT_EQ(format.bits, 16);
    EXPECT_EQ(format.duration, 123'456'789'012);
    uint32_t gap = 0;
    memcpy(&gap, reinterpret_cast<uint8_t *>(&format) + 12, sizeof(gap));
    EXPECT_EQ(gap, 0xABABABAB);
    EXPECT_EQ(mtsrc_getstream_format(src, nullptr), -4);
}

TEST_F(Frame, HandlesWithoutTheMarkAreRefused) {
    mtsrc_ctx zeroed = {};
    memcpy(&zeroed.mark, "KOVB", 4);
    for (mtsrc_ctx *bad : {static_cast<mtsrc_ctx *>(nullptr), &zeroed}) {
        mtsrc_format format = {};
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
    while (longest.size() + 2 <= 511) {
        longest.insert(slash, "/.");
    }
    if (longest.size() < 511) {
        longest.insert(slash, "/");
    }
    ASSERT_EQ(longest.size(), 511u);
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
    write(byte_run{0xFF, 0xFF, 0x10} + zeros(29) + byte_run{0xFF, 0xFF, 0x10, 0});
    EXPECT_EQ(open_path(path), 0);
    EXPECT_EQ(src->codec, 305);
    close_source();
    write(byte_run{0xFF, 0xFD, 0xA4} + zeros(573) + byte_run{0xFF, 0xFD, 0xA4, 0});
    EXPECT_EQ(open_path(path), 0);
    EXPECT_EQ(src->codec, 305);
}

// The caller's record: a descriptor instead of a path, counting openings and closings.
int opened = 0;

TEST_F(Frame, OpensACallersOwnRecord) {
    write(source_row_of("flac").file);
    const int fd = open(path.c_str(), O_RDONLY);
    mtsrc_io io = {};
    io.open = [](const mtsrc_io *of, int32_t mode) {
        ++opened;
        EXPECT_EQ(mode, 0);
        return mtsrc_file_open(of, mode);
    };
    io.close = [](mtsrc_file *file) {
        --opened;
        return mtsrc_file_close(file);
    };
    io.read = mtsrc_file_read;
    io.tell = mtsrc_file_tell;
    io.seek = mtsrc_file_seek;
    io.skip = mtsrc_file_skip;
    io.fd = fd;
    io.path = strdup("fd");
    opened = 0;
    scripted::answer("xflacfd_create", {-1});
    EXPECT_EQ(mtsrc_open_mfal(&io, 0, &err), nullptr);
    EXPECT_EQ(err, -7);
    EXPECT_EQ(opened, 0);
    EXPECT_STREQ(io.path, "fd");  // the caller's after a failure
    src = mtsrc_open_mfal(&io, 0, &err);
    ASSERT_NE(src, nullptr);
    EXPECT_EQ(opened, 1);
    // The codec library got the handle's own copy of the record.
    const scripted::call made = scripted::calls_of("xflacfd_create").back();
    EXPECT_EQ(made.addresses[0], &src->io);
    EXPECT_EQ(memcmp(made.records[0].data(), &io, sizeof(io)), 0);
    close_source();
    EXPECT_EQ(opened, 0);
    close(fd);
    EXPECT_EQ(mtsrc_open_mfal(nullptr, 0, &err), nullptr);
    EXPECT_EQ(err, -4);
}

TEST_F(Frame, FourSourcesReadAtOnce) {
    std::vector<int16_t> ramp(40'000);
    for (size_t i = 0; i < ramp.size(); ++i) {
        ramp[i] = static_cast<int16_t>(i % 30'000);
    }
    write(source_row_of("ogg").file);
    scripted::use(scripted::song(ramp, 1, 44100, 576));
    mtsrc_ctx *sources[4] = {};
    std::vector<int16_t> got[4];
    for (mtsrc_ctx *&one : sources) {
        const mtsrc_param param = {path.c_str()};
        one = mtsrc_init(&param, &err);
        ASSERT_NE(one, nullptr);
    }
    std::thread readers[4];
    for (size_t i = 0; i < 4; ++i) {
        readers[i] = std::thread([&, i] {
            int32_t code = 0;
            while (code == 0) {
                int16_t data[4096];
                mtsrc_frame frame = {data, 0};
                code = mtsrc_getstream(sources[i], 8192, &frame);
                got[i].insert(got[i].end(), data, data + frame.size / 2);
            }
            EXPECT_EQ(code, 1);
        });
    }
    for (size_t i = 0; i < 4; ++i) {
        readers[i].join();
        EXPECT_EQ(got[i], ramp);
        EXPECT_EQ(mtsrc_deinit(sources[i]), -5);
    }
}

}  // namespace
