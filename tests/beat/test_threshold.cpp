#include <gtest/gtest.h>

#include <algorithm>

#include "beat/candidates.h"
#include "beat/threshold.h"
#include "tests/beat/beat_fixture.h"

namespace {

double percentile(const std::vector<double> &env, int64_t start, int64_t count) {
    std::vector<double> window(env.begin() + start, env.begin() + start + count);
    std::sort(window.begin(), window.end());
    return window[static_cast<size_t>(count * 97 / 100)];
}

// The curve of an envelope of F entries, each place by itself.
std::vector<double> plain_threshold(const std::vector<double> &env, int64_t window) {
    const int64_t frames = static_cast<int64_t>(env.size());
    const int64_t count = frames - 1;
    const int64_t half = window / 2;
    std::vector<double> thr(static_cast<size_t>(count));
    const auto at = [&](int64_t i) -> double & { return thr[static_cast<size_t>(i)]; };
    double top = 0.0;
    for (int64_t i = half; i <= std::max(half, count - half) && count - window >= -3; ++i) {
        at(i) = percentile(env, i - half, std::min(window, frames - (i - half)));
        top = std::max(top, at(i));
    }
    const int64_t tail = std::max<int64_t>(count - half, 1);
    const double slope = (top - at(tail - 1)) / (static_cast<double>(window) * 0.5);
    for (int64_t i = tail; i < count; ++i) {
        at(i) = top - slope * static_cast<double>(count - i);
    }
    for (int64_t i = 21; i < std::min(half, count); ++i) {
        at(i) = percentile(env, i - 21, std::min<int64_t>(43, frames - (i - 21)));
    }
    return thr;
}

}  // namespace

// Songs from two frames on, and around the lengths at which windows begin to fit; values repeat.
TEST(Threshold, EqualsASortForEachPlace) {
    const struct {
        int32_t bpm;
        int64_t window;
    } tempi[] = {{200, 44}, {121, 44}, {120, 86}, {81, 86},  {80, 130}, {61, 130}, {60, 172},
                 {48, 216}, {41, 216}, {40, 258}, {35, 258}, {34, 302}, {30, 344}};
    std::mt19937 random(7);
    for (const auto &tempo : tempi) {
        std::vector<int64_t> lengths = {2, 3, 21, 22, 23, 44, 1000, 1501};
        for (int64_t near = -6; near <= 7; ++near) {
            lengths.push_back(tempo.window + near);
            lengths.push_back(tempo.window / 2 + near + 20);
        }
        for (const int64_t frames : lengths) {
            working_context work(frames);
            std::vector<double> env(static_cast<size_t>(frames));
            for (int64_t k = 0; k + 1 < frames; ++k) {
                env[static_cast<size_t>(k)] = static_cast<double>(random() % 300) / 8.0;
            }
            std::copy(env.begin(), env.end(), work.beat.onset_env);
            work.of.ctx.onset->bpm = tempo.bpm;
            std::vector<float> out(static_cast<size_t>(frames / 2 + 50));
            getBeatCandi_MT(&work.beat, work.of.ctx.onset, out.data());

            const std::vector<double> expected = plain_threshold(env, tempo.window);
            const std::vector<double> found(work.beat.threshold, work.beat.threshold + frames - 1);
            ASSERT_EQ(found, expected) << tempo.bpm << " BPM, " << frames << " frames";
        }
    }
}
