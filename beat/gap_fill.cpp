#include "beat/gap_fill.h"

namespace {

constexpr int32_t kPerGap = 5;        // maximum number of beats added in one gap
constexpr int32_t kEnoughAdded = 45;  // no gap is filled once more beats than this have been added
constexpr float kLongGap = 6.0f;      // seconds; a gap this long is filled at any tempo
constexpr float kSpansInGap = 3.0f;
constexpr int32_t kTimeLead = 2;  // a beat's time is two hops after the start of its analysis frame

static_assert(kEnoughAdded + kPerGap == kMaxAddedBeats);

// A value of the envelope, and the candidates that have it.
struct value_rank {
    double value;
    int32_t first;  // index of the first candidate with this value, or -1
    int32_t times;  // number of candidates with this value
};

// Finds the largest value below *bound, or the largest of all values if `bound` is null.
value_rank next_largest(const int32_t *candidates, int32_t count, const double *env,
                        const double *bound) {
    value_rank best = {0.0, -1, 0};
    for (int32_t k = 0; k < count; ++k) {
        const double value = env[candidates[k]];
        if (bound != nullptr && !(value < *bound)) continue;
        if (best.first >= 0 && value == best.value) {
            ++best.times;
        } else if (best.first < 0 || value > best.value) {
            best = {value, k, 1};
        }
    }
    return best;
}

// Writes the `maxn` strongest candidates, strongest first. If several are equally strong, the first
// is written once for each of them.
int32_t write_strongest(const int32_t *candidates, int32_t count, int32_t maxn, const double *env,
                        int32_t *dst) {
    int32_t written = 0;
    value_rank rank = next_largest(candidates, count, env, nullptr);
    while (rank.first >= 0 && written < maxn) {
        for (int32_t k = 0; k < rank.times && written < maxn; ++k) {
            dst[written++] = candidates[rank.first];
        }
        const double bound = rank.value;
        rank = next_largest(candidates, count, env, &bound);
    }
    return written;
}

}  // namespace

int32_t bringMoreBeat(int32_t a, int32_t b, int32_t *dst, const int32_t *peaks, int32_t npeaks,
                      int32_t maxn, const double *env) {
    if (maxn < 1) return 0;
    int32_t begin = 0;
    while (begin < npeaks && peaks[begin] < a) ++begin;
    ++begin;  // skip the peak of the beat that starts the gap
    int32_t end = begin;
    while (end < npeaks && peaks[end] < b) ++end;
    if (begin >= npeaks) return 0;

    const int32_t count = end - begin;
    if (count > maxn) return write_strongest(peaks + begin, count, maxn, env, dst);
    for (int32_t k = 0; k < count; ++k) dst[k] = peaks[begin + k];
    return count;
}

int32_t fill_gaps(const TAVO_BEAT_CTX *beat, const PEAK_LIST *peaks, float span, float *out,
                  int32_t count) {
    const float hop = beat->frame_times[0];
    int32_t added = 0;
    for (int32_t k = 0; k + 1 < count && added <= kEnoughAdded; ++k) {
        const float gap = out[k + 1] - out[k];
        if (!(gap > kSpansInGap * span || gap >= kLongGap)) continue;

        const int32_t first = static_cast<int32_t>(out[k] / hop) - kTimeLead;
        const int32_t last = static_cast<int32_t>(out[k + 1] / hop) - kTimeLead;
        int32_t extra[kPerGap];
        const int32_t found = bringMoreBeat(first, last, extra, peaks->frames, peaks->count,
                                            kPerGap, beat->onset_env);
        for (int32_t t = 0; t < found; ++t) {
            out[count + added + t] = beat->frame_times[extra[t] + 1];
        }
        added += found;
    }
    return added;
}
