// A callback record over an input in memory: no file system, no descriptors.
#ifndef TAVO_FUZZ_MEMORY_IO_H
#define TAVO_FUZZ_MEMORY_IO_H

#include "fuzz/fuzz.h"
#include "media_source/mtsrc_io.h"

namespace fuzz {

// The one file that memory_io opens.
struct memory_file {
    std::vector<uint8_t> bytes;
    int64_t fail_at;  // number of the call, from 1, that fails; 0: none
    int64_t calls;
    int64_t open;  // handles
};
inline memory_file file;

struct memory_handle {
    mtsrc_file base;
    int64_t at;
};

inline memory_handle *handle_of(mtsrc_file *of) {
    must(of != nullptr, "a callback gets its handle");
    return reinterpret_cast<memory_handle *>(of);
}

inline bool call_fails() {
    return ++file.calls == file.fail_at;
}

inline mtsrc_io memory_io() {
    mtsrc_io io = {};
    io.open = [](const mtsrc_io *, int32_t mode) -> mtsrc_file * {
        must(mode == 0, "a file is opened for reading");
        if (call_fails()) return nullptr;
        ++file.open;
        return &(new memory_handle{{-1}, 0})->base;
    };
    io.close = [](mtsrc_file *of) {
        delete handle_of(of);
        --file.open;
        return 0;
    };
    io.read = [](mtsrc_file *of, void *buf, int32_t count) -> int64_t {
        must(count >= 0, "a read asks for bytes");
        if (call_fails()) return -1;
        memory_handle *handle = handle_of(of);
        const int64_t left =
            std::max<int64_t>(static_cast<int64_t>(file.bytes.size()) - handle->at, 0);
        const int64_t got = std::min<int64_t>(count, left);
        if (got > 0) memcpy(buf, file.bytes.data() + handle->at, static_cast<size_t>(got));
        handle->at += got;
        return got;
    };
    io.write = [](mtsrc_file *, const void *, int32_t) -> int64_t {
        must(false, "nothing is written to a song");
        return -1;
    };
    io.tell = [](mtsrc_file *of, int64_t *offset) {
        if (call_fails()) return -1;
        *offset = handle_of(of)->at;
        return 0;
    };
    io.seek = [](mtsrc_file *of, const int64_t *offset) {
        if (call_fails() || *offset < 0) return -1;
        handle_of(of)->at = *offset;
        return 0;
    };
    io.skip = [](mtsrc_file *of, const int64_t *distance) {
        memory_handle *handle = handle_of(of);
        if (call_fails() || *distance < 1 || *distance > INT64_MAX - handle->at) return -1;
        handle->at += *distance;
        return 0;
    };
    io.size = [](mtsrc_file *of, int64_t *bytes) {
        handle_of(of);
        if (call_fails()) return -1;
        *bytes = static_cast<int64_t>(file.bytes.size());
        return 0;
    };
    return io;
}

}  // namespace fuzz

#endif
