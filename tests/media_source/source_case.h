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
using samples = std::vector<int16_t>;

struct source_row {
    const char *name;
    byte_run file;
    int32_t tag;  // codec of the script; 0: the format's own
    int32_t codec;
    int32_t frame_bytes;
    int32_t channels;             // of the format; 0: the script's
    std::vector<int32_t> config;  // of the decoder, for 5 channels at 22,050 Hz
    names libraries = {};
    std::string reader = {};             // what its functions' names begin with
    std::string decoder = {};            // likewise; empty: none
    names opens = {};                    // calls of an open that succeeds
    std::vector<int32_t> failures = {};  // the code when that call fails; 0: its result is unused
    names closes = {};

    std::string read() const { return reader + "_get_frm"; }
    std::string seek() const { return reader + "_seek"; }
    std::string decode() const { return decoder + "_decode"; }
    std::string reset() const { return decoder + "_reset"; }
};

inline byte_run wav_file() {
    return text("RIFF") + zeros(4) + text("WAVEfmt ");
}

// A format of frames alone, read and decoded by one library.
inline source_row elementary(const std::string &library, source_row row) {
    row.libraries = {library};
    row.reader = library + "fd";
    row.decoder = library + "d";
    row.opens = {library + "_init", row.reader + "_create", row.decoder + "_create"};
    row.failures = {-255, -7, -255};
    row.closes = {row.reader + "_delete", row.decoder + "_delete", library + "_deinit"};
    return row;
}

inline source_row in_mp4(const char *name, int32_t tag, source_row row) {
    row.name = name;
    row.file = zeros(4) + text("ftyp") + zeros(8);
    row.tag = tag;
    row.libraries = {"xaac", "xmp123"};
    row.reader = "xmp4fds";
    row.opens = {"xaac_init",    "xmp123_init",          "xmp4fd_create",
                 "xmp4fds_open", "xmp4fds_get_info_aud", row.decoder + "_create"};
    row.failures = {-255, -255, -7, -7, 0, -255};
    row.closes = {"xmp4fds_close", "xmp4fd_delete", row.decoder + "_delete", "xaac_deinit",
                  "xmp123_deinit"};
    return row;
}

inline std::vector<source_row> make_source_rows() {
    const source_row aac = elementary(
        "xaac",
        {"aac", byte_run{0xFF, 0xF1} + zeros(14), 0, 306, 24576, 2, {1, 2, 2, 0, 3, 22050, 5, 0}});
    const source_row mpeg =
        elementary("xmp123", {"mpeg", layer3_pair(), 0, 305, 19200, 0, {1, 0, 2, 0}});
    const source_row flac =
        elementary("xflac", {"flac", text("fLaC") + zeros(12), 0, 322, 131070, 2, {1, 2, 2, 0}});
    source_row ogg = {"ogg", text("OggS") + zeros(12), 0, 323, 16384, 1, {1, 1, 2, 0}};
    ogg.libraries = {"xvorbis"};
    ogg.reader = "xoggds";
    ogg.decoder = "xvorbisd";
    ogg.opens = {"xvorbis_init",      "xoggd_create",      "xoggds_open",     "xoggds_get_info_aud",
                 "xoggds_get_format", "xoggds_get_format", "xvorbisd_create", "xvorbisd_decode"};
    ogg.failures = {-255, -7, -7, -7, -7, -7, -255, -255};
    ogg.closes = {"xoggds_close", "xoggd_delete", "xvorbisd_delete", "xvorbis_deinit"};
    source_row wav = {"wav", wav_file(), 0, 2006, 16384, 0, {}};
    wav.reader = "xwavd";
    wav.opens = {"xwavd_create"};
    wav.failures = {-7};
    wav.closes = {"xwavd_delete"};
    return {aac,
            mpeg,
            flac,
            in_mp4("mp4 with aac", kWexaTagAac, aac),
            in_mp4("mp4 with mpeg", kWexaTagMpegLayer3, mpeg),
            ogg,
            wav};
}

inline const std::vector<source_row> &source_rows() {
    static const std::vector<source_row> rows = make_source_rows();
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

// The record that a call was handed.
template <typename record>
record recorded(const scripted::call &call, size_t at) {
    record value = {};
    memcpy(&value, call.records.at(at).data(), sizeof(value));
    return value;
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
    template <typename action>
    void for_each_row(action act) {
        for (const source_row &row : source_rows()) {
            SCOPED_TRACE(row.name);
            act(row);
            close_source();
            scripted::forget_calls();
        }
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
    int32_t open_row(const source_row &row, scripted::script what) {
        if (row.tag != 0 && !what.codec) {
            what.codec = row.tag;
        }
        write(row.file);
        scripted::use(what);
        return open_path(path);
    }
    // Opens a file of these frames; its calls are forgotten.
    void open_frames(const source_row &row, const std::vector<scripted::frame> &frames,
                     int32_t channels = 2) {
        scripted::script what;
        what.frames = frames;
        what.channels = channels;
        ASSERT_EQ(open_row(row, what), 0);
        scripted::forget_calls();
    }
    void close_source() {
        if (src) {
            EXPECT_EQ(mtsrc_deinit(src), -5);
            EXPECT_EQ(scripted::live_objects(), 0);
            src = nullptr;
        }
    }
    // The result of one read, with the samples delivered.
    int32_t read(int32_t bytes, samples *into = nullptr) const {
        byte_run data(static_cast<size_t>(bytes) + 2, 0xEE);
        mtsrc_frame frame = {data.data(), -1};
        const int32_t code = mtsrc_getstream(src, bytes, &frame);
        EXPECT_EQ(data.back(), 0xEE);
        if (into) {
            into->assign(frame.size > 0 ? static_cast<size_t>(frame.size) / 2 : 0, 0);
            std::copy_n(data.data(), into->size() * 2, reinterpret_cast<uint8_t *>(into->data()));
        }
        return code;
    }
    // All that is left, in pieces of so many bytes.
    samples read_all(int32_t bytes = 1 << 16) const {
        samples all;
        samples piece;
        int32_t code = 0;
        while (code == 0) {
            code = read(bytes, &piece);
            all.insert(all.end(), piece.begin(), piece.end());
        }
        EXPECT_EQ(code, 1);
        return all;
    }
};

#endif
