#include "desktop/wexaaudio/shared/scan_cache.h"

#include <sys/stat.h>

#include <cstdlib>
#include <cstring>
#include <ctime>
#include <mutex>

namespace {

// Two changes in quick succession may get the same change time; changes this far apart cannot.
constexpr time_t kSettled = 2;  // seconds

struct cached_scan : stream_info {
    scan_function scan;
    mtsrc_file *(*open)(const mtsrc_io *io, int32_t mode);
    struct stat file;
    bool shared;  // `file` is valid, so other readers may use the scan
    int32_t users;
    cached_scan *next;
};

std::mutex lock;
cached_scan *scans;  // guarded by lock, as are `users` and `next` of each scan

// Returns false if the path does not identify the file that the callbacks read.
bool identify(const io_file *file, struct stat *known) {
    const char *path = file->io.path;
    return path != nullptr && strcmp(path, "fd") != 0 && stat(path, known) == 0 &&
           S_ISREG(known->st_mode) && known->st_size == file->size;
}

bool is_same(const cached_scan &a, const cached_scan &b) {
    return a.scan == b.scan && a.open == b.open && a.file.st_dev == b.file.st_dev &&
           a.file.st_ino == b.file.st_ino && a.file.st_size == b.file.st_size &&
           a.file.st_ctim.tv_sec == b.file.st_ctim.tv_sec &&
           a.file.st_ctim.tv_nsec == b.file.st_ctim.tv_nsec;
}

// Returns the cached scan of the same file and increments its use count, or returns null.
cached_scan *find(const cached_scan &wanted) {
    const std::lock_guard<std::mutex> guard(lock);
    cached_scan *c = scans;
    while (c != nullptr && !is_same(*c, wanted)) c = c->next;
    if (c != nullptr) ++c->users;
    return c;
}

void release(cached_scan *c) {
    free(c->frames.entry);
    free(c->pages.entry);
    free(c->setup);
    free(c);
}

}  // namespace

const stream_info *scan_cache_get(io_file *file, scan_function scan) {
    auto *c = static_cast<cached_scan *>(calloc(1, sizeof(cached_scan)));
    if (c == nullptr) return nullptr;
    c->scan = scan;
    c->open = file->io.open;
    c->users = 1;
    c->shared = identify(file, &c->file);
    cached_scan *other = c->shared ? find(*c) : nullptr;
    if (other != nullptr || !scan(file, c)) {
        release(c);
        return other;
    }
    if (c->shared) {
        const std::lock_guard<std::mutex> guard(lock);
        c->next = scans;
        scans = c;
    }
    return c;
}

void scan_cache_put(const stream_info *info) {
    if (info == nullptr) return;
    auto *c = static_cast<cached_scan *>(const_cast<stream_info *>(info));
    if (!c->shared) return release(c);
    const bool settled = time(nullptr) > c->file.st_ctim.tv_sec + kSettled;
    const std::lock_guard<std::mutex> guard(lock);
    --c->users;
    for (cached_scan **link = &scans; *link != nullptr;) {
        cached_scan *each = *link;
        if (each->users > 0 || (each == c && settled)) {
            link = &each->next;
        } else {
            *link = each->next;
            release(each);
        }
    }
}
