// Damaged files of every format. Nothing crashes, time and memory are bounded, and audio far from
// the damage is unchanged.
#include <sys/resource.h>

#include <chrono>

#include "tests/desktop/codec_test.h"

namespace codec_test {
namespace {

using namespace std::string_literals;

constexpr double kMaxSeconds = 10.0;      // of one file
constexpr int64_t kMaxKiB = 1024 * 1024;  // KiB, of the whole program
constexpr size_t kSlack = 2 * 4608;       // samples: two of the longest frames
constexpr size_t kRecovery =
    3 * 44'100;  // samples after the damage until the output is bit-identical again
constexpr int kOffsets = 3;

// When the end of the song, after the damage, must be bit-identical to that of the undamaged file.
enum end_of_song {
    kNever,    // noise depends on earlier frames
    kInPlace,  // only if no bytes have moved, because the file states offsets
    kAlways,
};

struct format {
    const char *file;
    end_of_song end;
};

enum kind { kFlips, kZeros, kOnes, kNoise, kJunk, kTwice, kLost, kKinds };
constexpr const char *kNames[kKinds] = {"flips", "zeros", "ones", "noise", "junk", "twice", "lost"};

// Returns the file with `count` bytes damaged, starting at offset `at`.
std::string damage(std::string file, int kind, size_t at, size_t count, std::mt19937 *random) {
    std::string bytes = file.substr(at, count);
    const std::string noise = support::noise(count, (*random)());
    for (int i = 0; kind == kFlips && i < 8; ++i) {
        char &byte = bytes[(*random)() % count];
        byte = static_cast<char>(byte ^ 1 << (*random)() % 8);
    }
    if (kind == kZeros) bytes.assign(count, '\0');
    if (kind == kOnes) bytes.assign(count, '\xFF');
    if (kind == kNoise) bytes = noise;
    if (kind == kJunk) bytes = noise + bytes;
    if (kind == kTwice) bytes += bytes;
    if (kind == kLost) bytes.clear();
    return file.replace(at, count, bytes);
}

// Reads a file to its end and again after seeks. If it opens, its duration, positions and samples
// are consistent, however damaged it is.
samples read_consistently(const std::string &path, std::mt19937 *random) {
    const auto start = std::chrono::steady_clock::now();
    const open_source file(path);
    if (file.source == nullptr) return {};
    const samples linear = read(file.source);
    const int64_t rate = file.format.sample_rate;
    const int64_t duration = file.format.duration;
    EXPECT_EQ(duration * rate / kUnits, static_cast<int64_t>(linear.size()));
    for (int k = 0; k < 2; ++k) {
        const auto position =
            static_cast<int64_t>((*random)() % static_cast<uint64_t>(duration + kUnits));
        int64_t reached = -1;
        EXPECT_EQ(mtsrc_seekstream(file.source, position, &reached), 0);
        EXPECT_LE(reached, std::max(position, duration));
        const auto sample = static_cast<size_t>(reached * rate / kUnits);
        EXPECT_EQ(sample + read(file.source).size(), linear.size());
    }
    const std::chrono::duration<double> took = std::chrono::steady_clock::now() - start;
    EXPECT_LT(took.count(), kMaxSeconds);
    return linear;
}

// Return the number of equal samples at the start and at the end.
size_t count_equal_at_start(const samples &a, const samples &b) {
    const auto differs = std::mismatch(a.begin(), a.end(), b.begin(), b.end()).first;
    return static_cast<size_t>(differs - a.begin());
}

size_t count_equal_at_end(const samples &a, const samples &b) {
    const auto differs = std::mismatch(a.rbegin(), a.rend(), b.rbegin(), b.rend()).first;
    return static_cast<size_t>(differs - a.rbegin());
}

class DamagedFile : public testing::TestWithParam<format> {};

TEST_P(DamagedFile, IsUnchangedFarFromTheDamage) {
    SCOPED_TRACE(GetParam().file);
    std::mt19937 random(2026);
    const std::string file = load(fixture(GetParam().file));
    const samples whole = read_all(fixture(GetParam().file));
    for (int k = 0; k < kOffsets; ++k) {
        const size_t at = file.size() / 4 + random() % (file.size() / 4);
        // A truncated file delivers the start of the whole song.
        const samples cut = read_consistently(save("cut", file.substr(0, at)), &random);
        ASSERT_GT(cut.size(), whole.size() / 10);
        ASSERT_LT(cut.size(), whole.size() * 3 / 4);
        EXPECT_GE(count_equal_at_start(cut, whole) + kSlack, cut.size()) << "cut at " << at;
        for (int kind = 0; kind < kKinds; ++kind) {
            SCOPED_TRACE(std::string(kNames[kind]) + " at " + std::to_string(at));
            const size_t count = 200 + random() % 750 * 4;
            const std::string changed = damage(file, kind, at, count, &random);
            const samples got = read_consistently(save("damaged", changed), &random);
            EXPECT_GE(count_equal_at_start(got, whole) + kSlack, cut.size());
            const bool moved = kind == kJunk || kind == kTwice || kind == kLost;
            if (GetParam().end < (moved ? kAlways : kInPlace)) continue;
            const samples rest = read_all(save("rest", file.substr(0, at + count)));
            EXPECT_GE(count_equal_at_end(got, whole) + kRecovery, whole.size() - rest.size());
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Formats, DamagedFile,
                         testing::Values(format{"song.wav", kInPlace},
                                         format{"no_table.flac", kAlways},
                                         format{"cbr.mp3", kAlways}, format{"layer2.mp2", kAlways},
                                         format{"high.aac", kAlways}, format{"high.m4a", kInPlace},
                                         format{"fragmented.mp4", kNever},
                                         format{"song.ogg", kAlways}));

// Counts that are larger than the file allows.
TEST(DamagedCounts, AreNotBelieved) {
    const std::string kMost = "\x7F\xFF\xFF\xFF";
    const struct {
        const char *file, *mark;
        size_t at;
        std::string value;
    } false_counts[] = {
        {"first.m4a", "stsz", 12, kMost},       // number of frames
        {"first.m4a", "stsz", 8, "\0\0\0\1"s},  // bytes per frame
        {"first.m4a", "stco", 8, kMost},        // number of chunks
        {"first.m4a", "stsc", 16, kMost},       // frames per chunk
        {"fragmented.mp4", "trun", 8, "\xFF\xFF\xFF\xFF"},
        {"fragmented.mp4", "trun", 4, "\0\0\0\0\xFF\xFF\xFF\xFF"s},  // frames of unstated size
        {"no_table.flac", "fLaC", 21, "\xF5\xFF\xFF\xFF\xFF"},       // number of samples
        {"song.wav", "data", 4, "\xF0\xFF\xFF\xFF"},
    };
    std::mt19937 random(3);
    for (const auto &each : false_counts) {
        SCOPED_TRACE(std::string(each.file) + ", " + each.mark);
        std::string file = load(fixture(each.file));
        const size_t found = file.find(each.mark);
        ASSERT_NE(found, std::string::npos);
        file.replace(found + each.at, each.value.size(), each.value);
        const samples got = read_consistently(save("claim", file), &random);
        EXPECT_LE(got.size(), 3'000'000U);
    }
    rusage used = {};
    getrusage(RUSAGE_SELF, &used);
    EXPECT_LT(used.ru_maxrss, kMaxKiB);
}

}  // namespace
}  // namespace codec_test
