#include "desktop/wexaaudio/shared/scan_cache.h"

#include <pthread.h>
#include <sys/stat.h>

#include <cstdlib>
#include <cstring>

namespace {

struct cached_scan {
    stream_info info;  // first: the address handed out is the record's
    stream_scan scan;
    mtsrc_file *(*open)(const mtsrc_io *io, int32_t mode);
    struct stat file;
    bool shared;  // file is known
    int32_t users;
    cached_scan *next;
};

pthread_mutex_t lock = PTHREAD_MUTEX_INITIALIZER;
cached_scan *scans;  // under lock, as are users and next of each

// False when the path does not tell what the callbacks read.
bool identify(const io_file *file, struct stat *known) {
    const char *path = file->io.path;
    return path != nullptr && strcmp(path, "fd") != 0 && stat(path, known) == 0 &&
           S_ISREG(known->st_mode) && known->st_size == file->size;
}

bool is_same(const cached_scan &a, const cached_scan &b) {
    return a.scan == b.scan && a.open == b.open && a.file.st_dev == b.file.st_dev &&
           a.file.st_ino == b.file.st_ino && a.file.st_size == b.file.st_size &&
           a.file.st_mtim.tv_sec == b.file.st_mtim.tv_sec &&
           a.file.st_mtim.tv_nsec == b.file.st_mtim.tv_nsec;
}

// One more user of a scan like wanted; null without one.
cached_scan *find(const cached_scan &wanted) {
    pthread_mutex_lock(&lock);
    cached_scan *c = scans;
    while (c != nullptr && !is_same(*c, wanted)) c = c->next;
    if (c != nullptr) ++c->users;
    pthread_mutex_unlock(&lock);
    return c;
}

}  // namespace

const stream_info *scan_cache_get(io_file *file, const codec_library *library, stream_scan scan) {
    auto *c = static_cast<cached_scan *>(calloc(1, sizeof(cached_scan)));
    if (c == nullptr) return nullptr;
    c->scan = scan;
    c->open = file->io.open;
    c->users = 1;
    c->shared = identify(file, &c->file);
    cached_scan *other = c->shared ? find(*c) : nullptr;
    if (other != nullptr) {
        free(c);
        return &other->info;
    }
    if (!scan(file, library, &c->info)) {
        scan_cache_put(&c->info);
        return nullptr;
    }
    if (c->shared) {
        pthread_mutex_lock(&lock);
        c->next = scans;
        scans = c;
        pthread_mutex_unlock(&lock);
    }
    return &c->info;
}

void scan_cache_put(const stream_info *info) {
    if (info == nullptr) return;
    auto *c = reinterpret_cast<cached_scan *>(const_cast<stream_info *>(info));
    pthread_mutex_lock(&lock);
    const bool unused = --c->users == 0;
    cached_scan **place = &scans;
    while (unused && *place != nullptr && *place != c) place = &(*place)->next;
    if (unused && *place == c) *place = c->next;
    pthread_mutex_unlock(&lock);
    if (!unused) return;
    stream_info_free(&c->info);
    free(c);
}
