// Damaged files of every format: no crash, bounded time and memory, and what is far from the damage
// comes out as before.
#include <sys/resource.h>

#include <algorithm>
#include <chrono>
#include <cstring>
#include <random>

#include "tests/desktop/codec_test.h"

namespace codec_test {
namespace {

constexpr double kLongest = 10.0;             // seconds of one file
constexpr int64_t kMostMemory = 1024 * 1024;  // KiB of the whole program
constexpr size_t kSlack = 2 * 4608;           // samples: two of the longest frames
constexpr size_t kRecovery = 3 * 44'100;      // behind the damage, all is as before
constexpr int kPlaces = 3;

// Whether the end of the song comes out as before, behind damage.
enum end_of_song {
    kNever,    // noise that depends on the frames before
    kInPlace,  // where nothing has moved: the file says where its pieces lie
    kAlways,
};

struct format {
    const char *file;
    end_of_song end;
};

enum kind { kFlips, kZeros, kOnes, kNoise, kJunk, kTwice, kLost, kKinds };
constexpr const char *kNames[kKinds] = {"flips", "zeros", "ones", "noise", "junk", "twice", "lost"};

// The file with so many bytes damaged from at on.
bytes damaged(const bytes &file, int kind, size_t at, size_t run, std::mt19937 *random) {
    bytes piece = part(file, at, at + run);
    bytes noise(piece.size());
    for (uint8_t &byte : noise) byte = static_cast<uint8_t>((*random)());
    const bytes behind = part(file, at + piece.size());
    for (int i = 0; kind == kFlips && i < 8; ++i) {
        uint8_t &byte = piece[(*random)() % piece.size()];
        byte = static_cast<uint8_t>(byte ^ 1 << (*random)() % 8);
    }
    if (kind == kZeros) std::fill(piece.begin(), piece.end(), uint8_t{0});
    if (kind == kOnes) std::fill(piece.begin(), piece.end(), uint8_t{0xFF});
    if (kind == kNoise) piece = noise;
    if (kind == kJunk) piece = joined({noise, piece});
    if (kind == kTwice) piece = joined({piece, piece});
    if (kind == kLost) piece.clear();
    return joined({part(file, 0, at), piece, behind});
}

// Reads a file to its end and again behind seeks. Where it opens, duration, positions and samples
// agree however damaged it is.
samples read_consistently(const std::string &path, std::mt19937 *random) {
    const auto start = std::chrono::steady_clock::now();
    const opened file(path);
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
    EXPECT_LT(took.count(), kLongest);
    return linear;
}

// Samples at the front, or at the end, that are the same.
size_t same_front(const samples &a, const samples &b) {
    const size_t size = std::min(a.size(), b.size());
    const auto end = a.begin() + static_cast<ptrdiff_t>(size);
    return static_cast<size_t>(std::mismatch(a.begin(), end, b.begin()).first - a.begin());
}

size_t same_end(samples a, samples b) {
    std::reverse(a.begin(), a.end());
    std::reverse(b.begin(), b.end());
    return same_front(a, b);
}

class Damage : public testing::TestWithParam<format> {};

TEST_P(Damage, StaysWhereItIs) {
    SCOPED_TRACE(GetParam().file);
    std::mt19937 random(2026);
    const bytes file = load(fixture(GetParam().file));
    const samples whole = read_all(fixture(GetParam().file));
    for (int place = 0; place < kPlaces; ++place) {
        const size_t at = file.size() / 4 + random() % (file.size() / 4);
        // What a file that ends there has is what it has of the whole one.
        const samples cut = read_consistently(save("cut", part(file, 0, at)), &random);
        ASSERT_GT(cut.size(), whole.size() / 10);
        ASSERT_LT(cut.size(), whole.size() * 3 / 4);
        EXPECT_GE(same_front(cut, whole) + kSlack, cut.size()) << "cut at " << at;
        for (int kind = 0; kind < kKinds; ++kind) {
            SCOPED_TRACE(std::string(kNames[kind]) + " at " + std::to_string(at));
            const size_t run = 200 + random() % 750 * 4;
            const bytes changed = damaged(file, kind, at, run, &random);
            const samples got = read_consistently(save("damaged", changed), &random);
            EXPECT_GE(same_front(got, whole) + kSlack, cut.size());
            const bool moved = kind == kJunk || kind == kTwice || kind == kLost;
            if (GetParam().end < (moved ? kAlways : kInPlace)) continue;
            const samples rest = read_all(save("rest", part(file, 0, at + run)));
            EXPECT_GE(same_end(got, whole) + kRecovery, whole.size() - rest.size());
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Formats, Damage,
                         testing::Values(format{"song.wav", kInPlace},
                                         format{"no_table.flac", kAlways},
                                         format{"cbr.mp3", kAlways}, format{"layer2.mp2", kAlways},
                                         format{"high.aac", kAlways}, format{"high.m4a", kInPlace},
                                         format{"fragmented.mp4", kNever},
                                         format{"song.ogg", kAlways}));

// Counts that say far more than the file can hold.
TEST(Claims, OfTooMuchAreNotBelieved) {
    const struct {
        const char *file, *behind;
        size_t at;
        bytes value;
    } claims[] = {
        {"first.m4a", "stsz", 12, {0x7F, 0xFF, 0xFF, 0xFF}},  // frames
        {"first.m4a", "stsz", 8, {0, 0, 0, 1}},               // bytes of each
        {"first.m4a", "stco", 8, {0x7F, 0xFF, 0xFF, 0xFF}},   // chunks
        {"first.m4a", "stsc", 16, {0x7F, 0xFF, 0xFF, 0xFF}},  // frames in a chunk
        {"fragmented.mp4", "trun", 8, {0xFF, 0xFF, 0xFF, 0xFF}},
        {"fragmented.mp4", "trun", 4, {0, 0, 0, 0, 0xFF, 0xFF, 0xFF, 0xFF}},  // of unstated sizes
        {"no_table.flac", "fLaC", 21, {0xF5, 0xFF, 0xFF, 0xFF, 0xFF}},        // samples
        {"song.wav", "data", 4, {0xF0, 0xFF, 0xFF, 0xFF}},
    };
    std::mt19937 random(3);
    for (const auto &each : claims) {
        SCOPED_TRACE(std::string(each.file) + ", " + each.behind);
        bytes file = load(fixture(each.file));
        const auto found =
            std::search(file.begin(), file.end(), each.behind, each.behind + strlen(each.behind));
        ASSERT_NE(found, file.end());
        std::copy(each.value.begin(), each.value.end(), found + static_cast<ptrdiff_t>(each.at));
        const samples got = read_consistently(save("claim", file), &random);
        EXPECT_LE(got.size(), 3'000'000U);
    }
    rusage used = {};
    getrusage(RUSAGE_SELF, &used);
    EXPECT_LT(used.ru_maxrss, kMostMemory);
}

}  // namespace
}  // namespace codec_test
