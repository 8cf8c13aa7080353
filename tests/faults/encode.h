// Short files in every format, by the encoders that make the codec tests' fixtures.
#ifndef TAVO_TESTS_FAULTS_ENCODE_H
#define TAVO_TESTS_FAULTS_ENCODE_H

#include <gtest/gtest.h>

#include <cstdlib>
#include <map>
#include <string>

#include "tests/support/song.h"

namespace trial {

// Writes the song to path, in the format that the path's extension names. A missing encoder fails
// the test.
inline void encode(const support::song &song, const std::string &path) {
    static const std::map<std::string, std::string> encoders = {
        {"flac", "flac --totally-silent --lax -0 -f -o \"$out\" \"$in\""},
        {"ogg", "oggenc --quiet -q 1 -s 1 -o \"$out\" \"$in\""},
        {"mp3", "lame --quiet -b 64 \"$in\" \"$out\""},
        {"mp2", "ffmpeg $quiet -c:a mp2 -b:a 64k \"$out\""},
        {"aac", "ffmpeg $quiet -c:a aac -b:a 48k \"$out\""},
        {"m4a", "ffmpeg $quiet -c:a aac -b:a 48k -movflags +faststart \"$out\""},
    };
    const std::string kind = path.substr(path.rfind('.') + 1);
    const std::string wav = kind == "wav" ? path : path + ".wav";
    ASSERT_TRUE(support::write_wav(wav, song)) << path;
    if (kind == "wav") return;
    ASSERT_EQ(encoders.count(kind), 1U) << kind;
    const std::string command = "out='" + path + "'; in='" + wav +
                                "'; quiet=\"-nostdin -v error -y -i $in -fflags +bitexact "
                                "-flags:a +bitexact\"; " +
                                encoders.at(kind);
    ASSERT_EQ(system(command.c_str()), 0) << command;
    remove(wav.c_str());
}

}  // namespace trial

#endif
