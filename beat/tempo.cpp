#include "beat/tempo.h"

#include <cmath>

#include "dsp/dft.h"

namespace {

constexpr double kExcerptEnd = 120.0;           // seconds, the latest end of the excerpt
constexpr double kMinute = 60.0;                // seconds, also the length of the longest excerpt
constexpr double kSlowestBpm = 30.0;            // determines the largest lag
constexpr double kPreferredBpm = 120.0;         // centre of the weighting
constexpr double kOctave = 0.6931471805599453;  // ln 2, the width of the weighting
constexpr double kFasterWins = 0.53;            // the shorter period wins above this ratio
constexpr int32_t kFastestBpm = 200;            // a faster estimate is replaced by kDefaultBpm
constexpr int32_t kDefaultBpm = 90;

struct period_candidate {
    double score;
    int32_t lag;  // period in analysis frames; 0 if nothing was found
};

// Finds the lag with the best score, which combines the correlation at the lag and at twice the
// lag. The score must exceed 0; if several lags have the best score, the shortest wins.
period_candidate best_of_two(const double *r, int32_t lags) {
    period_candidate best = {0.0, 0};
    for (int32_t k = 1; k < lags / 2; ++k) {
        const double score = r[k] + 0.5 * r[2 * k] + 0.25 * (r[2 * k - 1] + r[2 * k + 1]);
        if (score > best.score) best = {score, k};
    }
    return best;
}

// Same as best_of_two, but uses three times the lag instead of twice the lag.
period_candidate best_of_three(const double *r, int32_t lags) {
    period_candidate best = {0.0, 0};
    for (int32_t k = 1; k < lags / 3; ++k) {
        const double score = r[k] + 0.33 * (r[3 * k - 1] + r[3 * k] + r[3 * k + 1]);
        if (score > best.score) best = {score, k};
    }
    return best;
}

// Returns the beat period in analysis frames, or 0 if neither search finds one.
int32_t choose_period(const double *r, int32_t lags) {
    const period_candidate two = lags < 4 ? period_candidate{0.0, 0} : best_of_two(r, lags);
    const period_candidate three = lags < 6 ? period_candidate{0.0, 0} : best_of_three(r, lags);
    const bool twofold = two.score > three.score;
    const int32_t shorter = twofold ? two.lag : three.lag;
    const int32_t longer = twofold ? 2 * shorter : 3 * shorter;
    if (shorter == 0) return 0;
    const double ratio = r[shorter] / (r[shorter] + r[longer]);
    return ratio > kFasterWins ? shorter : longer;
}

// Weights the correlation at each lag by a Gaussian around 120 BPM, measured in octaves. The weight
// of lag 0 is 0.
void weigh_lags(double *r, int32_t lags, double hop) {
    const double frames_per_minute = kMinute / hop;
    for (int32_t t = 0; t < lags; ++t) {
        const double octaves = log((frames_per_minute / t) / kPreferredBpm) / kOctave;
        r[t] = r[t] * exp(-0.5 * (octaves * octaves));
    }
}

// Replaces the excerpt in re[nfft] with its autocorrelation at lags 0 to `lags` - 1. The
// autocorrelation is circular: it repeats every `nfft` entries.
int32_t autocorrelate(double *re, double *im, int64_t nfft, int32_t count, int32_t lags) {
    if (tavo_dft(re, im, nfft, count, 1) != 0) return TAVO_ERR_MEMORY;
    for (int64_t k = 0; k < nfft; ++k) re[k] = re[k] * re[k] + im[k] * im[k];

    const int64_t distinct = lags < nfft ? lags : nfft;
    if (tavo_inverse_dft(re, im, nfft, distinct, 1) != 0) return TAVO_ERR_MEMORY;
    for (int64_t t = nfft; t < lags; ++t) re[t] = re[t - nfft];
    return 0;
}

// Returns the smallest power of two that is at least `count`.
int64_t transform_size(int64_t count) {
    int64_t size = 1;
    while (size < count) size *= 2;
    return size;
}

// Returns the beat period of x[count] in analysis frames, 0 if no period stands out, or
// TAVO_ERR_MEMORY. A single NaN (from silent input) would make every correlation NaN, so such input
// is not transformed.
int32_t find_period(const double *x, int64_t nfft, int32_t lags, int32_t count, double hop) {
    for (int32_t i = 0; i < count; ++i) {
        if (!std::isfinite(x[i])) return 0;
    }
    const int64_t capacity = nfft > lags ? nfft : lags;
    auto *re = zeroed_items<double>(capacity);
    auto *im = zeroed_items<double>(capacity);
    int32_t period = TAVO_ERR_MEMORY;
    if (re != nullptr && im != nullptr) {
        for (int32_t i = 0; i < count; ++i) re[i] = x[i];
        if (autocorrelate(re, im, nfft, count, lags) == 0) {
            weigh_lags(re, lags, hop);
            period = choose_period(re, lags);
        }
    }
    free(re);
    free(im);
    return period;
}

}  // namespace

int32_t calc_bpm_acf(const double *x, int64_t nfft, int32_t D, int32_t L, double hop) {
    if (nfft < 1) return kNoPeriodBpm;
    const int32_t count = L < nfft ? L : static_cast<int32_t>(nfft);
    const int32_t period = find_period(x, nfft, D, count, hop);
    if (period < 0) return TAVO_ERR_MEMORY;
    if (period == 0) return kNoPeriodBpm;  // avoids dividing by 0
    const double bpm = kMinute / (period * hop);
    return bpm < kNoPeriodBpm ? static_cast<int32_t>(bpm) : kNoPeriodBpm;
}

int32_t estimate_tempo(const TAVO_BEAT_CTX *beat) {
    if (beat->frame_count < 2) return kDefaultBpm;
    const double hop = beat->hop_seconds;
    const double latest = kExcerptEnd / hop;
    const auto frames = static_cast<double>(beat->frame_count);
    const auto end = static_cast<int64_t>(latest < frames ? latest : frames);
    const double earliest = static_cast<double>(end) - kMinute / hop;
    const auto start = static_cast<int64_t>(earliest > 0.0 ? earliest : 0.0);
    const auto length = static_cast<int32_t>(end - start);
    const auto lags = static_cast<int32_t>((kMinute / hop) / kSlowestBpm);

    const int32_t bpm =
        calc_bpm_acf(beat->onset_env + start, transform_size(length), lags, length, hop);
    return bpm > kFastestBpm ? kDefaultBpm : bpm;
}
