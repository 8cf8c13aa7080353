// Large blocks of memory, kept for the next run. The address sanitizer maps each block above 128 KiB
// afresh, and its pages are filled at the first touch: that took more than half of the time of a
// run, which opens a file and a decoder. A kept block is one of the sanitizer's, with its own
// borders, and cannot be touched while nobody holds it; a block that is lost is reported as ever.
#include <sanitizer/asan_interface.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <cstring>

extern "C" {
// The sanitizer's own functions; those of the usual names are weak.
void *__interceptor_malloc(size_t size) noexcept;
void *__interceptor_calloc(size_t count, size_t size) noexcept;
void *__interceptor_realloc(void *block, size_t size) noexcept;
int __interceptor_posix_memalign(void **block, size_t alignment, size_t size) noexcept;
void __interceptor_free(void *block) noexcept;
}

namespace {

constexpr size_t kLarge = 1 << 16;  // bytes
constexpr size_t kTooLarge = 1 << 23;
constexpr size_t kPlainAlignment = 16;
constexpr int kIdle = 32;
constexpr int kTaken = 128;
constexpr size_t kFilled = 4096;  // bytes of a new block that the sanitizer fills
constexpr int kFilling = 0xBE;

struct block {
    void *data;
    size_t size;
    size_t alignment;
};

// Blocks handed out. The addresses are kept inverted, so that the leak sanitizer does not take this
// table for a holder.
struct taken_block {
    uintptr_t inverted;
    size_t size;
    size_t alignment;
};

bool lock;
block idle[kIdle];
taken_block taken[kTaken];
int idle_count;
int taken_count;

// A mutex cannot be used: memory is asked for before the sanitizer's own functions are there.
void enter() {
    while (__atomic_test_and_set(&lock, __ATOMIC_ACQUIRE)) {
    }
}

void leave() {
    __atomic_clear(&lock, __ATOMIC_RELEASE);
}

bool is_large(size_t size) {
    return size >= kLarge && size <= kTooLarge;
}

void note_taken(void *data, size_t size, size_t alignment) {
    if (data == nullptr || taken_count == kTaken) return;
    taken[taken_count++] = {~reinterpret_cast<uintptr_t>(data), size, alignment};
}

// Forgets a block handed out. Its size is 0 when it is none of those.
block release_taken(void *data) {
    for (int i = taken_count - 1; i >= 0; --i) {
        if (taken[i].inverted != ~reinterpret_cast<uintptr_t>(data)) continue;
        const block found = {data, taken[i].size, taken[i].alignment};
        taken[i] = taken[--taken_count];
        return found;
    }
    return {};
}

void *take_idle(size_t size, size_t alignment) {
    for (int i = idle_count - 1; i >= 0; --i) {
        if (idle[i].size != size || idle[i].alignment != alignment) continue;
        void *data = idle[i].data;
        idle[i] = idle[--idle_count];
        idle[idle_count] = {};  // no second holder
        __asan_unpoison_memory_region(data, size);
        return data;
    }
    return nullptr;
}

// make: gets a new block when none of the size is idle.
template <typename Make>
void *take(size_t size, size_t alignment, bool cleared, Make make) {
    enter();
    void *data = take_idle(size, alignment);
    leave();
    if (data == nullptr) {
        data = make();
    } else if (cleared) {
        memset(data, 0, size);
    } else {
        memset(data, kFilling, std::min(size, kFilled));
    }
    enter();
    note_taken(data, size, alignment);
    leave();
    return data;
}

void *take_plain(size_t size) noexcept {
    return take(size, kPlainAlignment, false, [=] { return __interceptor_malloc(size); });
}

}  // namespace

extern "C" void *malloc(size_t size) {
    // As a jump: the leak sanitizer looks at the caller, and forgives the dynamic linker.
    if (!is_large(size)) [[clang::musttail]] return __interceptor_malloc(size);
    return take_plain(size);
}

extern "C" void *calloc(size_t count, size_t size) noexcept {
    size_t bytes = 0;
    if (__builtin_mul_overflow(count, size, &bytes) || !is_large(bytes)) {
        return __interceptor_calloc(count, size);
    }
    return take(bytes, kPlainAlignment, true, [=] { return __interceptor_calloc(count, size); });
}

extern "C" int posix_memalign(void **place, size_t alignment, size_t size) noexcept {
    if (!is_large(size)) return __interceptor_posix_memalign(place, alignment, size);
    *place = take(size, alignment, false, [=] {
        void *made = nullptr;
        return __interceptor_posix_memalign(&made, alignment, size) == 0 ? made : nullptr;
    });
    return *place != nullptr ? 0 : ENOMEM;
}

extern "C" void *realloc(void *data, size_t size) noexcept {
    enter();
    const block held = data != nullptr ? release_taken(data) : block{};
    leave();
    void *moved = __interceptor_realloc(data, size);
    enter();
    if (moved != nullptr && is_large(size)) {
        note_taken(moved, size, kPlainAlignment);
    } else if (moved == nullptr && size > 0 && held.size > 0) {
        note_taken(data, held.size, held.alignment);
    }
    leave();
    return moved;
}

extern "C" void free(void *data) noexcept {
    enter();
    const block held = data != nullptr && taken_count > 0 ? release_taken(data) : block{};
    const bool keep = held.size > 0 && idle_count < kIdle;
    if (keep) {
        __asan_poison_memory_region(data, held.size);
        idle[idle_count++] = held;
    }
    leave();
    if (!keep) __interceptor_free(data);
}
