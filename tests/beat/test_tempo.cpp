#include "beat/tempo.h"
#include "tests/beat/beat_fixture.h"

namespace {

struct pulse_pair {
    size_t first, lag;  // frames
    double weight;
};

int32_t estimate(std::vector<double> env, const std::vector<pulse_pair> &pairs = {}) {
    for (const pulse_pair &pair : pairs) {
        env[pair.first] = 1.0;
        env[pair.first + pair.lag] = pair.weight;
    }
    TAVO_BEAT_CTX beat = {};
    beat.onset_env = env.data();
    beat.frame_count = static_cast<int64_t>(env.size());
    beat.hop_seconds = kHop;
    return estimate_tempo(&beat);
}

}  // namespace

// Each pair of pulses correlates only at its own lag. A lag of 20 frames is 129 BPM, one of 27 is
// 95 BPM. Two rows that differ only in a weight show where a different tempo begins to win.
TEST(Tempo, BestScoreOfTwoOrThreePeriodsWins) {
    const struct {
        std::vector<std::pair<size_t, double>> weights;  // of each lag
        int32_t bpm;
    } cases[] = {
        {{{13, 1}}, 198},
        {{{12, 1}}, 90},            // 215 BPM is outside the range
        {{{18, 1}, {26, 1}}, 143},  // on both sides of 120 BPM, which is preferred
        {{{18, 1}, {26, 1.01}}, 99},
        // Correlations at twice the lag and at its neighbours raise the score.
        {{{20, 1}, {40, 1}, {27, 1.385}}, 129},
        {{{20, 1}, {40, 1}, {27, 1.42}}, 95},
        {{{20, 1}, {39, 1}, {41, 1}, {27, 1.371}}, 129},
        {{{20, 1}, {39, 1}, {41, 1}, {27, 1.434}}, 95},
        // Correlations at three times the lag and at its neighbours raise the score, too.
        {{{20, 1}, {59, 1}, {60, 1}, {61, 1}, {27, 1.385}}, 129},
        {{{20, 1}, {59, 1}, {60, 1}, {61, 1}, {27, 1.413}}, 95},
        {{{20, 1}, {59, 1}, {27, 1.1}}, 129},
        // A tempo wins over half that tempo unless the slower one correlates much more.
        {{{20, 1}, {40, 1.30}}, 129},
        {{{20, 1}, {40, 1.33}}, 64},
        // The longest lag scored with its double is 42. The longest scored with its triple is 27.
        {{{42, 1}, {27, 0.475}}, 61},
        {{{27, 1}, {81, 5.6}}, 31},
    };
    for (const auto &c : cases) {
        std::vector<pulse_pair> pairs;
        for (const auto &[lag, weight] : c.weights)
            pairs.push_back({100 + 200 * pairs.size(), lag, weight});
        EXPECT_EQ(estimate(std::vector<double>(2584), pairs), c.bpm) << c.weights.back().second;
    }
}

// The tempo is that of the second minute, or of the last one if the song is shorter than two
// minutes. The stronger pair of pulses, 20 frames apart, counts only inside that minute.
TEST(Tempo, DependsOnOneMinuteOnly) {
    const std::tuple<size_t, size_t, int32_t> cases[] = {{7750, 2583, 129}, {7750, 2582, 95},
                                                         {7750, 5146, 129}, {7750, 5147, 95},
                                                         {3000, 416, 129},  {3000, 415, 95}};
    for (const auto &[length, first, bpm] : cases) {
        const std::vector<double> silence(length);
        EXPECT_EQ(estimate(silence, {{2900, 27, 0.5}, {first, 20, 1.0}}), bpm) << first;
    }
}

// Regular pulses have a tempo even in a short excerpt. A song without a period, such as silence,
// has 90 BPM; calc_bpm_acf then returns a value above every tempo.
TEST(Tempo, ShortExcerptsAndSilenceHaveATempo) {
    for (const auto &[length, period, bpm] :
         {std::tuple{1290u, 20u, 129},  // half a minute
          {42u, 20u, 129},              // one second
          {10u, 4u, 80}}) {             // pulses 4 frames apart also match at a lag of 32
        std::vector<double> env(length);
        for (size_t i = 0; i < length; i += period) env[i] = 1.0;
        EXPECT_EQ(estimate(env), bpm) << length << " frames, period " << period;
    }
    for (const double value : {0.0, double{NAN}, double{INFINITY}}) {
        std::vector<double> env(64);
        env[5] = value;
        EXPECT_EQ(estimate(env), 90) << value;
        EXPECT_GT(calc_bpm_acf(env.data(), 64, 3, 64, kHop), 200) << value;
    }
}
