#include "desktop/wexaaudio/av/pcm16.h"

#include <cstddef>
#include <cstring>

namespace {

// Vectors of four samples, using the compiler's vector extension.
typedef float float_quad __attribute__((vector_size(16)));
typedef int32_t int_quad __attribute__((vector_size(16)));
typedef uint32_t bits_quad __attribute__((vector_size(16)));
constexpr ptrdiff_t kQuad = 4;
static_assert(__BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__);  // pcm16_pair packs two samples

constexpr float kScale = 32768.0f;

// Adding 1.5 x 2^23 to a float whose magnitude is below 2^22 leaves the nearest integer (ties to
// even, like lrintf) in the low bits of the sum.
constexpr float kRoundMagic = 12582912.0f;
constexpr int32_t kRoundMagicBits = 0x4B400000;

// Converts `count` samples (1 to kQuad) to 16-bit integers. The other lanes are 0.
inline int_quad round_clip(const float *samples, ptrdiff_t count) {
    constexpr float_quad kMost = {32767.0f, 32767.0f, 32767.0f, 32767.0f};
    float_quad in = {};
    memcpy(&in, samples, static_cast<size_t>(count) * sizeof *samples);
    float_quad v = in * kScale;
    v = in == in ? v : float_quad{};
    v = v < kMost ? v : kMost;
    v = v > -kScale ? v : float_quad{} - kScale;
    const float_quad shifted = v + kRoundMagic;
    int_quad bits;
    memcpy(&bits, &shifted, sizeof bits);
    return bits - kRoundMagicBits;
}

// Calls step(first index, number of samples) for each group of four samples and for the rest.
template <typename Step>
inline void for_quads(ptrdiff_t count, Step step) {
    ptrdiff_t i = 0;
    for (; i + kQuad <= count; i += kQuad) step(i, kQuad);
    if (i < count) step(i, count - i);
}

}  // namespace

void pcm16_pair(const float *left, const float *right, int16_t *out, int32_t count) {
    for_quads(count, [=](ptrdiff_t i, ptrdiff_t n) {
        const auto low = reinterpret_cast<bits_quad>(round_clip(left + i, n));
        const auto high = reinterpret_cast<bits_quad>(round_clip(right + i, n));
        const bits_quad pairs = (low & 0xFFFF) | high << 16;
        memcpy(out + 2 * i, &pairs, static_cast<size_t>(n) * sizeof(uint32_t));
    });
}

void pcm16_mean(const uint8_t *const *plane, int32_t channels, int32_t skip, int16_t *out,
                int32_t count) {
    for_quads(count, [=](ptrdiff_t i, ptrdiff_t n) {
        int_quad sum = {};
        for (int32_t c = 0; c < channels; ++c) {
            sum += round_clip(reinterpret_cast<const float *>(plane[c]) + skip + i, n);
        }
        if (channels == 2) {
            sum = (sum - (sum >> 31)) >> 1;  // divides by 2, toward zero
        } else if (channels > 2) {
            sum /= channels;
        }
        for (ptrdiff_t k = 0; k < n; ++k) out[i + k] = static_cast<int16_t>(sum[k]);
    });
}
