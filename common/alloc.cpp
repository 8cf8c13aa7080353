#include "common/alloc.h"

#include <sys/mman.h>
#include <unistd.h>

namespace {

constexpr int64_t kHugeAdviceBytes = 4 << 20;  // two huge pages of most systems

}  // namespace

void advise_huge_pages(void *buffer, int64_t bytes) {
    if (buffer == nullptr || bytes < kHugeAdviceBytes) return;
    // Outwards to whole pages: neighbouring buffers then share huge pages, and each stays one
    // mapping, which realloc can move. The advice does not change what else the first and last page
    // hold.
    const auto page = static_cast<uintptr_t>(sysconf(_SC_PAGESIZE));
    const uintptr_t before = reinterpret_cast<uintptr_t>(buffer) % page;
    const uintptr_t pages = (before + static_cast<uintptr_t>(bytes) + page - 1) / page;
    madvise(static_cast<uint8_t *>(buffer) - before, pages * page, MADV_HUGEPAGE);
}
