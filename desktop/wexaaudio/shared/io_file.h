// File access for the readers. Each reader opens its own handle through the source's callbacks and
// reads at any offset through one buffer. Offsets and sizes are 64-bit.
//
// Input: mtsrc_io. Output: bytes at an offset. A file is used by one thread at a time.
#pragma once

#include "media_source/mtsrc_io.h"

constexpr int32_t kIoBlock = 65536;         // bytes read ahead
constexpr int32_t kMaxLook = kIoBlock / 2;  // bytes that io_file_peek can guarantee

struct io_file {
    mtsrc_io io;        // a copy so that deleting a reader does not need the caller's record
    mtsrc_file *file;   // owned
    int64_t size;       // bytes, when the file was opened
    int64_t at;         // offset of the handle, or -1 if unknown
    uint8_t *block;     // [kIoBlock] owned
    int64_t block_at;   // offset of block[0]
    int32_t block_got;  // bytes in the block
    bool failed;        // a read or seek has failed
};

// Opens the file read-only. On failure returns false and owns nothing. *f may be uninitialised.
bool io_file_open(io_file *f, const mtsrc_io *io);

// Releases what *f owns. Does nothing for a zeroed or closed record.
void io_file_close(io_file *f);

// Copies up to `count` bytes at `offset`. Returns the number of bytes copied, or -1 on a read
// error. Copies fewer bytes only at the end of the file. Large copies bypass the buffer.
int64_t io_file_read(io_file *f, int64_t offset, void *buf, int64_t count);

// Returns the buffered bytes at `offset`, valid until the next call, and stores their count in
// *got. There are at least `want` bytes unless the file ends first; `want` must not exceed
// kMaxLook. Returns null outside the file and on a read error, which also sets `failed`.
const uint8_t *io_file_peek(io_file *f, int64_t offset, int32_t want, int32_t *got);

// Returns `count` bytes at `offset` as io_file_peek does, or null if the file has fewer.
const uint8_t *io_file_bytes(io_file *f, int64_t offset, int32_t count);
