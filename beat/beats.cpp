#include "beat/beats.h"

#include <cstring>

#include "beat/candidates.h"
#include "beat/click_track.h"
#include "beat/onset_envelope.h"
#include "beat/power_rise.h"
#include "beat/tempo.h"

namespace {

// How one stage ended; anything but going_on ends the analysis.
enum outcome { going_on, stopped, out_of_memory };

outcome stop_asked(const TAVO_CTX *ctx) {
    return load_flag(&ctx->quit) != 0 ? stopped : going_on;
}

outcome find_rises(const TAVO_CTX *ctx, TAVO_BEAT_CTX *beat) {
    const int64_t n = analysis_length(ctx);
    const int32_t rises = detectPowerVariation(beat->signal, beat->rise_flags, n);
    if (rises < 0) return out_of_memory;
    const int32_t code = collect_rise_frames(beat, n, ctx->onset->hop_size, rises);
    return code == 0 ? going_on : out_of_memory;
}

outcome take_onsets(const TAVO_ONSET_CTX *onset, TAVO_BEAT_CTX *beat) {
    _getOnsetEnvelope(beat, onset->frame_size, onset->hop_size);
    return going_on;
}

outcome find_tempo(TAVO_ONSET_CTX *onset, const TAVO_BEAT_CTX *beat) {
    const int32_t bpm = estimate_tempo(beat);
    if (bpm < 0) return out_of_memory;
    onset->bpm = bpm;
    return going_on;
}

// Leaves the beats in an array of their exact number; none at all leave it null.
outcome find_beats(TAVO_ONSET_CTX *onset, TAVO_BEAT_CTX *beat) {
    float *room = zeroed_items<float>(candidate_room(beat));
    if (room == nullptr) return out_of_memory;
    const int32_t count = getBeatCandi_MT(beat, onset, room);
    outcome end = going_on;
    if (count > 0) {
        onset->beat_times = zeroed_items<float>(count);
        if (onset->beat_times == nullptr) {
            end = out_of_memory;
        } else {
            memcpy(onset->beat_times, room, static_cast<size_t>(count) * sizeof(float));
            onset->beat_count = count;
        }
    }
    free(room);
    return end;
}

outcome analyse(const TAVO_CTX *ctx, TAVO_BEAT_CTX *beat) {
    outcome end = find_rises(ctx, beat);
    if (end == going_on) end = stop_asked(ctx);
    if (end == going_on) end = take_onsets(ctx->onset, beat);
    if (end == going_on) end = find_tempo(ctx->onset, beat);
    if (end == going_on) end = stop_asked(ctx);
    if (end == going_on) end = find_beats(ctx->onset, beat);
    if (end == going_on)
        write_click_track(beat->signal, analysis_length(ctx), ctx->ana_rate, ctx->onset);
    return end;
}

// Releases what an earlier analysis of the same instance found.
void forget_beats(TAVO_ONSET_CTX *onset) {
    free(onset->beat_times);
    onset->beat_times = nullptr;
    onset->beat_count = 0;
}

}  // namespace

int32_t getBeatPosition(TAVO_CTX *ctx) {
    if (ctx == nullptr || ctx->onset == nullptr) return 0;
    forget_beats(ctx->onset);
    TAVO_BEAT_CTX *beat = zeroed_items<TAVO_BEAT_CTX>(1);
    if (beat == nullptr) return 0;

    __beat_init(ctx, beat);
    if (beat_ctx_ready(beat) && analyse(ctx, beat) == going_on) {
        store_flag(&ctx->state, kStateFinished);
    }
    __tavo_deinit(beat);
    free(beat);
    return ctx->onset->beat_count;
}

void clearOnsetCtx(TAVO_ONSET_CTX *onset) {
    if (onset == nullptr) return;
    free(onset->beat_times);
    free(onset);
}
