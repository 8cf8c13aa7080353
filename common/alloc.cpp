#include "common/alloc.h"

#include <sys/mman.h>
#include <unistd.h>

namespace {

constexpr int64_t kHugeAdviceBytes = 4 << 20;  // two huge pages of most systems

}  // namespace

void advise_huge_pages(void *buffer, int64_t bytes) {
    if (buffer == nullptr || bytes < kHugeAdviceBytes) return;
    // Outwards to whole pages: buffers that lie side by side then share huge pages, and each stays
    // one mapping, which realloc can move. What else the first and the last page hold is not
    // changed by an advice.
    const auto page = static_cast<uintptr_t>(sysconf(_SC_PAGESIZE));
    const auto first = reinterpret_cast<uintptr_t>(buffer) / page * page;
    const auto end =
        (reinterpret_cast<uintptr_t>(buffer) + static_cast<uintptr_t>(bytes) + page - 1) / page *
        page;
    madvise(reinterpret_cast<void *>(first), end - first, MADV_HUGEPAGE);
}
