#include "pcm/read_pcm.h"

#include <algorithm>

#include "common/alloc.h"

namespace {

// Consecutive empty reads before giving up; far more than any real stream produces.
constexpr int32_t kMaxEmptyReads = 65'536;

// True if the read failed. Other codes are informational; the byte count is what matters.
bool is_failure(int32_t result) {
    return result == TAVO_ERR_MEMORY || result == TAVO_ERR_HANDLE || result == TAVO_ERR_READ;
}

}  // namespace

void read_pcm(mtsrc_ctx *src, uint8_t *dst, int64_t capacity, int64_t *got) {
    *got = 0;
    int32_t empty_reads = 0;
    while (*got < capacity) {
        const auto want = static_cast<int32_t>(std::min(capacity - *got, kReadBytes));
        mtsrc_frame frame = {dst + *got, 0};
        const int32_t result = mtsrc_getstream(src, want, &frame);
        const int32_t delivered = std::clamp(frame.size, 0, want);
        empty_reads = delivered > 0 ? 0 : empty_reads + 1;
        if (is_failure(result) || empty_reads == kMaxEmptyReads) {
            mark_incomplete();
            break;
        }
        *got += delivered;
        if (result == kMtsrcEndOfStream) break;
    }
}
