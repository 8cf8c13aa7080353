// The song for the tests in this folder: 100 s at 120 BPM, loud from 41 s to 80 s.
#pragma once

#include <gtest/gtest.h>

#include <initializer_list>
#include <string>

#include "tests/support/bytes.h"
#include "tests/support/job_harness.h"
#include "tests/support/song.h"

constexpr std::initializer_list<int32_t> kModes = {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS,
                                                   TAVO_MODE_BOTH};

// A WAV file that is deleted when the program ends.
struct song_file : support::temporary_file {
    explicit song_file(const support::song &contents)
        : temporary_file("core_" + std::to_string(contents.pcm.size()) + ".wav"), song(contents) {
        EXPECT_TRUE(support::write_wav(path, song));
    }
    const support::song song;
};

inline const song_file &whole_song() {
    static const song_file whole(support::make_song({22050, 1, 100.0, 120.0, 1, 41.0, 80.0}));
    return whole;
}

// Creates an instance for the song in each mode and passes it to the test, which releases it.
template <typename action>
void for_each_mode(std::initializer_list<int32_t> modes, action test) {
    for (const int32_t mode : modes) {
        SCOPED_TRACE(mode);
        int32_t err = 99;
        TAVO_CTX *ctx = job::create(whole_song().path, mode, &err);
        EXPECT_EQ(err, 0);
        if (ctx != nullptr) test(mode, ctx);
    }
}
