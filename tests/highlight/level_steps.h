// PCM of constant levels, whose loudness can be reckoned by hand.
#ifndef TAVO_TESTS_HIGHLIGHT_LEVEL_STEPS_H
#define TAVO_TESTS_HIGHLIGHT_LEVEL_STEPS_H

#include <cmath>
#include <cstdint>
#include <vector>

// Samples whose mean square, on the scale of full range = 1, is about square, alternating in sign.
inline void add_level(std::vector<int16_t> *pcm, int64_t samples, double square) {
    const int16_t level = static_cast<int16_t>(std::lround(32767.0 * std::sqrt(square)));
    for (int64_t i = 0; i < samples; i++) {
        pcm->push_back(static_cast<int16_t>(i % 2 == 0 ? level : -level));
    }
}

#endif
