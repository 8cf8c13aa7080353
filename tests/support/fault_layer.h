// Calls of memory, threads, locks and files that fail by plan. A program is linked with --wrap for
// them and with the library's objects: only calls of our own objects are caught, on every thread.
#ifndef TAVO_TESTS_SUPPORT_FAULT_LAYER_H
#define TAVO_TESTS_SUPPORT_FAULT_LAYER_H

#include <cerrno>
#include <cstdint>

namespace fault {

enum call : uint32_t {
    kNothing = 0,
    kMalloc = 1 << 0,
    kCalloc = 1 << 1,
    kRealloc = 1 << 2,
    kMemory = kMalloc | kCalloc | kRealloc,
    kThread = 1 << 3,
    kMutex = 1 << 4,
    kCondition = 1 << 5,
    kOpen = 1 << 6,
    kDup = 1 << 7,
    kRead = 1 << 8,
    kSeek = 1 << 9,
    kClose = 1 << 10,  // closes and then fails
    kFopen = 1 << 11,
    kFwrite = 1 << 12,
};

struct plan {
    uint32_t calls = kNothing;  // those that are counted and fail
    int64_t place = INT64_MAX;  // the one that fails, from 0, all threads counted together
    bool forever = false;       // and all later ones
    int error = EIO;            // errno of a failed file call
    void (*watch)() = nullptr;  // runs at the start of each, failed or not
    // Runs before each thread's start with what it is to run.
    void (*thread_watch)(void *(*entry)(void *), void *record) = nullptr;
};

// From now on by this plan. No other thread of the library may run.
void arm(const plan &next);
inline void disarm() {
    arm({});
}

int64_t met();      // calls of the plan, since arm
int64_t refused();  // of them, those that failed

}  // namespace fault

#endif
