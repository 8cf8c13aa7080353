// Files by their content, one row for each format source, and a fixture that opens and reads them.
// The fake codec library decides what the decoders deliver.
#ifndef TAVO_TESTS_MEDIA_SOURCE_SOURCE_CASE_H
#define TAVO_TESTS_MEDIA_SOURCE_SOURCE_CASE_H

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <sstream>

#include "media_source/mtsrc_ctx.h"
#include "tests/support/bytes.h"
#include "tests/support/scripted_codec.h"

using namespace std::string_literals;
using samples = std::vector<int16_t>;
using scripted::bytes_of;
using support::zeros;

inline const std::string kWavFile = "RIFF\0\0\0\0WAVEfmt "s, kMp4File = "\0\0\0\0ftyp"s + zeros(8);
// Two Layer III frame headers at 128 kbit/s and 44,100 Hz, one frame length of 417 bytes apart.
inline const std::string kLayer3Pair = "\xFF\xFB\x90" + zeros(414) + "\xFF\xFB\x90\0"s;

inline const std::string kAsf = "\x30\x26\xB2\x75\x8E\x66\xCF\x11\xA6\xD9\x00\xAA\x00\x62\xCE\x6C"s;

struct source_row {
    std::string name, file;
    int32_t tag;  // codec of the script; 0: the format's own
    int32_t codec, frame_bytes;
    int32_t channels;             // of the format; 0: the script's
    int32_t least, most;          // Hz
    std::string config;           // of the decoder, for 5 channels at 22,050 Hz
    std::string reader, decoder;  // what the names of their functions begin with; empty: none
    std::string opens;            // calls of an open
    std::string codes;            // of the open when that call fails; 0: its result is unused
};
inline const std::string kAacConfig = bytes_of(xaac_config{{1, 2, 2, 0}, 3, 22050, 5, 0});
inline const std::string kMpegConfig = bytes_of(wexa_config{1, 0, 2, 0});
inline const std::string kMp4Opens =
    "xaac_init xmp123_init xmp4fd_create xmp4fds_open xmp4fds_get_info_aud ";
inline const std::vector<source_row> kRows = {
    {"aac", "\xFF\xF1" + zeros(14), 0, 306, 24576, 2, 8000, 48000, kAacConfig, "xaacfd", "xaacd",
     "xaac_init xaacfd_create xaacd_create ", "-255 -7 -255"},
    {"mpeg", kLayer3Pair, 0, 305, 19200, 0, 0, 48000, kMpegConfig, "xmp123fd", "xmp123d",
     "xmp123_init xmp123fd_create xmp123d_create ", "-255 -7 -255"},
    {"flac", "fLaC" + zeros(12), 0, 322, 131070, 2, 8000, 192000, bytes_of(wexa_config{1, 2, 2, 0}),
     "xflacfd", "xflacd", "xflac_init xflacfd_create xflacd_create ", "-255 -7 -255"},
    {"mp4 with aac", kMp4File, kWexaTagAac, 306, 24576, 2, 8000, 48000, kAacConfig, "xmp4fds",
     "xaacd", kMp4Opens + "xaacd_create ", "-255 -255 -7 -7 0 -255"},
    {"mp4 with mpeg", kMp4File, kWexaTagMpegLayer3, 305, 19200, 0, 0, 48000, kMpegConfig, "xmp4fds",
     "xmp123d", kMp4Opens + "xmp123d_create ", "-255 -255 -7 -7 0 -255"},
    {"ogg", "OggS" + zeros(12), 0, 323, 16384, 1, 0, 48000, bytes_of(wexa_config{1, 1, 2, 0}),
     "xoggds", "xvorbisd",
     "xvorbis_init xoggd_create xoggds_open xoggds_get_info_aud xoggds_get_format "
     "xoggds_get_format xvorbisd_create xvorbisd_decode ",
     "-255 -7 -7 -7 -7 -7 -255 -255"},
    {"wav", kWavFile, 0, 2006, 16384, 0, 0, 48000, "", "xwavd", "", "xwavd_create ", "-7"},
};

inline const source_row &row_of(const std::string &name) {
    return *std::find_if(kRows.begin(), kRows.end(),
                         [&name](const source_row &row) { return row.name == name; });
}

struct SourceTest : testing::Test {
    support::temporary_file file{"source"};
    mtsrc_ctx *src = nullptr;
    int32_t err = 77;

    ~SourceTest() override {
        close_source();
        EXPECT_TRUE(scripted::all.faults.empty()) << scripted::all.faults[0];
        scripted::all = {};
    }
    template <typename action>
    void for_each_row(action act) {
        for (const source_row &row : kRows) {
            SCOPED_TRACE(row.name);
            act(row);
        }
    }
    // All three return the code.
    int32_t open_path(const std::string &where) {
        close_source();
        scripted::all.calls.clear();
        const mtsrc_param param = {where.c_str()};
        src = mtsrc_init(&param, &err);
        EXPECT_EQ(src != nullptr, err == 0);
        EXPECT_TRUE(scripted::tags_are_empty() && (src || scripted::all.alive.empty()));
        return err;
    }
    int32_t open_bytes(const std::string &content) {
        std::ofstream(file.path) << content;
        return open_path(file.path);
    }
    int32_t open_row(const source_row &row, scripted::script plan = {}) {
        if (row.tag != 0 && !plan.codec) plan.codec = row.tag;
        scripted::all.use(plan);
        return open_bytes(row.file);
    }
    // Opens a file of these frames; its calls are forgotten.
    void open_frames(const source_row &row, const std::vector<scripted::frame> &frames,
                     int32_t channels = 2, int32_t rate = 44100) {
        scripted::script plan = {rate, channels};
        plan.frames = frames;
        ASSERT_EQ(open_row(row, plan), 0);
        scripted::all.calls.clear();
    }
    void close_source() {
        EXPECT_EQ(mtsrc_deinit(src), src ? -5 : -4);
        EXPECT_TRUE(scripted::all.alive.empty());
        src = nullptr;
    }
};

#endif
