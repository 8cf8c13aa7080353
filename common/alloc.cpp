#include "common/alloc.h"

#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>

namespace {

constexpr int64_t kHugePageBytes = 2 << 20;  // size on most systems

int32_t incomplete = 0;  // atomic access only: the job's threads set it

uintptr_t page_size() {
    return static_cast<uintptr_t>(sysconf(_SC_PAGESIZE));
}

}  // namespace

void advise_huge_pages(void *buffer, int64_t bytes) {
    if (buffer == nullptr || bytes < kLargeBytes) return;
    // Extend the range to whole pages. Otherwise the advice would split the buffer's mapping, so
    // that realloc could not move it and neighbouring buffers could not share huge pages. Other
    // data in the first and last page is not harmed.
    const uintptr_t page = page_size();
    const uintptr_t before = reinterpret_cast<uintptr_t>(buffer) % page;
    const uintptr_t pages = (before + static_cast<uintptr_t>(bytes) + page - 1) / page;
    madvise(static_cast<uint8_t *>(buffer) - before, pages * page, MADV_HUGEPAGE);
}

uint8_t *allocate_buffer(int64_t bytes) {
    // Ask for at least one byte, because malloc(0) may return null.
    const auto size = static_cast<size_t>(std::max<int64_t>(bytes, 1));
    if (bytes < kLargeBytes) return static_cast<uint8_t *>(malloc(size));
    void *buffer = nullptr;
    if (posix_memalign(&buffer, kHugePageBytes, size) != 0) return nullptr;
    advise_huge_pages(buffer, bytes);
    return static_cast<uint8_t *>(buffer);
}

const uint8_t *release_pages(const uint8_t *begin, const uint8_t *end) {
    const uintptr_t page = page_size();
    const auto bytes_into_page = [page](const uint8_t *p) {
        return reinterpret_cast<uintptr_t>(p) % page;
    };
    const uint8_t *first = begin + (page - bytes_into_page(begin)) % page;
    const uint8_t *last = end - bytes_into_page(end);
    if (first >= last) return begin;
    madvise(const_cast<uint8_t *>(first), static_cast<size_t>(last - first), MADV_DONTNEED);
    return last;
}

bool is_incomplete() {
    return load_flag(&incomplete) != 0;
}

void mark_incomplete() {
    store_flag(&incomplete, 1);
}

void clear_incomplete() {
    store_flag(&incomplete, 0);
}
