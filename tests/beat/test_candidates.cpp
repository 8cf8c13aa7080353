#include <gtest/gtest.h>

#include <algorithm>
#include <tuple>

#include "beat/candidates.h"
#include "beat/gap_fill.h"
#include "tests/beat/beat_fixture.h"

namespace {

using frames = std::vector<int64_t>;

struct peak {
    int64_t frame;
    double height;
};

// kept_out: peaks followed by a plateau, which is not a peak. With two larger values in its window
// a peak equals the 97th percentile and does not exceed it.
struct envelope {
    int64_t length;
    int32_t bpm;
    std::vector<peak> peaks, kept_out = {};
    std::vector<int32_t> rises = {};
    int32_t max_beats = 0, plateau = 2;
    float frame_s = static_cast<float>(kHop);
};

// The frames of the beats' peaks: a beat is two hops after the start of its frame.
frames beats_of(const envelope &env) {
    working_context work(env.length);
    TAVO_BEAT_CTX *beat = &work.beat;
    for (const peak &p : env.peaks) beat->onset_env[p.frame] = p.height;
    for (const peak &p : env.kept_out) {
        beat->onset_env[p.frame] = p.height;
        std::fill_n(beat->onset_env + p.frame + 10, env.plateau, 10.0);
    }
    beat->frame_times[0] = env.frame_s;
    beat->rise_count = static_cast<int32_t>(env.rises.size());
    beat->rise_frames = zeroed_items<int32_t>(beat->rise_count);
    std::copy(env.rises.begin(), env.rises.end(), beat->rise_frames);
    work.of.ctx.onset->bpm = env.bpm;
    work.of.ctx.onset->max_beats = env.max_beats;
    std::vector<float> out(static_cast<size_t>(candidate_capacity(beat)));
    out.resize(static_cast<size_t>(getBeatCandi_MT(beat, work.of.ctx.onset, out.data())));
    frames found;
    for (const float ms : out) {
        const double hops = static_cast<double>(ms) / 1000.0 / kHop;
        EXPECT_NEAR(hops, std::round(hops), 1e-3);
        found.push_back(std::lround(hops) - 2);
    }
    return found;
}

}  // namespace

// 120 BPM: beats at least 43 frames apart, the larger first. -1 and 0 mean no limit.
TEST(Candidates, LargerPeaksAreChosenUpToTheLimit) {
    EXPECT_EQ(beats_of({1, 90, {}}), frames{});
    EXPECT_EQ(beats_of({500, 0, {{100, 5}}}), frames{});
    envelope env = {1000, 120, {{100, 5}, {110, 4}, {143, 5}, {200, 6}, {242, 5}, {400, 5}}};
    for (const int32_t none : {0, -1}) {
        env.max_beats = none;
        EXPECT_EQ(beats_of(env), (frames{100, 143, 200, 400}));
    }
    env.max_beats = 1;
    EXPECT_EQ(beats_of(env), frames{200});
    for (const double value : {double{NAN}, double{INFINITY}, 1.0}) {
        for (int64_t frame = 0; frame < 999; ++frame) env.peaks.push_back({frame, value});
        EXPECT_EQ(beats_of(env), frames{}) << value;
    }
}

// Frames of 0.45 s: no two peaks are too close, so the list is full. The percentile of any four
// frames is the largest value.
TEST(Candidates, APeakInEveryOtherFrameIsNeverAboveTheThreshold) {
    envelope env = {300, 96, {}};
    env.frame_s = 0.45f;
    for (int64_t frame = 1; frame < 299; frame += 2) env.peaks.push_back({frame, 5});
    EXPECT_EQ(beats_of(env), frames{});
}

// At 40 BPM the window has 258 frames. In a song of one less, the eighth largest value is the top
// of the line to the end: at frame 200, 73 of 129 steps up to it.
TEST(Candidates, AWindowThatNearlyFitsIsCut) {
    EXPECT_EQ(beats_of({257, 40, {}, {{200, 5.6}}, {}, 0, 8}), frames{});
    EXPECT_EQ(beats_of({257, 40, {}, {{200, 5.7}}, {}, 0, 8}), frames{200});
}

// 96 BPM: beats two periods apart, 1.25 s. From 95 BPM down at least 3 s: five periods, 3.158 s. A
// gap is filled when longer than 3 s, 129.2 frames, or at 40 BPM 6 s, not three spans: 258.4
// frames.
TEST(Candidates, LeastDistanceAndLongGapDependOnTheTempo) {
    const std::tuple<int32_t, int64_t, int64_t, size_t> cases[] = {
        {96, 52, 0, 1},    {96, 53, 0, 2},    {95, 134, 0, 1},   {95, 135, 0, 2},
        {120, 129, 50, 2}, {120, 130, 50, 3}, {40, 258, 129, 2}, {40, 259, 129, 3}};
    for (const auto &[bpm, distance, middle, beats] : cases) {
        envelope env = {1200, bpm, {{300, 20}, {300 + distance, 21}}};
        if (middle > 0) env.kept_out = {{300 + middle, 2}};
        env.plateau = 15;
        EXPECT_EQ(beats_of(env).size(), beats) << bpm << " BPM, " << distance << " frames";
    }
}

// Both rises select the peak at 300, to which 330 is too close; without them the stronger fills the
// gap. The last peak is never selected: an ordinary one then needs no threshold.
TEST(Candidates, ARiseNeedsNoThreshold) {
    envelope env = {1000, 120, {{100, 20}, {400, 21}}, {{300, 2}, {330, 3}}};
    EXPECT_EQ(beats_of(env), (frames{100, 330, 400}));
    env.rises = {290, 310};
    EXPECT_EQ(beats_of(env), (frames{100, 300, 300, 400}));
    EXPECT_EQ(beats_of({400, 120, {{300, 5}}, {{200, 9}}}), frames{300});
    EXPECT_EQ(beats_of({400, 120, {{300, 5}}, {{200, 9}}, {350}}), (frames{200, 300}));
}

TEST(Candidates, LongGapsGetTheirStrongestPeaks) {
    envelope env = {
        1000, 120, {{100, 20}, {800, 21}}, {{200, 1}, {300, 2}, {400, 3}, {500, 4}, {600, 5}}};
    EXPECT_EQ(beats_of(env), (frames{100, 200, 300, 400, 500, 600, 800}));
    env.kept_out.push_back({700, 2.5});  // a sixth: the weakest stays out
    EXPECT_EQ(beats_of(env), (frames{100, 300, 400, 500, 600, 700, 800}));
    env.max_beats = 1;  // no gap
    EXPECT_EQ(beats_of(env), frames{800});
}

// Five fit each gap. Nine gaps have 45, not more than 45, so a tenth is filled and no eleventh.
TEST(Candidates, FiftyAreAddedAtMost) {
    envelope env = {4300, 120, {}};
    for (int64_t k = 0; k <= 12; ++k) {
        env.peaks.push_back({100 + 320 * k, 20.0 + static_cast<double>(k)});
        for (int64_t t = 1; t <= 5 && k < 12; ++t) {
            env.kept_out.push_back(
                {100 + 320 * k + 48 * t, 1.0 + static_cast<double>(12 * t + k) / 99});
        }
    }
    EXPECT_EQ(beats_of(env).size(), 13u + 50u);
    env.max_beats = 3;
    EXPECT_EQ(beats_of(env).size(), 3u + 10u);
}

// Of 3, 9, 3 and 2, the two equal ones give the first of them twice.
TEST(Candidates, EqualPeaksAppearTwice) {
    const double heights[] = {0, 1, 0, 3, 0, 9, 0, 3, 0, 2};
    const int32_t peaks[] = {1, 3, 5, 7, 9};
    int32_t dst[3];
    ASSERT_EQ(bringMoreBeat(0, 99, dst, peaks, 5, 3, heights), 3);
    EXPECT_EQ(std::vector<int32_t>(dst, dst + 3), (std::vector<int32_t>{5, 3, 3}));
}
