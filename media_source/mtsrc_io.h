/// @file
/// File access of stage 1: callbacks that a media source passes to the format probes and to the
/// codec library, which opens and reads the file through them. Another binary reads this record, so
/// its layout is fixed.
#ifndef TAVO_MEDIA_SOURCE_MTSRC_IO_H
#define TAVO_MEDIA_SOURCE_MTSRC_IO_H

#include <cstddef>
#include <cstdint>

struct mtsrc_io;

/// An open file. open allocates it, close frees it.
struct mtsrc_file {
    int32_t fd;  ///< -1 if not open
};

/// The callbacks and their arguments.
struct mtsrc_io {
    mtsrc_file *(*open)(const mtsrc_io *io, int32_t mode);        ///< bit 0 of mode: read-write
    int32_t (*close)(mtsrc_file *file);                           ///< 0 or -1
    int64_t (*read)(mtsrc_file *file, void *buf, int32_t count);  ///< bytes read, 0 end, -1
    int64_t (*write)(mtsrc_file *file, const void *buf, int32_t count);  ///< bytes written, -1
    int32_t (*tell)(mtsrc_file *file, int64_t *offset);                  ///< 0 or -1
    int32_t (*seek)(mtsrc_file *file, const int64_t *offset);            ///< absolute; 0 or -1
    int32_t (*skip)(mtsrc_file *file, const int64_t *distance);          ///< forward, >= 1; 0 or -1
    int32_t (*size)(mtsrc_file *file, int64_t *length);  ///< offset unchanged; 0 or -1
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

/// Opens io->path (or duplicates io->fd if the path is "fd") at offset 0. Returns a new handle, or
/// null on failure. mode bit 0: 0 read-only, 1 read-write, created with permissions 0644.
mtsrc_file *mtsrc_file_open(const mtsrc_io *io, int32_t mode);

/// Callbacks for files of mtsrc_file_open; see the field of the same name in mtsrc_io. A read or
/// write is one system call, repeated only if a signal interrupts it. It may transfer fewer bytes
/// than count.
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

#endif
