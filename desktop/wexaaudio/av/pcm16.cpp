#include "desktop/wexaaudio/av/pcm16.h"

#include <cstddef>
#include <cstring>

namespace {

constexpr float kScale = 32768.0f;

// Adding 1.5 x 2^23 leaves the nearest integer (ties to even, as lrintf) in the low bits of a float
// of magnitude below 2^22; unlike a call of lrintf, the compiler turns this into vector code.
constexpr float kRoundMagic = 12582912.0f;
constexpr int32_t kRoundMagicBits = 0x4B400000;

inline int16_t round_clip(float sample) {
    float v = sample == sample ? sample * kScale : 0.0f;
    v = v < 32767.0f ? v : 32767.0f;
    v = v > -32768.0f ? v : -32768.0f;
    const float shifted = v + kRoundMagic;
    int32_t bits = 0;
    memcpy(&bits, &shifted, sizeof bits);
    return static_cast<int16_t>(bits - kRoundMagicBits);
}

}  // namespace

void pcm16_pair(const float *left, const float *right, int16_t *out, int32_t count) {
    for (ptrdiff_t i = 0; i < count; ++i) {
        out[2 * i] = round_clip(left[i]);
        out[2 * i + 1] = round_clip(right[i]);
    }
}

void pcm16_mean(const uint8_t *const *plane, int32_t channels, int32_t skip, int16_t *out,
                int32_t count) {
    const auto channel = [&](int32_t c) {
        return reinterpret_cast<const float *>(plane[c]) + skip;
    };
    const float *first = channel(0);
    if (channels == 1) {
        for (ptrdiff_t i = 0; i < count; ++i) out[i] = round_clip(first[i]);
    } else if (channels == 2) {
        const float *second = channel(1);
        for (ptrdiff_t i = 0; i < count; ++i) {
            out[i] = static_cast<int16_t>((round_clip(first[i]) + round_clip(second[i])) / 2);
        }
    } else {
        for (ptrdiff_t i = 0; i < count; ++i) {
            int32_t sum = 0;
            for (int32_t c = 0; c < channels; ++c) sum += round_clip(channel(c)[i]);
            out[i] = static_cast<int16_t>(sum / channels);
        }
    }
}
