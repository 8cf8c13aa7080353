#include "highlight/position.h"

#include <cstdlib>

#include "highlight/power_envelope.h"
#include "highlight/search.h"
#include "highlight/tune.h"

namespace {

int32_t whole_seconds(int64_t duration) {
    const int64_t seconds = duration / kUnitsPerSecond;
    if (seconds < 0) return 0;
    return seconds < INT32_MAX ? static_cast<int32_t>(seconds) : INT32_MAX;
}

}  // namespace

uint32_t getHLPosition(TAVO_CTX *ctx) {
    TAVO_HL_CTX *hl = ctx->hl;
    const int32_t duration_s = whole_seconds(ctx->duration);
    const int32_t rate = ctx->fmt.sample_rate;
    const int64_t samples = ctx->pcm == nullptr ? 0 : ctx->pcm_bytes / 2;

    free(hl->power);
    hl->power = nullptr;
    uint32_t start = 0;
    if (_calc_power_level(ctx->pcm, samples, rate, hl) > 0) {
        start = _get_HL_simple(hl, duration_s);
    }
    // The decoded audio may be shorter than the stated duration.
    if (tune_end(rate, start) <= samples) {
        start = _tune_HL_simple(ctx->pcm, rate, start, static_cast<uint32_t>(duration_s));
    }
    hl->hl_pos = start;
    return start;
}

void clearHighlgihtCtx(TAVO_HL_CTX *hl) {
    if (hl == nullptr) return;
    free(hl->power);
    free(hl);
}
