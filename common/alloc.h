// Checks sizes for overflow and allocates memory, for the whole library.
//
// Sizes are computed from durations and rates that files state. They are therefore 64-bit and
// checked for overflow.
#pragma once

#include <cstdlib>

#include "common/tavo_ctx.h"

constexpr int64_t kBytesPerSample = 2;  // 16-bit mono

// Sets *result to value * factor / divisor. Returns false if `value` or `factor` is negative,
// `divisor` is less than 1 or the product overflows.
inline bool scale_size(int64_t value, int64_t factor, int64_t divisor, int64_t *result) {
    int64_t product = 0;
    if (value < 0 || factor < 0 || divisor < 1) return false;
    if (__builtin_mul_overflow(value, factor, &product)) return false;
    *result = product / divisor;
    return true;
}

// Computes the size in bytes of PCM that lasts `units` (100 ns each) at `rate` (Hz). The division
// is the last step, so the size may be odd. Returns false in the same cases as scale_size.
inline bool span_bytes(int64_t units, int32_t rate, int64_t *bytes) {
    return scale_size(units, rate * kBytesPerSample, kUnitsPerSecond, bytes);
}

// Computes the size in bytes of `count` items of `size` bytes, followed by `extra` bytes. Returns
// false if `count` or `size` is negative or the result overflows.
inline bool array_bytes(int64_t count, int64_t size, int64_t extra, int64_t *bytes) {
    return scale_size(count, size, 1, bytes) && !__builtin_add_overflow(*bytes, extra, bytes);
}

// Allocates zeroed memory for `count` items, at least one. The caller frees it. Returns null if
// memory runs out or the size exceeds size_t.
template <typename T>
T *zeroed_items(int64_t count) {
    const uint64_t items = count > 0 ? static_cast<uint64_t>(count) : 1;
    if (items > SIZE_MAX / sizeof(T)) return nullptr;
    return static_cast<T *>(calloc(static_cast<size_t>(items), sizeof(T)));
}

// is_incomplete returns true if a failed read or allocation made a job skip part of the audio or of
// the search. tavo_decode_init clears the mark. The mark is process-wide, because only one instance
// may exist.
bool is_incomplete();
void mark_incomplete();
void clear_incomplete();

// Marks the job incomplete if `memory` is null. Returns `memory`.
inline void *note_shortage(void *memory) {
    if (memory == nullptr) mark_incomplete();
    return memory;
}

constexpr int64_t kLargeBytes = 4 << 20;  // the functions below pay off from this size on

// Asks for huge pages for a large buffer, which must not have been filled yet. A single page fault
// then replaces 512 faults, in a fifth of their total time. The system may ignore the request.
void advise_huge_pages(void *buffer, int64_t bytes);

// Allocates at least one byte of uninitialised memory. The caller frees it. A large buffer starts
// on a huge-page boundary so that the allocator's header does not split the first huge page.
// Returns null if memory runs out.
uint8_t *allocate_buffer(int64_t bytes);

// Releases the memory of the whole pages between `begin` and `end`, which point into one heap
// buffer. The pages stay allocated and read as zeros. Returns the end of the last page released, or
// `begin` if the range holds no whole page.
const uint8_t *release_pages(const uint8_t *begin, const uint8_t *end);
