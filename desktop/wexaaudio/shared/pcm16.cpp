#include "desktop/wexaaudio/shared/pcm16.h"

#include <cstring>

namespace {

constexpr float kScale = 32768.0F;

// Adding 1.5 x 2^23 leaves the nearest integer (ties to even, as lrintf) in the low bits of a float
// of magnitude below 2^22; unlike a call of lrintf, the compiler turns this into vector code.
constexpr float kRoundMagic = 12582912.0F;
constexpr int32_t kRoundMagicBits = 0x4B400000;

inline int16_t round_clip(float sample) {
    float v = sample == sample ? sample * kScale : 0.0F;  // not a number: silence
    v = v < 32767.0F ? v : 32767.0F;
    v = v > -32768.0F ? v : -32768.0F;
    const float shifted = v + kRoundMagic;
    int32_t bits = 0;
    memcpy(&bits, &shifted, sizeof bits);
    return static_cast<int16_t>(bits - kRoundMagicBits);
}

inline int16_t round_clip(int32_t sample) {
    const int32_t high = (sample >> 16) + ((sample >> 15) & 1);
    return static_cast<int16_t>(high > 32767 ? 32767 : high);
}

}  // namespace

void pcm16_from_float(const float *in, ptrdiff_t in_step, int16_t *out, ptrdiff_t out_step,
                      int32_t count) {
    for (ptrdiff_t i = 0; i < count; ++i) {
        out[i * out_step] = round_clip(in[i * in_step]);
    }
}

void pcm16_from_s32(const int32_t *in, ptrdiff_t in_step, int16_t *out, ptrdiff_t out_step,
                    int32_t count) {
    for (ptrdiff_t i = 0; i < count; ++i) {
        out[i * out_step] = round_clip(in[i * in_step]);
    }
}

void pcm16_from_s16(const int16_t *in, ptrdiff_t in_step, int16_t *out, ptrdiff_t out_step,
                    int32_t count) {
    for (ptrdiff_t i = 0; i < count; ++i) {
        out[i * out_step] = in[i * in_step];
    }
}

void pcm16_pair_from_float(const float *left, const float *right, int16_t *out, int32_t count) {
    for (ptrdiff_t i = 0; i < count; ++i) {
        out[2 * i] = round_clip(left[i]);
        out[2 * i + 1] = round_clip(right[i]);
    }
}

void pcm16_mean_from_float(const float *left, const float *right, int16_t *out, int32_t count) {
    for (ptrdiff_t i = 0; i < count; ++i) {
        out[i] = static_cast<int16_t>((round_clip(left[i]) + round_clip(right[i])) / 2);
    }
}
