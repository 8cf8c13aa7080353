#include "fuzz/memory_io.h"

#include <algorithm>

#include "fuzz/fuzz.h"

namespace fuzz {
namespace {

memory_file now;

struct handle {
    mtsrc_file file;
    int64_t at;
};

handle *of(mtsrc_file *file) {
    must(file != nullptr, "a callback gets its handle");
    return reinterpret_cast<handle *>(file);
}

bool fails() {
    return ++now.calls == now.fail_at;
}

int64_t length() {
    return now.bytes + now.gap;
}

mtsrc_file *open_file(const mtsrc_io * /*io*/, int32_t mode) {
    must(mode == 0, "a file is opened for reading");
    if (fails()) return nullptr;
    auto *made = static_cast<handle *>(calloc(1, sizeof(handle)));
    made->file.fd = -1;
    ++now.open;
    return &made->file;
}

int32_t close_file(mtsrc_file *file) {
    free(of(file));
    --now.open;
    return 0;
}

int64_t read_file(mtsrc_file *file, void *buf, int32_t count) {
    must(count >= 0, "a read asks for bytes");
    if (fails()) return -1;
    handle *h = of(file);
    auto *to = static_cast<uint8_t *>(buf);
    const int64_t end = std::min(length(), h->at + count);
    const int64_t start = h->at;
    while (h->at < end) {
        const bool before = h->at < now.gap_at;
        const bool inside = !before && h->at < now.gap_at + now.gap;
        const int64_t stop = before ? now.gap_at : inside ? now.gap_at + now.gap : length();
        const int64_t piece = std::min(stop, end) - h->at;
        if (inside) {
            memset(to, 0, static_cast<size_t>(piece));
        } else {
            memcpy(to, now.data + (before ? h->at : h->at - now.gap), static_cast<size_t>(piece));
        }
        to += piece;
        h->at += piece;
    }
    return end > start ? end - start : 0;
}

int64_t write_file(mtsrc_file * /*file*/, const void * /*buf*/, int32_t /*count*/) {
    must(false, "nothing is written to a song");
    return -1;
}

int32_t tell_file(mtsrc_file *file, int64_t *offset) {
    if (fails()) return -1;
    *offset = of(file)->at;
    return 0;
}

int32_t seek_file(mtsrc_file *file, const int64_t *offset) {
    if (fails() || *offset < 0) return -1;
    of(file)->at = *offset;
    return 0;
}

int32_t skip_file(mtsrc_file *file, const int64_t *distance) {
    handle *h = of(file);
    if (fails() || *distance < 1 || *distance > INT64_MAX - h->at) return -1;
    h->at += *distance;
    return 0;
}

int32_t size_file(mtsrc_file *file, int64_t *bytes) {
    of(file);
    if (fails()) return -1;
    *bytes = length();
    return 0;
}

}  // namespace

memory_file *set_memory_file(const uint8_t *data, size_t bytes) {
    must(now.open == 0, "every file that was opened is closed");
    now = {};
    now.data = data;
    now.bytes = static_cast<int64_t>(bytes);
    now.gap_at = now.bytes;
    return &now;
}

mtsrc_io memory_io() {
    mtsrc_io io = {};
    io.open = open_file;
    io.close = close_file;
    io.read = read_file;
    io.write = write_file;
    io.tell = tell_file;
    io.seek = seek_file;
    io.skip = skip_file;
    io.size = size_file;
    return io;
}

}  // namespace fuzz
