#include "core/jobs.h"

#include "beat/beats.h"
#include "highlight/position.h"
#include "pcm/decode.h"
#include "pcm/from_highlight.h"
#include "pcm/resample.h"

namespace {

// Values of TAVO_INFO.status.
constexpr int32_t kStatusResult = 0;
constexpr int32_t kStatusFailure = -1;

void decode(TAVO_CTX *ctx) {
    ctx->pcm_bytes = decode_segments(ctx, ctx->pcm, ctx->pcm_bytes, segment_pages::released);
}

void deliver(TAVO_CTX *ctx) {
    if (ctx->callback != nullptr) ctx->callback(ctx->info);
}

// Converts beat times, which count from the start of the analysed signal, to times from the start
// of the file.
void shift_beats(TAVO_ONSET_CTX *onset, int32_t start_ms) {
    const auto shift = static_cast<float>(start_ms);
    for (int32_t i = 0; i < onset->beat_count; ++i) onset->beat_times[i] += shift;
}

// Runs the beat analysis if the conversion to the analysis rate succeeded, and reports the result.
// A job that finds no beats fails, whatever the reason, but still reports its highlight.
void find_and_report_beats(TAVO_CTX *ctx, bool from_highlight, bool converted) {
    TAVO_INFO *info = ctx->info;
    TAVO_ONSET_CTX *onset = converted ? ctx->onset : nullptr;
    if (onset != nullptr) getBeatPosition(ctx);
    if (from_highlight) info->hl_pos = static_cast<int32_t>(ctx->hl->hl_pos);
    if (onset != nullptr && onset->beat_count != 0) {
        if (from_highlight && info->hl_pos != 0) shift_beats(onset, info->hl_pos);
        info->beat_count = onset->beat_count;
        info->beat_times = onset->beat_times;
        info->status = kStatusResult;
    } else {
        store_flag(&ctx->state, kStateFailed);
        info->beat_count = 0;
        info->beat_times = nullptr;
        info->status = kStatusFailure;
    }
    deliver(ctx);
}

}  // namespace

extern "C" void *analyzeHighlightOnly(void *arg) {
    auto *ctx = static_cast<TAVO_CTX *>(arg);
    decode(ctx);
    getHLPosition(ctx);
    store_flag(&ctx->state, kStateFinished);
    ctx->info->hl_pos = static_cast<int32_t>(ctx->hl->hl_pos);
    ctx->info->status = kStatusResult;
    deliver(ctx);
    pthread_exit(nullptr);
}

extern "C" void *analyzeHighlight(void *arg) {
    return analyzeHighlightOnly(arg);
}

extern "C" void *analyzeOnsetOnly(void *arg) {
    auto *ctx = static_cast<TAVO_CTX *>(arg);
    decode(ctx);
    const int32_t code = convert_and_free(ctx->pcm, ctx->pcm_bytes, ctx->fmt.sample_rate,
                                          ctx->ana_rate, &ctx->ana_len, &ctx->ana);
    ctx->pcm = nullptr;
    find_and_report_beats(ctx, false, code == 0);
    pthread_exit(nullptr);
}

extern "C" void *analyzeOnsetFromeHi(void *arg) {
    auto *ctx = static_cast<TAVO_CTX *>(arg);
    decode(ctx);
    const int64_t start_ms = getHLPosition(ctx);
    const int32_t code = continue_from_highlight(ctx, start_ms, segment_pages::released);
    find_and_report_beats(ctx, true, code == 0);
    pthread_exit(nullptr);
}

extern "C" int32_t analyzeOnsetenv(TAVO_CTX *ctx) {
    find_and_report_beats(ctx, ctx->mode == TAVO_MODE_BOTH && ctx->hl != nullptr, true);
    return TAVO_OK;
}
