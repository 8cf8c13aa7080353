// What the codec tests share: encoded files made by tests/support/make_songs.sh, pieces of files,
// media sources read to the end, and the checks of what comes out of them.
#ifndef TAVO_TESTS_DESKTOP_CODEC_TEST_H
#define TAVO_TESTS_DESKTOP_CODEC_TEST_H

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

#include "media_source/mtsrc.h"
#include "media_source/wexaaudio.h"

namespace codec_test {

using bytes = std::vector<uint8_t>;
using samples = std::vector<int16_t>;

constexpr int64_t kUnits = 10'000'000;  // per second

// Path of a fixture by its name: golden/NAME in the source tree, else of a song made for the tests.
std::string fixture(const std::string &name);

// A file's contents; a missing or empty file fails the test.
bytes load(const std::string &path);

// Writes contents to a file of the running test's own and returns its path.
std::string save(const std::string &name, const bytes &contents);

// The bytes of a file in [from, to).
bytes part(const bytes &file, size_t from, size_t to = SIZE_MAX);

// The pieces, one behind the other.
bytes joined(const std::vector<bytes> &pieces);

// A source and the path that it reads. source is null when it could not be opened; error says why.
struct opened {
    mtsrc_ctx *source = nullptr;
    int32_t error = 0;
    mtsrc_format format = {};

    explicit opened(const std::string &path);
    ~opened();
    opened(const opened &) = delete;
    opened &operator=(const opened &) = delete;
};

// Reads up to limit samples from where the source stands. Any failure code fails the test.
samples read(mtsrc_ctx *source, size_t limit);

// All of a file's samples.
samples read_all(const std::string &path);

// The same samples; the first that differs is named.
void expect_same(const samples &got, const samples &wanted);

// The stream's duration is exact: the samples of a linear read. A seek to each of 40 places reports
// the first sample at or after it, and delivers from there what a linear read delivers there. The
// last quarter is no longer than a quarter of the duration holds, so that four parts decoded side
// by side have the whole stream.
void expect_exact_seams(const std::string &path);

// A callback record for a path, which must outlive it, for calling the codec library directly.
mtsrc_io io_for(const std::string &path);

}  // namespace codec_test

#endif
