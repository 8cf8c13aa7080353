#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <vector>

#include "desktop/wexaaudio/av/pcm16.cpp"  // its library does not export these functions

namespace {

int16_t convert(float sample) {
    if (std::isnan(sample)) return 0;
    return static_cast<int16_t>(std::lrint(std::clamp(sample * 32768.0f, -32768.0f, 32767.0f)));
}

// The input includes infinities, NaN and all values halfway between two 16-bit samples.
TEST(Pcm16, EqualsRoundingOneByOne) {
    constexpr uint64_t kStep = 9973;
    std::vector<float> left;
    for (uint64_t bits = 0; bits <= UINT32_MAX; bits += kStep) {
        left.push_back(0.0f);
        memcpy(&left.back(), &bits, sizeof(float));
    }
    for (int half = -65'540; half <= 65'540; ++half) {
        left.push_back(static_cast<float>(half) / 65'536.0f);
    }
    left.insert(left.end(), {INFINITY, -INFINITY, NAN});
    const std::vector<float> right(left.rbegin(), left.rend());
    const auto count = static_cast<int32_t>(left.size());
    std::vector<int16_t> pairs(2 * left.size()), mean(left.size());
    pcm16_pair(left.data(), right.data(), pairs.data(), count);
    const uint8_t *planes[] = {reinterpret_cast<const uint8_t *>(left.data()),
                               reinterpret_cast<const uint8_t *>(right.data()),
                               reinterpret_cast<const uint8_t *>(left.data())};
    for (int32_t channels = 1; channels <= 3; ++channels) {
        pcm16_mean(planes, channels, 1, mean.data(), count - 1);
        for (size_t i = 1; i < left.size(); ++i) {
            const int l = convert(left[i]), r = convert(right[i]);
            ASSERT_EQ(pairs[2 * i], l) << left[i];
            ASSERT_EQ(pairs[2 * i + 1], r) << right[i];
            const int sum = channels == 1 ? l : channels == 2 ? l + r : l + r + l;
            ASSERT_EQ(mean[i - 1], sum / channels) << left[i] << ' ' << right[i];
        }
    }
}

}  // namespace
