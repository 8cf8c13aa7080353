/// @file
/// File access for stage 1. The format probes and the codec library access the file only through
/// the callbacks in mtsrc_io. The codec library is a separate binary, so the layout of mtsrc_io is
/// fixed.
#pragma once

#include <cstddef>
#include <cstdint>

struct mtsrc_io;

/// An open file. mtsrc_io.open allocates it, and mtsrc_io.close frees it.
struct mtsrc_file {
    int32_t fd;  ///< -1 if not open
};

/// The callbacks and their arguments.
struct mtsrc_io {
    mtsrc_file *(*open)(const mtsrc_io *io, int32_t mode);        ///< bit 0 of mode: read-write
    int32_t (*close)(mtsrc_file *file);                           ///< 0 or -1
    int64_t (*read)(mtsrc_file *file, void *buf, int32_t count);  ///< bytes; 0 at the end; or -1
    int64_t (*write)(mtsrc_file *file, const void *buf, int32_t count);  ///< bytes or -1
    int32_t (*tell)(mtsrc_file *file, int64_t *offset);                  ///< 0 or -1
    int32_t (*seek)(mtsrc_file *file, const int64_t *offset);            ///< absolute; 0 or -1
    int32_t (*skip)(mtsrc_file *file, const int64_t *distance);          ///< forward, >= 1; 0 or -1
    int32_t (*size)(mtsrc_file *file, int64_t *length);  ///< keeps the offset; 0 or -1
    uint64_t reserved_64;                                ///< 0
    int32_t fd;               ///< descriptor to duplicate when path is "fd"
    int32_t reserved_76;      ///< 0
    uint64_t reserved_80;     ///< 0
    char *path;               ///< the source's own copy, a 512-byte buffer
    uint64_t reserved_96[3];  ///< 0
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(mtsrc_io, size) == 56 && offsetof(mtsrc_io, fd) == 72));
static_assert(sizeof(void *) != 8 || (offsetof(mtsrc_io, path) == 88 && sizeof(mtsrc_io) == 120));

extern "C" {

/// Opens io->path, or duplicates io->fd if the path is "fd", and moves to offset 0. Returns a new
/// handle, or null on failure. If bit 0 of `mode` is set, the file is opened for reading and
/// writing, and created with permissions 0644 if it does not exist. Otherwise it is read-only.
mtsrc_file *mtsrc_file_open(const mtsrc_io *io, int32_t mode);

/// Callbacks for files that mtsrc_file_open opened; mtsrc_io describes what they return. A read or
/// write makes one system call, repeated only if a signal interrupts it, so it may transfer fewer
/// than `count` bytes.
/// @{
int32_t mtsrc_file_close(mtsrc_file *file);
int64_t mtsrc_file_read(mtsrc_file *file, void *buf, int32_t count);
int64_t mtsrc_file_write(mtsrc_file *file, const void *buf, int32_t count);
int32_t mtsrc_file_tell(mtsrc_file *file, int64_t *offset);
int32_t mtsrc_file_seek(mtsrc_file *file, const int64_t *offset);
int32_t mtsrc_file_skip(mtsrc_file *file, const int64_t *distance);
int32_t mtsrc_file_size(mtsrc_file *file, int64_t *length);
/// @}
}

/// Sets the eight callbacks of *io to the functions above. Leaves its other fields unchanged.
inline void mtsrc_file_callbacks(mtsrc_io *io) {
    io->open = mtsrc_file_open;
    io->close = mtsrc_file_close;
    io->read = mtsrc_file_read;
    io->write = mtsrc_file_write;
    io->tell = mtsrc_file_tell;
    io->seek = mtsrc_file_seek;
    io->skip = mtsrc_file_skip;
    io->size = mtsrc_file_size;
}
