// What the codec tests share: encoded files made by tests/support/make_fixtures.sh, media sources
// read to the end, and the check that a seek lands where it says.
#ifndef TAVO_TESTS_PLATFORM_CODEC_TEST_H
#define TAVO_TESTS_PLATFORM_CODEC_TEST_H

#include <gtest/gtest.h>

#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "media_source/mtsrc.h"

namespace codec_test {

using bytes = std::vector<uint8_t>;
using samples = std::vector<int16_t>;

constexpr int64_t kUnits = 10'000'000;  // per second

// Path of a fixture by its name.
std::string fixture(const std::string &name);

// A file's contents; a missing or empty file fails the test.
bytes load(const std::string &path);

// Writes contents to a file of the running test's own and returns its path.
std::string save(const std::string &name, const bytes &contents);

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

// Reads up to limit samples from where the source stands. *end: the source reported the end of the
// stream. Any failure code fails the test.
samples read(mtsrc_ctx *source, size_t limit, bool *end = nullptr);

// All of a file's samples.
samples read_all(const std::string &path);

// The same samples in [from, to).
void expect_same(const samples &got, const samples &wanted, size_t from, size_t to);

// The stream's duration is exact: the samples of a linear read. A seek to each of 40 places reports
// the first sample at or after it, and delivers from there what a linear read delivers there. The
// last quarter is no longer than a quarter of the duration holds, so that four parts decoded side
// by side have the whole stream.
void expect_exact_seams(const std::string &path);

// The same file after some accidents: flipped bits, runs of noise, zeros and ones, pieces removed,
// repeated and cut off.
bytes damaged(bytes file, std::mt19937 &random);

// Reads a file to its end and again behind a few seeks. False when it does not open; where it does,
// duration, positions and samples agree however damaged it is.
bool reads_consistently(const std::string &path, std::mt19937 &random);

// A callback record for a path, for calling the codec library directly.
mtsrc_io io_for(const std::string &path);

// A reader or demuxer of the codec library itself, without a source around it; null when the
// library refuses the file.
template <typename Info, typename Word, void *(*create)(const mtsrc_io *, Word *, Info *, void *),
          void (*remove)(void *)>
struct direct {
    std::string path;
    Info info = {};
    void *reader = nullptr;

    explicit direct(const std::string &file) : path(file) {
        const mtsrc_io io = io_for(path);
        Word word = 0;
        reader = create(&io, &word, &info, nullptr);
    }
    ~direct() { remove(reader); }
    direct(const direct &) = delete;
    direct &operator=(const direct &) = delete;
};

}  // namespace codec_test

#endif
