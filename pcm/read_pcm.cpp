#include "pcm/read_pcm.h"

#include <algorithm>

#include "include/tavo.h"

namespace {

// Replies without a byte, in a row, after which a source is given up. No stream brings as many.
constexpr int32_t kMaxEmptyReplies = 65'536;

// Any other code only says that a call brought what its byte count says.
bool is_failure(int32_t result) {
    return result == TAVO_ERR_MEMORY || result == TAVO_ERR_HANDLE || result == TAVO_ERR_READ;
}

}  // namespace

int64_t read_pcm(mtsrc_ctx *src, uint8_t *dst, int64_t capacity) {
    int64_t got = 0;
    int32_t empty_replies = 0;
    while (got < capacity && empty_replies < kMaxEmptyReplies) {
        const auto want = static_cast<int32_t>(std::min(capacity - got, kReadBytes));
        mtsrc_frame frame = {dst + got, 0};
        const int32_t result = mtsrc_getstream(src, want, &frame);
        if (is_failure(result)) break;

        const int32_t delivered = std::clamp(frame.size, 0, want);
        got += delivered;
        empty_replies = delivered > 0 ? 0 : empty_replies + 1;
        if (result == kMtsrcEndOfStream) break;
    }
    return got;
}
