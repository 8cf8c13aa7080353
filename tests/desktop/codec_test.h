// Helpers for tests that read the encoded files made by tests/support/make_songs.sh.
#pragma once

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

using samples = std::vector<int16_t>;

constexpr int64_t kUnits = 10'000'000;  // per second

// Returns the path of a song: golden/NAME is in the source tree, other files are generated.
inline std::string fixture(const std::string &name) {
    const bool golden = name.rfind("golden/", 0) == 0;
    return golden ? CODEC_GOLDEN + name.substr(6) : CODEC_FIXTURES "/" + name;
}

// Returns a file's contents. The test fails if the file is missing or empty.
inline std::string load(const std::string &path) {
    const std::string contents = support::contents_of(path);
    EXPECT_FALSE(contents.empty()) << path;
    return contents;
}

// Writes a file that exists until the program ends. Returns its path.
inline std::string save(const std::string &name, const std::string &contents) {
    static std::map<std::string, support::temporary_file> saved;
    const std::string path = saved.try_emplace(name, name).first->second.path;
    EXPECT_TRUE((std::ofstream(path, std::ios::binary) << contents << std::flush).good()) << path;
    return path;
}

// Opens a source for a file. If this fails, `source` is null and `error` is the reason.
struct open_source {
    mtsrc_ctx *source = nullptr;
    int32_t error = 0;
    mtsrc_format format = {};

    explicit open_source(const std::string &path) {
        const mtsrc_param param = {path.c_str()};
        source = mtsrc_init(&param, &error);
        EXPECT_TRUE(source == nullptr || mtsrc_getstream_format(source, &format) == 0);
    }
    ~open_source() { EXPECT_TRUE(source == nullptr || mtsrc_deinit(source) == -5); }
    open_source(const open_source &) = delete;
};

// Reads at most `limit` samples from the current position. The test fails if a read fails.
inline samples read(mtsrc_ctx *source, size_t limit = SIZE_MAX) {
    constexpr int32_t kRequest = 8192;  // bytes, as in a job
    samples all;
    samples part(kRequest / 2);
    for (int32_t code = 0; code == 0 && all.size() < limit;) {
        mtsrc_frame frame = {part.data(), 0};
        code = mtsrc_getstream(source, kRequest, &frame);
        EXPECT_TRUE(code == 0 || code == 1) << code;
        all.insert(all.end(), part.begin(), part.begin() + frame.size / 2);
    }
    all.resize(std::min(all.size(), limit));
    return all;
}

inline samples read_all(const std::string &path) {
    const open_source file(path);
    EXPECT_NE(file.source, nullptr) << path << ": " << file.error;
    return file.source != nullptr ? read(file.source) : samples{};
}

// Expects equal samples, and reports the index of the first difference.
inline void expect_equal(const samples &got, const samples &expected) {
    ASSERT_EQ(got.size(), expected.size());
    const auto differs = std::mismatch(got.begin(), got.end(), expected.begin()).first;
    EXPECT_EQ(differs - got.begin(), static_cast<ptrdiff_t>(got.size())) << "the first to differ";
}

// Returns a callback record for direct calls to the codec library. `path` must outlive it.
inline mtsrc_io io_for(const std::string &path) {
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.path = const_cast<char *>(path.c_str());  // only open() uses it, without writing
    return io;
}
