// Tests in every format that damage does not change audio far from it. fuzz/source.cpp tests that
// damaged files cause no failures.
#include "tests/desktop/codec_test.h"

namespace {

using namespace std::string_literals;

constexpr size_t kSlack = 2 * 4608;       // samples that may differ before the damage
constexpr size_t kRecovery = 3 * 44'100;  // samples that may differ after the damage
constexpr int kOffsets = 3;

// When the samples long after the damage must equal those of the undamaged file.
enum end_of_song {
    kNever,    // the decoder's noise depends on earlier frames
    kInPlace,  // if no bytes move, because the file contains offsets
    kAlways,
};

struct format {
    const char *file;
    end_of_song end;
};

// Returns the file with `count` bytes damaged, starting at offset `at`.
std::string damage(std::string file, const std::string &kind, size_t at, size_t count,
                   std::mt19937 *random) {
    std::string bytes = file.substr(at, count);
    const std::string noise = support::noise(count, (*random)());
    for (int i = 0; kind == "flips" && i < 8; ++i) {
        char &byte = bytes[(*random)() % count];
        byte = static_cast<char>(byte ^ 1 << (*random)() % 8);
    }
    if (kind == "zeros") bytes.assign(count, '\0');
    if (kind == "noise") bytes = noise;
    if (kind == "junk") bytes = noise + bytes;
    if (kind == "lost") bytes.clear();
    return file.replace(at, count, bytes);
}

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
        // A truncated file decodes like the original, except near its end.
        const samples cut = read_all(save("cut", file.substr(0, at)));
        ASSERT_GT(cut.size(), whole.size() / 10);
        ASSERT_LT(cut.size(), whole.size() * 3 / 4);
        EXPECT_GE(count_equal_at_start(cut, whole) + kSlack, cut.size()) << "cut at " << at;
        for (const std::string kind : {"flips", "zeros", "noise", "junk", "lost"}) {
            SCOPED_TRACE(kind + " at " + std::to_string(at));
            const size_t count = 200 + random() % 750 * 4;
            const std::string changed = damage(file, kind, at, count, &random);
            ASSERT_TRUE(changed != file);
            const samples got = read_all(save("damaged", changed));
            EXPECT_GE(count_equal_at_start(got, whole) + kSlack, cut.size());
            const bool moved = kind == "junk" || kind == "lost";
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

}  // namespace
