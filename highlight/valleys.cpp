#include "highlight/valleys.h"

namespace {

constexpr double kMinGapSeconds = 7.0;  // low points this far apart are in different stretches
constexpr float kLoudMean = 0.5f;       // in a song with a higher mean, only deep dips count
constexpr double kDeepDip = 1.5;        // standard deviations below the mean

float low_threshold(float mean, float std) {
    if (mean > kLoudMean) {
        return static_cast<float>(static_cast<double>(mean) - kDeepDip * static_cast<double>(std));
    }
    return mean - std;
}

// Returns the minimum distance between quiet stretches in points, rounded toward zero.
int32_t minimum_gap(float hop_s) {
    const double gap = kMinGapSeconds / static_cast<double>(hop_s);
    if (gap > 0.0 && gap < static_cast<double>(INT32_MAX)) return static_cast<int32_t>(gap);
    return gap <= 0.0 ? 0 : INT32_MAX;
}

}  // namespace

int32_t tavo_find_valley(const float *values, int32_t n, int32_t *out, float mean, float std,
                         float hop_s) {
    const float threshold = low_threshold(mean, std);
    const int32_t gap = minimum_gap(hop_s);
    int32_t written = 0;
    int32_t lows = 0;
    int32_t last_low = 0;
    for (int32_t i = 0; i < n; ++i) {
        if (!(values[i] < threshold)) continue;
        // A stretch that ends at the first point is the song's opening, not a valley.
        if (lows > 0 && i - last_low >= gap && last_low != 0) {
            out[written++] = last_low;
            if (written == kMaxValleys) return written;
        }
        ++lows;
        last_low = i;
    }
    if (lows > 0) out[written++] = last_low;
    return written;
}
