// PCM of constant levels, whose loudness can be reckoned by hand.
#ifndef TAVO_TESTS_HIGHLIGHT_LEVEL_STEPS_H
#define TAVO_TESTS_HIGHLIGHT_LEVEL_STEPS_H

#include <cmath>
#include <cstdint>
#include <vector>

struct LEVEL {
    int64_t samples;
    double square;  // about their mean square, on the scale of full range = 1
};

// Each level in turn, alternating in sign.
inline std::vector<int16_t> levels(const std::vector<LEVEL> &list) {
    std::vector<int16_t> pcm;
    for (const LEVEL &each : list) {
        const int16_t peak = static_cast<int16_t>(std::lround(32767.0 * std::sqrt(each.square)));
        for (int64_t i = 0; i < each.samples; i++) {
            pcm.push_back(static_cast<int16_t>(i % 2 == 0 ? peak : -peak));
        }
    }
    return pcm;
}

#endif
