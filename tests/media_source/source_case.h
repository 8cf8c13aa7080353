// Defines a file in each format, and a fixture that opens and reads such files. The fake codec
// library determines what the decoders deliver.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <sstream>

#include "media_source/mtsrc_ctx.h"
#include "tests/support/bytes.h"
#include "tests/support/fake_codec.h"

using namespace std::string_literals;
using samples = std::vector<int16_t>;
using fake_codec::bytes_of;
using support::zeros;

inline const std::string kWavFile = "RIFF\0\0\0\0WAVEfmt "s, kMp4File = "\0\0\0\0ftyp"s + zeros(8);
// Two Layer III frame headers at 128 kbit/s and 44,100 Hz, one frame length (417 bytes) apart.
inline const std::string kLayer3Pair = "\xFF\xFB\x90" + zeros(414) + "\xFF\xFB\x90\0"s;

inline const std::string kAsf = "\x30\x26\xB2\x75\x8E\x66\xCF\x11\xA6\xD9\x00\xAA\x00\x62\xCE\x6C"s;

struct source_row {
    std::string name, file;
    int32_t tag;  // codec tag of an MP4 track; 0 in other formats
    int32_t codec, frame_bytes;
    int32_t channels;             // channels that the source reports; 0: those of the stream
    int32_t min_rate, max_rate;   // accepted sample rates, Hz
    std::string config;           // the decoder's configuration for 5 channels at 22,050 Hz
    std::string reader, decoder;  // prefixes of their function names; empty if not used
    std::string opens;            // the calls that an open makes, in order
    std::string codes;            // for each call, the open's result if that call fails; 0: success
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
        EXPECT_TRUE(fake_codec::state.misuses.empty()) << fake_codec::state.misuses[0];
        fake_codec::state = {};
    }
    template <typename action>
    void for_each_row(action test) {
        for (const source_row &row : kRows) {
            SCOPED_TRACE(row.name);
            test(row);
        }
    }
    // These functions return the result code of mtsrc_init.
    int32_t open_path(const std::string &path) {
        close_source();
        fake_codec::state.calls.clear();
        const mtsrc_param param = {path.c_str()};
        src = mtsrc_init(&param, &err);
        EXPECT_EQ(src != nullptr, err == 0);
        EXPECT_TRUE(fake_codec::tags_are_empty() && (src || fake_codec::state.objects.empty()));
        return err;
    }
    int32_t open_bytes(const std::string &content) {
        std::ofstream(file.path) << content;
        return open_path(file.path);
    }
    int32_t open_row(const source_row &row, fake_codec::stream_spec stream = {}) {
        if (row.tag != 0 && !stream.codec) stream.codec = row.tag;
        fake_codec::state.streams.push_back(stream);
        return open_bytes(row.file);
    }
    // Opens a file with these frames and clears the recorded calls.
    void open_frames(const source_row &row, const std::vector<fake_codec::frame> &frames,
                     int32_t channels = 2, int32_t rate = 44100) {
        fake_codec::stream_spec stream = {rate, channels};
        stream.frames = frames;
        ASSERT_EQ(open_row(row, stream), 0);
        fake_codec::state.calls.clear();
    }
    void close_source() {
        EXPECT_EQ(mtsrc_deinit(src), src ? -5 : -4);
        EXPECT_TRUE(fake_codec::state.objects.empty());
        src = nullptr;
    }
};
