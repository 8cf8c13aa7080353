#include "beat/candidates.h"

#include <algorithm>

#include "beat/gap_fill.h"
#include "beat/threshold.h"
#include "dsp/peaks.h"

namespace {

constexpr double kMinute = 60.0;         // seconds
constexpr int32_t kSlowBpm = 95;         // up to this tempo, beats are at least kSlowSpan apart
constexpr float kSlowSpan = 3.0f;        // seconds
constexpr float kFastSpan = 1.0f;        // seconds
constexpr int32_t kBeatPerFrame = 2583;  // fastest tempo: BPM of one beat per analysis frame
constexpr double kWindowBeats = 4.0;     // length of the threshold's window in beat periods
constexpr float kMsPerSecond = 1000.0f;

// Distances that depend on the tempo.
struct spacing {
    float span;        // smallest distance between beats in seconds, a whole number of periods
    int32_t distance;  // span in analysis frames
    int32_t window;    // length of the threshold's window in analysis frames, even
};

spacing spacing_at(int32_t bpm, float hop) {
    const double period = kMinute / bpm;
    const float least = bpm <= kSlowBpm ? kSlowSpan : kFastSpan;
    spacing beats = {};
    // Computed in single precision on purpose: the rounding is part of the result.
    while (beats.span < least) beats.span += static_cast<float>(period);
    beats.distance = static_cast<int32_t>(beats.span / hop);

    const auto seconds = static_cast<float>(static_cast<int32_t>(kWindowBeats * period));
    beats.window = static_cast<int32_t>(seconds / hop);
    if (beats.window % 2 != 0) ++beats.window;
    return beats;
}

// Writes the times (s) of the accepted peaks and returns their number. Peaks near a power rise come
// first in the list and need not exceed the threshold.
int32_t select_beats(const TAVO_BEAT_CTX *beat, const PEAK_LIST *peaks, const double *thr,
                     int32_t max_beats, float *out) {
    int32_t accepted = 0;
    for (int32_t j = 0; j < peaks->count; ++j) {
        const int32_t i = peaks->frames[j];
        if (j >= beat->rise_count && !(beat->onset_env[i] > thr[i])) continue;
        out[accepted++] = beat->frame_times[i + 1];
        if (max_beats >= 1 && accepted == max_beats) break;
    }
    return accepted;
}

// Writes the beat times (ms) to `out` and returns their number. `thr` (one entry per analysis frame
// except the last) and peaks->frames must be zeroed.
int32_t compute_beats(TAVO_BEAT_CTX *beat, const TAVO_ONSET_CTX *onset, double *thr,
                      PEAK_LIST *peaks, float *out) {
    const int64_t count = beat->frame_count > 1 ? beat->frame_count - 1 : 0;
    const float hop =
        beat->frame_count > 0 ? beat->frame_times[0] : static_cast<float>(beat->hop_seconds);
    if (!(hop > 0.0f)) return 0;
    const spacing beats = spacing_at(onset->bpm, hop);
    if (build_threshold(beat, beats.window, hop, thr) != 0) return 0;
    const int32_t found = findPeaksPriority(beat->onset_env, count, beats.distance, peaks->frames,
                                            beat->rise_frames, beat->rise_count);
    peaks->count = found > 0 ? found : 0;
    std::copy(thr, thr + count, beat->threshold);

    // std::sort is used because it does not allocate. qsort does, and if memory runs out, it may
    // read out of bounds with the comparators of dsp/sort.h, which never report equality.
    const int32_t accepted = select_beats(beat, peaks, thr, onset->max_beats, out);
    std::sort(peaks->frames, peaks->frames + peaks->count);
    std::sort(out, out + accepted);
    const int32_t total = accepted + fill_gaps(beat, peaks, beats.span, out, accepted);
    std::sort(out, out + total);
    for (int32_t k = 0; k < total; ++k) out[k] *= kMsPerSecond;
    return total;
}

// Returns the capacity of the peak list: one entry per power rise and one per two analysis frames,
// because peaks are never adjacent.
int64_t peak_capacity(const TAVO_BEAT_CTX *beat) {
    return (beat->frame_count > 0 ? beat->frame_count / 2 : 0) + beat->rise_count;
}

}  // namespace

int64_t candidate_capacity(const TAVO_BEAT_CTX *beat) {
    return peak_capacity(beat) + kMaxAddedBeats;
}

int32_t getBeatCandi_MT(TAVO_BEAT_CTX *beat, TAVO_ONSET_CTX *onset, float *out) {
    if (onset->bpm < 1 || onset->bpm > kBeatPerFrame) return 0;
    auto *thr = zeroed_items<double>(beat->frame_count - 1);
    PEAK_LIST peaks = {zeroed_items<int32_t>(peak_capacity(beat)), 0};
    int32_t total = 0;
    if (thr != nullptr && peaks.frames != nullptr) {
        total = compute_beats(beat, onset, thr, &peaks, out);
    }
    free(thr);
    free(peaks.frames);
    return total;
}
