// Makes calls to memory, thread, lock and file functions fail, on any thread. The program must link
// the library's objects, because the linker cannot replace the calls in libtavo.so.
#pragma once

#include <atomic>
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
    kClose = 1 << 10,  // the file is closed although the call fails
    kFopen = 1 << 11,
    kFwrite = 1 << 12,
};

struct plan {
    uint32_t calls = kNothing;    // functions whose calls are counted and may fail
    int64_t index = INT64_MAX;    // index of the failing call among those of all threads
    bool forever = false;         // all later calls fail too
    int error = EIO;              // errno of a failed file function
    void (*on_call)() = nullptr;  // called before each counted call
};

// Starts counting calls and making them fail as planned. No library thread may be running.
void arm(const plan &next);
inline void disarm() {
    arm({});
}

inline std::atomic<int64_t> counted_calls, failed_calls;  // since arm

}  // namespace fault
