// Files by their content, one row for each format source, and a fixture that opens and reads them.
// What comes out of the decoders is the scripted codec library's.
#ifndef TAVO_TESTS_MEDIA_SOURCE_SOURCE_CASE_H
#define TAVO_TESTS_MEDIA_SOURCE_SOURCE_CASE_H

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <iterator>
#include <sstream>

#include "media_source/mtsrc_ctx.h"
#include "tests/support/scripted_codec.h"

using byte_run = std::vector<uint8_t>;
using names = std::vector<std::string>;
using samples = std::vector<int16_t>;

inline byte_run text(const std::string &letters) {
    return byte_run(letters.begin(), letters.end());
}

inline byte_run operator+(byte_run left, const byte_run &right) {
    for (const uint8_t byte : right) left.push_back(byte);
    return left;
}

inline byte_run zeros(size_t count) {
    return byte_run(count, 0);
}

inline byte_run wav_file() {
    return text("RIFF") + zeros(4) + text("WAVEfmt ");
}

// Two Layer III frame headers at 128 kbit/s and 44,100 Hz, one frame length of 417 bytes apart.
inline byte_run layer3_pair() {
    return byte_run{0xFF, 0xFB, 0x90, 0} + zeros(413) + byte_run{0xFF, 0xFB, 0x90, 0};
}

// Words apart by a space.
inline names words(const std::string &line) {
    std::istringstream in(line);
    return {std::istream_iterator<std::string>(in), {}};
}

struct source_row {
    const char *name;
    byte_run file;
    int32_t tag;  // codec of the script; 0: the format's own
    int32_t codec;
    int32_t frame_bytes;
    int32_t channels;             // of the format; 0: the script's
    std::vector<int32_t> config;  // of the decoder, for 5 channels at 22,050 Hz
    std::string reader, decoder;  // what the names of their functions begin with; empty: none
    size_t libraries;             // calls of an open that initialise one
    std::string opens;            // calls of an open
    std::vector<int32_t> codes;   // of the open when that call fails; 0: its result is unused
};

inline const std::vector<source_row> &source_rows() {
    using list = std::vector<int32_t>;
    const auto row = [](auto... fields) { return source_row{fields...}; };
    static const byte_run mp4 = zeros(4) + text("ftyp") + zeros(8);
    static const std::string mp4_opens =
        "xaac_init xmp123_init xmp4fd_create xmp4fds_open xmp4fds_get_info_aud ";
    static const list bare_codes = {-255, -7, -255}, mp4_codes = {-255, -255, -7, -7, 0, -255};
    static const list aac_config = {1, 2, 2, 0, 3, 22050, 5, 0}, mpeg_config = {1, 0, 2, 0};
    static const std::vector<source_row> rows = {
        row("aac", byte_run{0xFF, 0xF1} + zeros(14), 0, 306, 24576, 2, aac_config, "xaacfd",
            "xaacd", 1u, "xaac_init xaacfd_create xaacd_create", bare_codes),
        row("mpeg", layer3_pair(), 0, 305, 19200, 0, mpeg_config, "xmp123fd", "xmp123d", 1u,
            "xmp123_init xmp123fd_create xmp123d_create", bare_codes),
        row("flac", text("fLaC") + zeros(12), 0, 322, 131070, 2, list{1, 2, 2, 0}, "xflacfd",
            "xflacd", 1u, "xflac_init xflacfd_create xflacd_create", bare_codes),
        row("mp4 with aac", mp4, kWexaTagAac, 306, 24576, 2, aac_config, "xmp4fds", "xaacd", 2u,
            mp4_opens + "xaacd_create", mp4_codes),
        row("mp4 with mpeg", mp4, kWexaTagMpegLayer3, 305, 19200, 0, mpeg_config, "xmp4fds",
            "xmp123d", 2u, mp4_opens + "xmp123d_create", mp4_codes),
        row("ogg", text("OggS") + zeros(12), 0, 323, 16384, 1, list{1, 1, 2, 0}, "xoggds",
            "xvorbisd", 1u,
            "xvorbis_init xoggd_create xoggds_open xoggds_get_info_aud xoggds_get_format "
            "xoggds_get_format xvorbisd_create xvorbisd_decode",
            list{-255, -7, -7, -7, -7, -7, -255, -255}),
        row("wav", wav_file(), 0, 2006, 16384, 0, list{}, "xwavd", "", 0u, "xwavd_create",
            list{-7}),
    };
    return rows;
}

inline const source_row &source_row_of(const std::string &name) {
    for (const source_row &row : source_rows()) {
        if (row.name == name) return row;
    }
    std::abort();
}

// The record that a call was handed.
template <typename record>
record recorded(const scripted::call &call, size_t at) {
    record value = {};
    memcpy(&value, call.records.at(at).data(), sizeof value);
    return value;
}

// The last call of that name.
inline scripted::call last_call(const std::string &name) {
    const std::vector<scripted::call> calls = scripted::calls_of(name);
    return calls.empty() ? scripted::call() : calls.back();
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
    // Both return the code.
    int32_t open_path(const std::string &where) {
        const mtsrc_param param = {where.c_str()};
        err = 77;
        src = mtsrc_init(&param, &err);
        EXPECT_EQ(src != nullptr, err == 0);
        return err;
    }
    int32_t open_row(const source_row &row, scripted::script plan) {
        if (row.tag != 0 && !plan.codec) plan.codec = row.tag;
        write(row.file);
        scripted::use(plan);
        scripted::forget_calls();
        open_path(path);
        EXPECT_EQ(scripted::tag_buffers_left(), 0);
        EXPECT_TRUE(err == 0 || scripted::live_objects() == 0);
        return err;
    }
    // Opens a file of these frames; its calls are forgotten.
    void open_frames(const source_row &row, const std::vector<scripted::frame> &frames,
                     int32_t channels = 2, int32_t rate = 44100) {
        close_source();
        scripted::script plan;
        plan.frames = frames;
        plan.channels = channels;
        plan.sample_rate = rate;
        ASSERT_EQ(open_row(row, plan), 0);
        scripted::forget_calls();
    }
    void close_source() {
        if (src == nullptr) return;
        EXPECT_EQ(mtsrc_deinit(src), -5);
        EXPECT_EQ(scripted::live_objects(), 0);
        src = nullptr;
    }
    // The result of one read, with the samples delivered.
    int32_t read(int32_t bytes, samples *into = nullptr) const {
        byte_run data(static_cast<size_t>(bytes) + 2, 0xEE);
        mtsrc_frame frame = {data.data(), 0};
        const int32_t code = mtsrc_getstream(src, bytes, &frame);
        EXPECT_EQ(data.back(), 0xEE);
        if (into) {
            into->assign(static_cast<size_t>(frame.size) / 2, 0);
            std::copy_n(data.data(), into->size() * 2, reinterpret_cast<uint8_t *>(into->data()));
        }
        return code;
    }
    // All that is left.
    samples read_all() const {
        samples all, piece;
        int32_t code = 0;
        while (code == 0) {
            code = read(8192, &piece);
            all.insert(all.end(), piece.begin(), piece.end());
        }
        EXPECT_EQ(code, 1);
        return all;
    }
};

#endif
