#include "pcm/read_pcm.h"

#include <algorithm>

namespace {

constexpr int32_t kEndOfStream = 1;
constexpr int32_t kMaxEmptyReads = 64;  // in a row; a source that delivers nothing is given up

}  // namespace

int64_t read_pcm(mtsrc_ctx *src, uint8_t *dst, int64_t capacity) {
    int64_t got = 0;
    int32_t empty_reads = 0;
    while (got < capacity && empty_reads < kMaxEmptyReads) {
        const auto want = static_cast<int32_t>(std::min(capacity - got, kReadBytes));
        mtsrc_frame frame = {dst + got, 0};
        const int32_t result = mtsrc_getstream(src, want, &frame);
        if (result < 0) break;

        const int32_t delivered = std::clamp(frame.size, 0, want);
        got += delivered;
        empty_reads = delivered > 0 ? 0 : empty_reads + 1;
        if (result == kEndOfStream) break;
    }
    return got;
}
