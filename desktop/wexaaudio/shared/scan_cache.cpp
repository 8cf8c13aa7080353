#include "desktop/wexaaudio/shared/scan_cache.h"

#include <pthread.h>
#include <sys/stat.h>

#include <cstdlib>
#include <cstring>
#include <ctime>

namespace {

// A change within a tick of the file system's clock leaves the time of change as it is.
constexpr time_t kSettled = 2;  // seconds

struct alignas(max_align_t) cached_scan {  // its result follows
    const scan_kind *kind;
    mtsrc_file *(*open)(const mtsrc_io *io, int32_t mode);
    struct stat file;
    bool shared;  // file is known
    int32_t users;
    cached_scan *next;
};

pthread_mutex_t lock = PTHREAD_MUTEX_INITIALIZER;
cached_scan *scans;  // under lock, as are users and next of each

// False when the path does not identify what the callbacks read.
bool identify(const io_file *file, struct stat *known) {
    const char *path = file->io.path;
    return path != nullptr && strcmp(path, "fd") != 0 && stat(path, known) == 0 &&
           S_ISREG(known->st_mode) && known->st_size == file->size;
}

bool is_same(const cached_scan &a, const cached_scan &b) {
    return a.kind == b.kind && a.open == b.open && a.file.st_dev == b.file.st_dev &&
           a.file.st_ino == b.file.st_ino && a.file.st_size == b.file.st_size &&
           a.file.st_ctim.tv_sec == b.file.st_ctim.tv_sec &&
           a.file.st_ctim.tv_nsec == b.file.st_ctim.tv_nsec;
}

// Finds a scan like wanted and adds a user to it; null without one.
cached_scan *find(const cached_scan &wanted) {
    pthread_mutex_lock(&lock);
    cached_scan *c = scans;
    while (c != nullptr && !is_same(*c, wanted)) c = c->next;
    if (c != nullptr) ++c->users;
    pthread_mutex_unlock(&lock);
    return c;
}

void release(cached_scan *c) {
    if (c->kind->release != nullptr) c->kind->release(c + 1);
    free(c);
}

// Removes the scans without users, except kept, from the list. Returns them as a list of their own.
cached_scan *remove_unused(const cached_scan *kept) {
    cached_scan *unused = nullptr;
    for (cached_scan **link = &scans; *link != nullptr;) {
        cached_scan *c = *link;
        if (c->users > 0 || c == kept) {
            link = &c->next;
            continue;
        }
        *link = c->next;
        c->next = unused;
        unused = c;
    }
    return unused;
}

}  // namespace

const void *scan_cache_get(io_file *file, const scan_kind *kind) {
    auto *c = static_cast<cached_scan *>(calloc(1, sizeof(cached_scan) + kind->bytes));
    if (c == nullptr) return nullptr;
    c->kind = kind;
    c->open = file->io.open;
    c->users = 1;
    c->shared = identify(file, &c->file);
    cached_scan *other = c->shared ? find(*c) : nullptr;
    if (other != nullptr) {
        free(c);
        return other + 1;
    }
    if (!kind->scan(file, c + 1)) {
        release(c);
        return nullptr;
    }
    if (c->shared) {
        pthread_mutex_lock(&lock);
        c->next = scans;
        scans = c;
        pthread_mutex_unlock(&lock);
    }
    return c + 1;
}

void scan_cache_put(const void *result) {
    if (result == nullptr) return;
    auto *c = static_cast<cached_scan *>(const_cast<void *>(result)) - 1;
    if (!c->shared) return release(c);
    const bool settled = time(nullptr) > c->file.st_ctim.tv_sec + kSettled;
    pthread_mutex_lock(&lock);
    --c->users;
    cached_scan *unused = remove_unused(settled ? c : nullptr);
    pthread_mutex_unlock(&lock);
    while (unused != nullptr) {
        cached_scan *next = unused->next;
        release(unused);
        unused = next;
    }
}
