#include "beat/candidates.h"
#include "beat/gap_fill.h"
#include "tests/beat/beat_fixture.h"

namespace {

using frames = std::vector<int64_t>;

struct peak {
    int64_t frame;
    double height;
};

// An envelope of peaks. A plateau of larger values follows each `unselected` peak and raises the
// threshold above the peak.
struct envelope {
    int64_t length;
    int32_t bpm;
    std::vector<peak> peaks, unselected = {};
    std::vector<int32_t> rises = {};
    int32_t max_beats = 0, plateau = 2;
    float frame_s = static_cast<float>(kHop);
};

// Returns the analysis frames whose peaks became beats. A beat is two hops after the frame's start.
frames find_beats(const envelope &env) {
    working_context work(env.length);
    TAVO_BEAT_CTX *beat = &work.beat;
    for (const peak &p : env.peaks) beat->onset_env[p.frame] = p.height;
    for (const peak &p : env.unselected) {
        beat->onset_env[p.frame] = p.height;
        std::fill_n(beat->onset_env + p.frame + 10, env.plateau, 10.0);
    }
    beat->frame_times[0] = env.frame_s;
    work.set_rises(env.rises);
    work.signal.ctx.onset->bpm = env.bpm;
    work.signal.ctx.onset->max_beats = env.max_beats;
    std::vector<float> out(static_cast<size_t>(candidate_capacity(beat)));
    out.resize(static_cast<size_t>(getBeatCandi_MT(beat, work.signal.ctx.onset, out.data())));
    frames found;
    for (const float ms : out) {
        const double hops = static_cast<double>(ms) / 1000.0 / kHop;
        EXPECT_NEAR(hops, std::round(hops), 1e-3);
        found.push_back(std::lround(hops) - 2);
    }
    return found;
}

}  // namespace

// At 120 BPM, beats are at least 43 frames apart. A max_beats of 0 or -1 sets no limit.
TEST(Candidates, LargerPeaksComeFirst) {
    EXPECT_EQ(find_beats({1, 90, {}}), frames{});
    EXPECT_EQ(find_beats({500, 0, {{100, 5}}}), frames{});
    envelope env = {1000, 120, {{100, 5}, {110, 4}, {143, 5}, {200, 6}, {242, 5}, {400, 5}}};
    for (const int32_t none : {0, -1}) {
        env.max_beats = none;
        EXPECT_EQ(find_beats(env), (frames{100, 143, 200, 400}));
    }
    env.max_beats = 1;
    EXPECT_EQ(find_beats(env), frames{200});
    for (const double value : {double{NAN}, double{INFINITY}, 1.0}) {
        for (int64_t frame = 0; frame < 999; ++frame) env.peaks.push_back({frame, value});
        EXPECT_EQ(find_beats(env), frames{}) << value;
    }
}

// At 40 BPM, the threshold's window exceeds this song by one frame and is cut. The threshold at
// frame 200 is between 5.6 and 5.7.
TEST(Candidates, WindowThatNearlyFitsIsCut) {
    EXPECT_EQ(find_beats({257, 40, {}, {{200, 5.6}}, {}, 0, 8}), frames{});
    EXPECT_EQ(find_beats({257, 40, {}, {{200, 5.7}}, {}, 0, 8}), frames{200});
}

// The smallest distance between beats is 3 s at up to 95 BPM and 1 s at higher tempos, rounded up
// to whole beat periods. A gap is filled if it exceeds three such distances or lasts 6 s.
TEST(Candidates, SmallestDistanceAndLongGapDependOnTheTempo) {
    const std::tuple<int32_t, int64_t, int64_t, size_t> cases[] = {
        {96, 52, 0, 1},    {96, 53, 0, 2},    {95, 134, 0, 1},   {95, 135, 0, 2},
        {120, 129, 50, 2}, {120, 130, 50, 3}, {40, 258, 129, 2}, {40, 259, 129, 3}};
    for (const auto &[bpm, distance, middle, beats] : cases) {
        envelope env = {1200, bpm, {{300, 20}, {300 + distance, 21}}};
        if (middle > 0) env.unselected = {{300 + middle, 2}};
        env.plateau = 15;
        EXPECT_EQ(find_beats(env).size(), beats) << bpm << " BPM, " << distance << " frames";
    }
}

// The peak nearest to a rise becomes a beat, and other peaks near it are ignored. If the nearest
// peak is the song's last one, the highest peak becomes a beat instead.
TEST(Candidates, RiseNeedsNoThreshold) {
    envelope env = {1000, 120, {{100, 20}, {400, 21}}, {{300, 2}, {330, 3}}};
    EXPECT_EQ(find_beats(env), (frames{100, 330, 400}));
    env.rises = {290, 310};
    EXPECT_EQ(find_beats(env), (frames{100, 300, 300, 400}));
    EXPECT_EQ(find_beats({400, 120, {{300, 5}}, {{200, 9}}}), frames{300});
    EXPECT_EQ(find_beats({400, 120, {{300, 5}}, {{200, 9}}, {350}}), (frames{200, 300}));
}

TEST(Candidates, LongGapsGetTheirStrongestPeaks) {
    envelope env = {
        1000, 120, {{100, 20}, {800, 21}}, {{200, 1}, {300, 2}, {400, 3}, {500, 4}, {600, 5}}};
    EXPECT_EQ(find_beats(env), (frames{100, 200, 300, 400, 500, 600, 800}));
    env.unselected.push_back({700, 2.5});  // a gap gets its five strongest
    EXPECT_EQ(find_beats(env), (frames{100, 300, 400, 500, 600, 700, 800}));
}

// Each of the twelve gaps has five peaks. Once 46 beats have been added, no more gaps are filled.
TEST(Candidates, AtMostFiftyBeatsAreAdded) {
    envelope env = {4300, 120, {}};
    for (int64_t k = 0; k <= 12; ++k) {
        env.peaks.push_back({100 + 320 * k, 20.0 + static_cast<double>(k)});
        for (int64_t t = 1; t <= 5 && k < 12; ++t) {
            env.unselected.push_back(
                {100 + 320 * k + 48 * t, 1.0 + static_cast<double>(12 * t + k) / 99});
        }
    }
    EXPECT_EQ(find_beats(env).size(), 13u + 50u);
    env.max_beats = 3;
    EXPECT_EQ(find_beats(env).size(), 3u + 10u);
}

// If two peaks are equal, the first one is returned twice.
TEST(Candidates, EqualPeaksAppearTwice) {
    const double heights[] = {0, 1, 0, 3, 0, 9, 0, 3, 0, 2};
    const int32_t peaks[] = {1, 3, 5, 7, 9};
    int32_t dst[3];
    ASSERT_EQ(bringMoreBeat(0, 99, dst, peaks, 5, 3, heights), 3);
    EXPECT_EQ(std::vector<int32_t>(dst, dst + 3), (std::vector<int32_t>{5, 3, 3}));
}
