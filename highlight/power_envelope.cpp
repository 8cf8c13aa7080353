#include "highlight/power_envelope.h"

#include <cmath>
#include <cstdlib>

#include "common/alloc.h"
#include "common/lanes.h"

namespace {

constexpr int32_t kSections = 2;  // parts of the song that are summed side by side
constexpr int32_t kOverlap = kPowerWindowSeconds / kPowerHopSeconds;  // windows that cover a sample

float power_of_sum(double sum, int64_t window) {
    const auto mean = static_cast<float>(sum / static_cast<double>(window));
    return 10.0f * log10f(mean + 1.0f);
}

// Adds `hop` samples of each section to the sums of the three windows that overlap there. Each sum
// adds its samples in order, so the powers are bit-identical to those of window_power.
void add_hop(double_pair sums[kOverlap], const int16_t *first, const int16_t *second, int64_t hop) {
    double_pair oldest = sums[0];
    double_pair middle = sums[1];
    double_pair newest = sums[2];
    const auto add = [&](int_pair samples) {
        const auto x = __builtin_convertvector(samples, double_pair);
        const double_pair level = x * kInverseHead + x * kInverseTail;
        const double_pair square = level * level;
        oldest += square;
        middle += square;
        newest += square;
    };
    int64_t i = 0;
    for (; i + 4 <= hop; i += 4) {
        int16_quad a;
        int16_quad b;
        memcpy(&a, first + i, sizeof a);
        memcpy(&b, second + i, sizeof b);
        const auto low =
            __builtin_convertvector(__builtin_shufflevector(a, b, 0, 4, 1, 5), int_quad);
        const auto high =
            __builtin_convertvector(__builtin_shufflevector(a, b, 2, 6, 3, 7), int_quad);
        add(__builtin_shufflevector(low, low, 0, 1));
        add(__builtin_shufflevector(low, low, 2, 3));
        add(__builtin_shufflevector(high, high, 0, 1));
        add(__builtin_shufflevector(high, high, 2, 3));
    }
    for (; i < hop; ++i) add(int_pair{first[i], second[i]});
    sums[0] = oldest;
    sums[1] = middle;
    sums[2] = newest;
}

}  // namespace

float window_power(const int16_t *pcm, int64_t window) {
    double sum = 0.0;
    for (int64_t i = 0; i < window; ++i) {
        const auto x = static_cast<double>(pcm[i]);
        const double level = x * kInverseHead + x * kInverseTail;
        sum += level * level;
    }
    return power_of_sum(sum, window);
}

void overlapping_powers(const int16_t *pcm, int64_t hop, int64_t count, float *out) {
    if (count < 1) return;
    // If `count` is odd, both sections compute the value of the window that they share.
    const int64_t length = (count + kSections - 1) / kSections;
    const int64_t second = count - length;
    double_pair sums[kOverlap] = {};
    for (int64_t k = 0; k < length + kOverlap - 1; ++k) {
        const int16_t *samples = pcm + k * hop;
        add_hop(sums, samples, samples + second * hop, hop);
        const int64_t done = k - (kOverlap - 1);  // index of the window that ends with this hop
        if (done >= 0) {
            out[done] = power_of_sum(sums[0][0], kOverlap * hop);
            out[second + done] = power_of_sum(sums[0][1], kOverlap * hop);
        }
        sums[0] = sums[1];
        sums[1] = sums[2];
        sums[2] = double_pair{0.0, 0.0};
    }
}

int32_t _calc_power_level(const int16_t *pcm, int64_t sample_count, int32_t rate, TAVO_HL_CTX *hl) {
    hl->power_count = 0;
    if (rate <= 0) return 0;
    // Latest possible start of a window.
    const int64_t last = sample_count - int64_t{kPowerWindowSeconds} * rate;
    if (last < 0) return 0;
    const int64_t hop = int64_t{kPowerHopSeconds} * rate;
    const int64_t count = last / hop + 1;
    if (count > INT32_MAX) return 0;
    auto *power =
        static_cast<float *>(note_shortage(malloc(static_cast<size_t>(count) * sizeof(float))));
    if (power == nullptr) return 0;
    overlapping_powers(pcm, hop, count, power);
    hl->power = power;
    hl->power_count = static_cast<int32_t>(count);
    return hl->power_count;
}
