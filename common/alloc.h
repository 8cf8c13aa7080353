// Checked sizes and zeroed memory, for every folder of the library.
//
// Sizes are 64-bit and checked for overflow because they are computed from durations and rates that
// files state.
#ifndef TAVO_COMMON_ALLOC_H
#define TAVO_COMMON_ALLOC_H

#include <cstdlib>

#include "common/tavo_ctx.h"

constexpr int64_t kBytesPerSample = 2;  // 16-bit mono

// *result = value * factor / divisor. False if value or factor is negative, divisor is below 1, or
// the product overflows.
inline bool scale_size(int64_t value, int64_t factor, int64_t divisor, int64_t *result) {
    int64_t product = 0;
    if (value < 0 || factor < 0 || divisor < 1) return false;
    if (__builtin_mul_overflow(value, factor, &product)) return false;
    *result = product / divisor;
    return true;
}

// Bytes of a span of PCM: units (100 ns) * rate (Hz) * 2 / 10,000,000, divided last. May be odd.
inline bool span_bytes(int64_t units, int32_t rate, int64_t *bytes) {
    return scale_size(units, rate * kBytesPerSample, kUnitsPerSecond, bytes);
}

// Bytes of count elements of size bytes each, followed by extra bytes.
inline bool array_bytes(int64_t count, int64_t size, int64_t extra, int64_t *bytes) {
    return scale_size(count, size, 1, bytes) && !__builtin_add_overflow(*bytes, extra, bytes);
}

// Zeroed memory for count items, at least one; the caller's to free. Null if memory runs out or the
// size exceeds size_t.
template <typename T>
T *zeroed_items(int64_t count) {
    const uint64_t items = count > 0 ? static_cast<uint64_t>(count) : 1;
    if (items > SIZE_MAX / sizeof(T)) return nullptr;
    return static_cast<T *>(calloc(static_cast<size_t>(items), sizeof(T)));
}

// True if a job lacks part of its audio or of its search, because a read or an allocation has
// failed since tavo_decode_init cleared the mark. Process-wide, as the decoding is: one instance at
// a time.
bool is_incomplete();
void mark_incomplete();
void clear_incomplete();

// Returns memory, after marking the job incomplete if it is null.
inline void *note_shortage(void *memory) {
    if (memory == nullptr) mark_incomplete();
    return memory;
}

constexpr int64_t kLargeBytes = 4 << 20;  // from here on pages are worth the calls below

// Asks for huge pages under a large buffer that is about to be filled: one page fault instead of
// 512, a fifth of the time. Other systems may not grant them; nothing else changes.
void advise_huge_pages(void *buffer, int64_t bytes);

// Uninitialised memory, at least one byte; the caller's to free. A large buffer begins at a huge
// page, so that the allocator's header before it does not break up the first one. Null if memory
// runs out.
uint8_t *allocate_buffer(int64_t bytes);

// Gives the whole pages from begin to end back to the system. They stay allocated and read as
// zeros; begin and end are in one buffer of the heap. Returns the end of the last page released, or
// begin if there was none.
const uint8_t *release_pages(const uint8_t *begin, const uint8_t *end);

#endif
