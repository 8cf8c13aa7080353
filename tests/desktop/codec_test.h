// What the codec tests share: encoded files made by tests/support/make_fixtures.sh, pieces of
// files, media sources read to the end, and the checks of what comes out of them.
#ifndef TAVO_TESTS_PLATFORM_CODEC_TEST_H
#define TAVO_TESTS_PLATFORM_CODEC_TEST_H

#include <gtest/gtest.h>

#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "media_source/mtsrc.h"
#include "media_source/wexaaudio.h"

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

// The bytes of a file in [from, to).
bytes part(const bytes &file, size_t from, size_t to = SIZE_MAX);

// The pieces, one behind the other.
bytes joined(const std::vector<bytes> &pieces);

// As many random bytes, always the same ones.
bytes noise(size_t size);

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

// A file that lost or gained something, and what comes out of it, counted in samples.
struct changed_file {
    const char *name;
    bytes contents;
    size_t size;                // of all that comes out
    size_t same_until = 0;      // before it, as from the whole file
    size_t same_from = kNever;  // from there on, counted in the whole file, as from it
    size_t silent_from = 0, silent_until = 0;
    bool exact_seams = true;

    static constexpr size_t kNever = SIZE_MAX;
};

// Reads each of the files; whole is what comes out of the one that they were made from.
void expect_changed(const samples &whole, const std::vector<changed_file> &files);

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

using direct_aac = direct<xaac_info, int64_t, xaacfd_create, xaacfd_delete>;
using direct_flac = direct<xflac_info, int64_t, xflacfd_create, xflacfd_delete>;
using direct_mp4 = direct<xmp4_info, int32_t, xmp4fd_create, xmp4fd_delete>;
using direct_mpeg = direct<xmp123_info, int64_t, xmp123fd_create, xmp123fd_delete>;
using direct_ogg = direct<xogg_info, int64_t, xoggd_create, xoggd_delete>;

}  // namespace codec_test

#endif
