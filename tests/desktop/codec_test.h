// What tests of encoded files share: the files made by tests/support/make_songs.sh, and media
// sources read to the end.
#ifndef TAVO_TESTS_DESKTOP_CODEC_TEST_H
#define TAVO_TESTS_DESKTOP_CODEC_TEST_H

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <fstream>
#include <map>
#include <string>
#include <vector>

#include "media_source/mtsrc.h"
#include "media_source/wexaaudio.h"
#include "tests/support/bytes.h"

namespace codec_test {

using samples = std::vector<int16_t>;

constexpr int64_t kUnits = 10'000'000;  // per second

// Path of a fixture by its name: golden/NAME in the source tree, else of a song made for the tests.
inline std::string fixture(const std::string &name) {
    const bool kept = name.rfind("golden/", 0) == 0;
    return kept ? CODEC_GOLDEN + name.substr(6) : CODEC_FIXTURES "/" + name;
}

// A file's contents; a missing or empty file fails the test.
inline std::string load(const std::string &path) {
    const std::string contents = support::contents_of(path);
    EXPECT_FALSE(contents.empty()) << path;
    return contents;
}

// Writes contents to a file that is the running program's own, until it ends. Returns its path.
inline std::string save(const std::string &name, const std::string &contents) {
    static std::map<std::string, support::temporary_file> saved;
    const std::string path = saved.try_emplace(name, name).first->second.path;
    EXPECT_TRUE((std::ofstream(path, std::ios::binary) << contents << std::flush).good()) << path;
    return path;
}

// A source. It is null when it could not be opened; error holds the reason.
struct opened {
    mtsrc_ctx *source = nullptr;
    int32_t error = 0;
    mtsrc_format format = {};

    explicit opened(const std::string &path) {
        const mtsrc_param param = {path.c_str()};
        source = mtsrc_init(&param, &error);
        EXPECT_TRUE(source == nullptr || mtsrc_getstream_format(source, &format) == 0);
    }
    ~opened() { EXPECT_TRUE(source == nullptr || mtsrc_deinit(source) == -5); }
    opened(const opened &) = delete;
    opened &operator=(const opened &) = delete;
};

// Reads up to limit samples from the source's position. Any failure code fails the test.
inline samples read(mtsrc_ctx *source, size_t limit = SIZE_MAX) {
    constexpr int32_t kRequest = 8192;  // bytes, the pipeline's own
    samples all;
    samples piece(kRequest / 2);
    for (int32_t code = 0; code == 0 && all.size() < limit;) {
        mtsrc_frame frame = {piece.data(), 0};
        code = mtsrc_getstream(source, kRequest, &frame);
        EXPECT_TRUE(code == 0 || code == 1) << code;
        all.insert(all.end(), piece.begin(), piece.begin() + frame.size / 2);
    }
    all.resize(std::min(all.size(), limit));
    return all;
}

// All of a file's samples.
inline samples read_all(const std::string &path) {
    const opened file(path);
    EXPECT_NE(file.source, nullptr) << path << ": " << file.error;
    return file.source != nullptr ? read(file.source) : samples{};
}

// The same samples; the first that differs is named.
inline void expect_same(const samples &got, const samples &wanted) {
    ASSERT_EQ(got.size(), wanted.size());
    const auto differs = std::mismatch(got.begin(), got.end(), wanted.begin()).first;
    EXPECT_EQ(differs - got.begin(), static_cast<ptrdiff_t>(got.size())) << "the first to differ";
}

// A callback record for a path, which must outlive it, for calling the codec library directly.
inline mtsrc_io io_for(const std::string &path) {
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.path = const_cast<char *>(path.c_str());  // read only by open
    return io;
}

}  // namespace codec_test

#endif
