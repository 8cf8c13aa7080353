#include "desktop/wexaaudio/shared/io_file.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

namespace {

// Reads up to `count` bytes at `offset` through the callbacks. Returns the number read, or -1.
int64_t read_raw(io_file *f, int64_t offset, uint8_t *buf, int64_t count) {
    if (f->at != offset) {
        f->at = f->io.seek(f->file, &offset) == 0 ? offset : -1;
        if (f->at < 0) return -1;
    }
    int64_t done = 0;
    while (done < count) {
        const int64_t part = std::min<int64_t>(count - done, 1 << 30);
        const int64_t got = f->io.read(f->file, buf + done, static_cast<int32_t>(part));
        if (got < 0 || got > part) {
            f->at = -1;
            return -1;
        }
        if (got == 0) break;
        done += got;
        f->at += got;
    }
    return done;
}

// Refills the block so that it starts at `offset`. Reuses the bytes that are already in it.
bool fill_block(io_file *f, int64_t offset) {
    const int64_t block_end = f->block_at + f->block_got;
    int32_t keep = 0;
    if (offset >= f->block_at && offset < block_end) {
        keep = static_cast<int32_t>(block_end - offset);
        memmove(f->block, f->block + (offset - f->block_at), static_cast<size_t>(keep));
    }
    f->block_at = offset;
    const int64_t more = read_raw(f, offset + keep, f->block + keep, kIoBlock - keep);
    f->failed = f->failed || more < 0;
    f->block_got = more < 0 ? 0 : keep + static_cast<int32_t>(more);
    return more >= 0;
}

}  // namespace

bool io_file_open(io_file *f, const mtsrc_io *io) {
    *f = {};
    if (io == nullptr || io->open == nullptr || io->close == nullptr || io->read == nullptr ||
        io->seek == nullptr || io->size == nullptr) {
        return false;
    }
    f->io = *io;
    f->block = static_cast<uint8_t *>(malloc(kIoBlock));
    f->file = f->block != nullptr ? io->open(io, 0) : nullptr;
    if (f->file != nullptr && f->io.size(f->file, &f->size) == 0 && f->size >= 0) return true;
    io_file_close(f);
    return false;
}

void io_file_close(io_file *f) {
    if (f->file != nullptr) f->io.close(f->file);
    free(f->block);
    *f = {};
}

const uint8_t *io_file_peek(io_file *f, int64_t offset, int32_t want, int32_t *got) {
    *got = 0;
    if (offset < 0 || offset >= f->size || want > kMaxLook) return nullptr;
    const int64_t want_end = std::min(offset + std::max(want, 1), f->size);
    const bool buffered = offset >= f->block_at && want_end <= f->block_at + f->block_got;
    if (!buffered && !fill_block(f, offset)) return nullptr;
    *got = static_cast<int32_t>(f->block_at + f->block_got - offset);
    return *got > 0 ? f->block + (offset - f->block_at) : nullptr;
}

const uint8_t *io_file_bytes(io_file *f, int64_t offset, int32_t count) {
    int32_t got = 0;
    const uint8_t *p = io_file_peek(f, offset, count, &got);
    return got >= count ? p : nullptr;
}

int64_t io_file_read(io_file *f, int64_t offset, void *buf, int64_t count) {
    if (offset < 0 || count < 0) return -1;
    if (count > kMaxLook) {
        const int64_t got = read_raw(f, offset, static_cast<uint8_t *>(buf), count);
        f->failed = f->failed || got < 0;
        return got;
    }
    int32_t available = 0;
    const uint8_t *at = io_file_peek(f, offset, static_cast<int32_t>(count), &available);
    if (at == nullptr) return f->failed ? -1 : 0;
    const int64_t copied = std::min<int64_t>(count, available);
    memcpy(buf, at, static_cast<size_t>(copied));
    return copied;
}
