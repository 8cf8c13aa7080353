// Contents of files, and a file without a name that has them.
#ifndef TAVO_TESTS_MEDIA_SOURCE_MEMORY_FILE_H
#define TAVO_TESTS_MEDIA_SOURCE_MEMORY_FILE_H

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "media_source/mtsrc.h"

using byte_run = std::vector<uint8_t>;

inline byte_run text(const std::string &what) {
    return byte_run(what.begin(), what.end());
}

inline byte_run operator+(byte_run left, const byte_run &right) {
    for (const uint8_t byte : right) left.push_back(byte);
    return left;
}

inline byte_run zeros(size_t count) {
    return byte_run(count, 0);
}

// A tag of version 2.3 with a body of so many zero bytes.
inline byte_run id3(int32_t body) {
    const auto seven = [body](int shift) { return static_cast<uint8_t>(body >> shift & 0x7F); };
    return text("ID3") + byte_run{3, 0, 0, seven(21), seven(14), seven(7), seven(0)} +
           zeros(static_cast<size_t>(body));
}

// Two Layer III frame headers at 128 kbit/s and 44,100 Hz, one frame length of 417 bytes apart.
inline byte_run layer3_pair() {
    return byte_run{0xFF, 0xFB, 0x90, 0} + zeros(413) + byte_run{0xFF, 0xFB, 0x90, 0};
}

// Opened at an offset.
struct memory_file {
    FILE *stream = tmpfile();
    mtsrc_file file = {fileno(stream)};

    explicit memory_file(const byte_run &content, int64_t offset = 0) {
        fwrite(content.data(), 1, content.size(), stream);
        fflush(stream);
        mtsrc_file_seek(&file, &offset);
    }
    ~memory_file() { fclose(stream); }
    int64_t at() {
        int64_t offset = -1;
        EXPECT_EQ(mtsrc_file_tell(&file, &offset), 0);
        return offset;
    }
};

// Only what probes may use.
inline mtsrc_io probe_io() {
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.open = nullptr;
    io.close = nullptr;
    io.write = nullptr;
    io.size = nullptr;
    return io;
}

#endif
