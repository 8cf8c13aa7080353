#include "media_source/mtsrc_io.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace {

constexpr int32_t kModeReadWrite = 1;
constexpr mode_t kPermissions = 0644;
constexpr int32_t kFailed = -1;

int open_path(const char *path, int32_t mode) {
    const int flags = (mode & kModeReadWrite) != 0 ? O_RDWR | O_CREAT : O_RDONLY;
    int fd;
    do {
        fd = open(path, flags | O_LARGEFILE | O_CLOEXEC, kPermissions);
    } while (fd < 0 && errno == EINTR);
    return fd;
}

bool is_usable(const mtsrc_file *file) {
    return file != nullptr && file->fd >= 0;
}

}  // namespace

mtsrc_file *mtsrc_file_open(const mtsrc_io *io, int32_t mode) {
    if (io == nullptr || io->path == nullptr) return nullptr;
    auto *file = static_cast<mtsrc_file *>(malloc(sizeof(mtsrc_file)));
    if (file == nullptr) return nullptr;
    file->fd = strcmp(io->path, "fd") == 0 ? dup(io->fd) : open_path(io->path, mode);
    if (file->fd < 0) {
        free(file);
        return nullptr;
    }
    // A duplicated descriptor starts at the original's offset, which may not be 0. On a pipe this
    // call fails, and recognition then fails too.
    lseek64(file->fd, 0, SEEK_SET);
    return file;
}

int32_t mtsrc_file_close(mtsrc_file *file) {
    if (file == nullptr) return kFailed;
    // Not repeated after EINTR, because even then the descriptor is closed.
    const int result = file->fd == -1 ? 0 : close(file->fd);
    free(file);
    return result == 0 ? 0 : kFailed;
}

int64_t mtsrc_file_read(mtsrc_file *file, void *buf, int32_t count) {
    if (!is_usable(file) || count < 0) return kFailed;
    ssize_t got;
    do {
        got = read(file->fd, buf, static_cast<size_t>(count));
    } while (got < 0 && errno == EINTR);
    return got;
}

int64_t mtsrc_file_write(mtsrc_file *file, const void *buf, int32_t count) {
    if (!is_usable(file) || count < 0) return kFailed;
    ssize_t written;
    do {
        written = write(file->fd, buf, static_cast<size_t>(count));
    } while (written < 0 && errno == EINTR);
    return written;
}

int32_t mtsrc_file_tell(mtsrc_file *file, int64_t *offset) {
    if (!is_usable(file) || offset == nullptr) return kFailed;
    const int64_t current = lseek64(file->fd, 0, SEEK_CUR);
    if (current < 0) return kFailed;
    *offset = current;
    return 0;
}

int32_t mtsrc_file_seek(mtsrc_file *file, const int64_t *offset) {
    if (!is_usable(file) || offset == nullptr) return kFailed;
    return lseek64(file->fd, *offset, SEEK_SET) < 0 ? kFailed : 0;
}

int32_t mtsrc_file_skip(mtsrc_file *file, const int64_t *distance) {
    if (!is_usable(file) || distance == nullptr || *distance < 1) return kFailed;
    return lseek64(file->fd, *distance, SEEK_CUR) < 0 ? kFailed : 0;
}

int32_t mtsrc_file_size(mtsrc_file *file, int64_t *length) {
    int64_t current = 0;
    if (length == nullptr || mtsrc_file_tell(file, &current) != 0) return kFailed;
    const int64_t end = lseek64(file->fd, 0, SEEK_END);
    if (mtsrc_file_seek(file, &current) != 0 || end < 0) return kFailed;
    *length = end;
    return 0;
}
