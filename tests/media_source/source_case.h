// One row for each format source, and a file that opens with it. What comes out of the decoders is
// the scripted codec library's.
#ifndef TAVO_TESTS_MEDIA_SOURCE_SOURCE_CASE_H
#define TAVO_TESTS_MEDIA_SOURCE_SOURCE_CASE_H

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>

#include "media_source/mtsrc_ctx.h"
#include "tests/media_source/memory_file.h"
#include "tests/support/scripted_codec.h"

using names = std::vector<std::string>;

struct source_row {
    const char *name;
    byte_run file;
    int32_t tag;                    // codec of the script; 0: the format's own
    names opens;                    // calls of an open that succeeds
    std::vector<int32_t> failures;  // the code when that call fails; 0: its result is not tested
    names closes;
    const char *read;
    const char *decode;
    const char *reset;
    const char *seek;
    int32_t codec;
    int32_t frame_bytes;
    int32_t channels;  // of the format, the script's being 2
    names libraries;
};

inline const std::vector<source_row> &source_rows() {
    static const std::vector<source_row> rows = {
        {"aac",
         byte_run{0xFF, 0xF1} + zeros(14),
         0,
         {"xaac_init", "xaacfd_create", "xaacd_create"},
         {-255, -7, -255},
         {"xaacfd_delete", "xaacd_delete", "xaac_deinit"},
         "xaacfd_get_frm",
         "xaacd_decode",
         "xaacd_reset",
         "xaacfd_seek",
         306,
         24576,
         2,
         {"xaac"}},
        {"flac",
         text("fLaC") + zeros(12),
         0,
         {"xflac_init", "xflacfd_create", "xflacd_create"},
         {-255, -7, -255},
         {"xflacfd_delete", "xflacd_delete", "xflac_deinit"},
         "xflacfd_get_frm",
         "xflacd_decode",
         "xflacd_reset",
         "xflacfd_seek",
         322,
         131070,
         2,
         {"xflac"}},
        {"mpeg",
         layer3_pair(),
         0,
         {"xmp123_init", "xmp123fd_create", "xmp123d_create"},
         {-255, -7, -255},
         {"xmp123fd_delete", "xmp123d_delete", "xmp123_deinit"},
         "xmp123fd_get_frm",
         "xmp123d_decode",
         "xmp123d_reset",
         "xmp123fd_seek",
         305,
         19200,
         2,
         {"xmp123"}},
        {"mp4 with aac",
         zeros(4) + text("ftyp") + zeros(8),
         kWexaTagAac,
         {"xaac_init", "xmp123_init", "xmp4fd_create", "xmp4fds_open", "xmp4fds_get_info_aud",
          "xaacd_create"},
         {-255, -255, -7, -7, 0, -255},
         {"xmp4fds_close", "xmp4fd_delete", "xaacd_delete", "xaac_deinit", "xmp123_deinit"},
         "xmp4fds_get_frm",
         "xaacd_decode",
         "xaacd_reset",
         "xmp4fds_seek",
         306,
         24576,
         2,
         {"xaac", "xmp123"}},
        {"mp4 with mpeg",
         zeros(4) + text("ftyp") + zeros(8),
         kWexaTagMpegLayer3,
         {"xaac_init", "xmp123_init", "xmp4fd_create", "xmp4fds_open", "xmp4fds_get_info_aud",
          "xmp123d_create"},
         {-255, -255, -7, -7, 0, -255},
         {"xmp4fds_close", "xmp4fd_delete", "xmp123d_delete", "xaac_deinit", "xmp123_deinit"},
         "xmp4fds_get_frm",
         "xmp123d_decode",
         "xmp123d_reset",
         "xmp4fds_seek",
         305,
         19200,
         2,
         {"xaac", "xmp123"}},
        {"ogg",
         text("OggS") + zeros(12),
         0,
         {"xvorbis_init", "xoggd_create", "xoggds_open", "xoggds_get_info_aud", "xoggds_get_format",
          "xoggds_get_format", "xvorbisd_create", "xvorbisd_decode"},
         {-255, -7, -7, -7, -7, -7, -255, -255},
         {"xoggds_close", "xoggd_delete", "xvorbisd_delete", "xvorbis_deinit"},
         "xoggds_get_frm",
         "xvorbisd_decode",
         "xvorbisd_reset",
         "xoggds_seek",
         323,
         16384,
         1,
         {"xvorbis"}},
    };
    return rows;
}

inline const source_row &source_row_of(const std::string &name) {
    for (const source_row &row : source_rows()) {
        if (row.name == name) {
            return row;
        }
    }
    std::abort();
}

inline byte_run wav_file() {
    return text("RIFF") + zeros(4) + text("WAVEfmt ");
}

struct SourceTest : testing::Test {
    std::string path = testing::TempDir() + "tavo_source_" + std::to_string(getpid());
    mtsrc_ctx *src = nullptr;
    int32_t err = 77;

    void SetUp() override { scripted::reset(); }
    void TearDown() override {
        close_source();
        unlink(path.c_str());
        EXPECT_EQ(scripted::faults(), names{});
        EXPECT_EQ(scripted::live_objects(), 0);
        EXPECT_EQ(scripted::tag_buffers_left(), 0);
        scripted::reset();
    }
    void write(const byte_run &content) const {
        FILE *file = fopen(path.c_str(), "wb");
        ASSERT_NE(file, nullptr);
        EXPECT_EQ(fwrite(content.data(), 1, content.size(), file), content.size());
        fclose(file);
    }
    int32_t open_path(const std::string &where) {
        const mtsrc_param param = {where.c_str()};
        err = 77;
        src = mtsrc_init(&param, &err);
        EXPECT_EQ(src != nullptr, err == 0);
        return err;
    }
    int32_t open_file(const byte_run &content, const scripted::script &what) {
        write(content);
        scripted::use(what);
        return open_path(path);
    }
    int32_t open_row(const source_row &row, scripted::script what) {
        if (row.tag != 0 && !what.codec) {
            what.codec = row.tag;
        }
        return open_file(row.file, what);
    }
    void close_source() {
        if (src) {
            EXPECT_EQ(mtsrc_deinit(src), -5);
            src = nullptr;
        }
    }
    // The result of one read, with the samples delivered.
    int32_t read(int32_t bytes, std::vector<int16_t> *samples = nullptr) const {
        byte_run data(static_cast<size_t>(bytes) + 2, 0xEE);
        mtsrc_frame frame = {data.data(), -1};
        const int32_t code = mtsrc_getstream(src, bytes, &frame);
        EXPECT_EQ(data.back(), 0xEE);
        if (samples) {
            samples->assign(frame.size > 0 ? static_cast<size_t>(frame.size) / 2 : 0, 0);
            std::copy_n(data.data(), samples->size() * 2,
                        reinterpret_cast<uint8_t *>(samples->data()));
        }
        return code;
    }
    std::vector<int16_t> read_all() const {
        std::vector<int16_t> samples;
        EXPECT_EQ(read(1 << 16, &samples), 1);
        return samples;
    }
};

#endif
