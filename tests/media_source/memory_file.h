// A file in memory behind a callback record that has nothing but what probes may use.
#ifndef TAVO_TESTS_MEDIA_SOURCE_MEMORY_FILE_H
#define TAVO_TESTS_MEDIA_SOURCE_MEMORY_FILE_H

#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "media_source/mtsrc.h"

using byte_run = std::vector<uint8_t>;

struct memory_file {
    mtsrc_file file = {-1};
    byte_run bytes = {};
    int64_t at = 0;
};

inline memory_file *behind(mtsrc_file *file) {
    return reinterpret_cast<memory_file *>(file);
}

inline mtsrc_io memory_io() {
    mtsrc_io io = {};
    io.read = [](mtsrc_file *file, void *buf, int32_t count) -> int64_t {
        memory_file *of = behind(file);
        const int64_t left = static_cast<int64_t>(of->bytes.size()) - of->at;
        const int64_t got = std::clamp<int64_t>(left, 0, count);
        std::copy_n(of->bytes.data() + (got ? of->at : 0), got, static_cast<uint8_t *>(buf));
        of->at += got;
        return got;
    };
    io.tell = [](mtsrc_file *file, int64_t *offset) {
        *offset = behind(file)->at;
        return 0;
    };
    io.seek = [](mtsrc_file *file, const int64_t *offset) {
        behind(file)->at = *offset;
        return 0;
    };
    io.skip = [](mtsrc_file *file, const int64_t *distance) {
        behind(file)->at += *distance;
        return *distance < 1 ? -1 : 0;
    };
    return io;
}

inline byte_run text(const std::string &what) {
    return byte_run(what.begin(), what.end());
}

inline byte_run operator+(byte_run left, const byte_run &right) {
    left.insert(left.end(), right.begin(), right.end());
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

#endif
