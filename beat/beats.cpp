#include "beat/beats.h"

#include <cstring>

#include "beat/candidates.h"
#include "beat/click_track.h"
#include "beat/onset_envelope.h"
#include "beat/power_rise.h"
#include "beat/tempo.h"

namespace {

// The result of a stage. Any value except going_on ends the analysis.
enum outcome { going_on, stopped, out_of_memory };

outcome check_stop(const TAVO_CTX *ctx) {
    return load_flag(&ctx->quit) != 0 ? stopped : going_on;
}

// Arguments and result of the search for power rises, which runs alongside the onset envelope.
struct rise_search {
    const TAVO_CTX *ctx;
    int32_t count;     // number of rises, or TAVO_ERR_MEMORY
    int64_t *samples;  // [count] samples where rises start, owned
};

sample_view view_of(const TAVO_CTX *ctx) {
    return {ctx->ana, kFullScale};
}

void search_rises(void *arg) {
    auto *search = static_cast<rise_search *>(arg);
    const TAVO_CTX *ctx = search->ctx;
    search->count = find_power_rises(view_of(ctx), analysis_length(ctx), &search->samples);
}

outcome store_rises(const rise_search *search, int32_t hop_size, TAVO_BEAT_CTX *beat) {
    if (search->count < 0) return out_of_memory;
    if (search->count == 0 || hop_size < 1) return going_on;
    beat->rise_frames = zeroed_items<int32_t>(search->count);
    if (beat->rise_frames == nullptr) return out_of_memory;
    beat->rise_count = search->count;
    for (int32_t k = 0; k < search->count; ++k) {
        beat->rise_frames[k] = static_cast<int32_t>(search->samples[k] / hop_size);
    }
    return going_on;
}

outcome find_onsets_and_rises(const TAVO_CTX *ctx, TAVO_BEAT_CTX *beat) {
    const TAVO_ONSET_CTX *onset = ctx->onset;
    rise_search search = {ctx, 0, nullptr};
    const side_work side = {search_rises, &search};
    compute_onset_envelope(beat, view_of(ctx), onset->frame_size, onset->hop_size, &side);
    const outcome end = store_rises(&search, onset->hop_size, beat);
    free(search.samples);
    return end;
}

outcome find_tempo(TAVO_ONSET_CTX *onset, const TAVO_BEAT_CTX *beat) {
    const int32_t bpm = estimate_tempo(beat);
    if (bpm < 0) return out_of_memory;
    onset->bpm = bpm;
    return going_on;
}

// Stores the beats in an array of exactly the right size. Without beats, the array stays null.
outcome find_beats(TAVO_ONSET_CTX *onset, TAVO_BEAT_CTX *beat) {
    auto *times = zeroed_items<float>(candidate_capacity(beat));
    if (times == nullptr) return out_of_memory;
    const int32_t count = getBeatCandi_MT(beat, onset, times);
    outcome end = going_on;
    if (count > 0) {
        onset->beat_times = zeroed_items<float>(count);
        if (onset->beat_times == nullptr) {
            end = out_of_memory;
        } else {
            memcpy(onset->beat_times, times, static_cast<size_t>(count) * sizeof(float));
            onset->beat_count = count;
        }
    }
    free(times);
    return end;
}

outcome analyse(const TAVO_CTX *ctx, TAVO_BEAT_CTX *beat) {
    outcome end = check_stop(ctx);
    if (end == going_on) end = find_onsets_and_rises(ctx, beat);  // stage 4
    if (end == going_on) end = find_tempo(ctx->onset, beat);      // stage 5
    if (end == going_on) end = check_stop(ctx);
    if (end == going_on) end = find_beats(ctx->onset, beat);  // stage 6
    if (end == going_on) write_click_track(ctx);
    return end;
}

// Releases the beats that an earlier analysis left in the instance.
void release_beats(TAVO_ONSET_CTX *onset) {
    free(onset->beat_times);
    onset->beat_times = nullptr;
    onset->beat_count = 0;
}

}  // namespace

int32_t getBeatPosition(TAVO_CTX *ctx) {
    if (ctx == nullptr || ctx->onset == nullptr) return 0;
    release_beats(ctx->onset);
    auto *beat = zeroed_items<TAVO_BEAT_CTX>(1);
    if (beat == nullptr) return 0;

    if (init_beat_ctx(ctx, false, beat) && analyse(ctx, beat) == going_on) {
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
