#include <gtest/gtest.h>

#include <vector>

#include "highlight/tune.h"
#include "level_steps.h"

namespace {

constexpr uint32_t kDuration = 60;  // seconds

// Frames are 1.2 s, one every 0.4 s from 3 s before the start: 27 of them over 29 steps of 0.4 s.
// squares: mean square of each step from the first frame on, the last one repeated.
std::vector<int16_t> steps(int32_t rate, int64_t silent_ms, const std::vector<double> &squares) {
    std::vector<LEVEL> list = {{silent_ms * rate / 1000, 0.0}};
    const int64_t step = static_cast<int64_t>(0.4 * rate);
    for (size_t k = 0; k < 30; k++) {
        list.push_back({step, k < squares.size() ? squares[k] : squares.back()});
    }
    return levels(list);
}

std::vector<double> silence_then(const std::vector<double> &squares) {
    std::vector<double> all(13, 0.0);
    all.insert(all.end(), squares.begin(), squares.end());
    return all;
}

uint32_t tuned(const std::vector<int16_t> &pcm, uint32_t duration_s = kDuration) {
    return _tune_HL_simple(pcm.data(), 8000, 3000, duration_s);
}

TEST(Tune, StartsThatAreLeftAlone) {
    for (const uint32_t start : {0u, 2000u, 51001u, 52000u, 70000u}) {
        EXPECT_EQ(_tune_HL_simple(nullptr, 8000, start, kDuration), start);
    }
    for (const int32_t rate : {-8000, 0, 2}) {  // 2: a hop of no sample
        EXPECT_EQ(_tune_HL_simple(nullptr, rate, 20000, kDuration), 20000u) << rate;
    }
}

// Frame k covers steps k to k + 2. Mean squares from frame 10 on: 0, 0.2, 0.3, 0.3, 0.2, 0.3, 0.3,
// 0.2, 0: the largest rise is at 10, the only fall of its five steps leads from 13 to 14.
TEST(Tune, MovesToTheStepBeforeTheFall) {
    const auto song = silence_then({0.6, 0.3, 0.0, 0.3, 0.6, 0.0});
    for (int32_t rate : {8000, 11025, 22051, 44100}) {
        const std::vector<int16_t> pcm = steps(rate, 17000, song);
        EXPECT_EQ(_tune_HL_simple(pcm.data(), rate, 20000, kDuration), 22200u) << rate;
    }
    const std::vector<int16_t> at_once = steps(8000, 0, song);
    EXPECT_EQ(tuned(at_once), 5200u);
    EXPECT_EQ(tuned(at_once, 12), 5200u);  // 9 s left exactly
    EXPECT_EQ(tuned(at_once, 11), 3000u);
}

// A step to square c: the rise at frame 10 is (c/3 + 2c/3 + 3c) / 5 = 0.8 c on average, about
// 3.47 c dB; after it the first of the two equal steps of 0, from 13 to 14, is taken.
TEST(Tune, OnlyRisesAboveTheLeastCount) {
    EXPECT_EQ(tuned(steps(8000, 0, silence_then({0.045}))), 5200u);
    EXPECT_EQ(tuned(steps(8000, 0, silence_then({0.033}))), 3000u);
    EXPECT_EQ(tuned(steps(8000, 0, {0.5})), 3000u);
    // Five steps of c: the rise counts the fifth frame, still c, not the sixth of 2 c / 3, and with
    // it reaches the least that counts; each alone would be 0.8 c or 0.73 c.
    const double c = 0.039;
    EXPECT_EQ(tuned(steps(8000, 0, silence_then({c, c, c, c, c, 0.0}))), 5200u);
}

// Also the first frame may be the one before the rise; 3 to 4 is the first of the level steps.
TEST(Tune, ARiseAtTheFirstFrame) {
    EXPECT_EQ(tuned(steps(8000, 0, {0.0, 0.0, 0.0, 0.5})), 1200u);
}

// Two equal steps up, with a break between them long enough to give equal rises.
TEST(Tune, TheFirstOfEqualRises) {
    const std::vector<double> pulse = {0, 0, 0, 0, 0, 0, 0.5, 0.5, 0.5, 0.5, 0.5, 0, 0, 0, 0, 0, 0};
    std::vector<double> song = pulse;
    song.insert(song.end(), pulse.begin() + 5, pulse.end());
    // Rise at frame 3 (steps 3 to 5 silent); after it 4, 5, 6 rise, 6 to 7 and 7 to 8 are level.
    EXPECT_EQ(tuned(steps(8000, 0, song)), 6u * 400u);
}

}  // namespace
