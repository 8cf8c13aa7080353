// The song of the tests of this folder: 100 s at 120 BPM, loud from 41 s to 80 s.
#ifndef TAVO_TESTS_CORE_CORE_SONG_H
#define TAVO_TESTS_CORE_CORE_SONG_H

#include <gtest/gtest.h>
#include <unistd.h>

#include <string>

#include "tests/support/song.h"

namespace core_song {

inline const support::song &samples() {
    static const support::song song = [] {
        support::song_spec plan;
        plan.rate = 22050;
        plan.channels = 1;
        plan.seconds = 100.0;
        plan.loud_at = 41.0;
        plan.tail_at = 80.0;
        return support::make_song(plan);
    }();
    return song;
}

// A WAV file for as long as the program runs.
struct file {
    explicit file(const support::song &song)
        : path(testing::TempDir() + "tavo_core_" + std::to_string(getpid()) + "_" +
               std::to_string(song.pcm.size()) + ".wav") {
        EXPECT_TRUE(support::write_wav(path, song));
    }
    ~file() { unlink(path.c_str()); }
    file(const file &) = delete;
    file &operator=(const file &) = delete;

    const std::string path;
};

inline const std::string &path() {
    static const file whole(samples());
    return whole.path;
}

}  // namespace core_song

#endif
