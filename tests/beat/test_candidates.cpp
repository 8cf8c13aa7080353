#include <gtest/gtest.h>

#include <algorithm>

#include "beat/candidates.h"
#include "tests/beat/beat_fixture.h"

namespace {

using frames = std::vector<int64_t>;

// An envelope set up by hand; one at a time, for the working context's locks are process-wide.
// Three values at least as high must lie in the window around a peak before the 97th percentile
// keeps it out: a plateau does that, and is no peak itself.
struct envelope : working_context {
    envelope(int64_t length, int32_t bpm) : working_context(length) { of.ctx.onset->bpm = bpm; }

    void peak(int64_t frame, double height) { beat.onset_env[frame] = height; }
    void kept_out(int64_t frame, double height) {
        peak(frame, height);
        std::fill(beat.onset_env + frame + 10, beat.onset_env + frame + 15, 10.0);
    }
    void rises(const std::vector<int32_t> &at) {
        beat.rise_count = static_cast<int32_t>(at.size());
        beat.rise_frames = static_cast<int32_t *>(calloc(at.size(), sizeof(int32_t)));
        std::copy(at.begin(), at.end(), beat.rise_frames);
    }
    // The frames of the peaks behind the beats: a beat lies two hops after its frame's start.
    frames place(int32_t max_beats = 0) {
        of.ctx.onset->max_beats = max_beats;
        std::vector<float> out(static_cast<size_t>(candidate_room(&beat)));
        out.resize(static_cast<size_t>(getBeatCandi_MT(&beat, of.ctx.onset, out.data())));
        frames found;
        for (const float ms : out) {
            const double hops = static_cast<double>(ms) / 1000.0 / kHop;
            EXPECT_NEAR(hops, std::round(hops), 1e-3);
            found.push_back(std::lround(hops) - 2);
        }
        return found;
    }
};

}  // namespace

// 120 BPM: beats at least 43 frames apart, the larger first. -1 and 0 mean no limit.
TEST(Candidates, PeaksAndTheirLimit) {
    EXPECT_EQ(envelope(1, 90).place(), frames{});
    EXPECT_EQ(envelope(500, 0).place(), frames{});
    envelope env(1000, 120);
    for (const int64_t frame : {100, 143, 200, 242, 400}) env.peak(frame, 5.0);
    env.peak(200, 6.0);
    env.peak(110, 4.0);
    EXPECT_EQ(env.place(), (frames{100, 143, 200, 400}));
    EXPECT_EQ(env.place(-1).size(), 4u);
    EXPECT_EQ(env.place(1), frames{200});
    for (const double value : {double{NAN}, double{INFINITY}, 1.0}) {
        std::fill(env.beat.onset_env, env.beat.onset_env + 999, value);
        EXPECT_EQ(env.place(), frames{}) << value;
    }
}

// 96 BPM: beats two periods apart, 1.25 s. From 95 BPM down at least 3 s: five periods, 3.158 s.
// A peak that the threshold keeps out comes back in gaps longer than 3 s, 129.2 frames at 120 BPM;
// at 40 BPM 6 s are enough, 258.4 frames, though three spans are 9 s.
TEST(Candidates, DistancesThatCount) {
    const struct {
        int32_t bpm;
        int64_t distance, middle;
        size_t beats;
    } cases[] = {{96, 52, 0, 1},    {96, 53, 0, 2},    {95, 134, 0, 1},   {95, 135, 0, 2},
                 {120, 129, 50, 2}, {120, 130, 50, 3}, {40, 258, 129, 2}, {40, 259, 129, 3}};
    for (const auto &c : cases) {
        envelope env(1200, c.bpm);
        env.peak(300, 20.0);
        env.peak(300 + c.distance, 21.0);
        if (c.middle > 0) {
            env.kept_out(300 + c.middle, 2.0);
            // Enough plateaus for the slow tempo's longer window (third, eighth largest).
            std::fill_n(env.beat.onset_env + 320 + c.middle, 9, 10.0);
        }
        EXPECT_EQ(env.place().size(), c.beats) << c.bpm << " BPM, " << c.distance << " frames";
    }
}

// At 120 BPM both rises take the peak at 300, so the beat appears twice, and 330 lies too close to
// it.
TEST(Candidates, ARiseNeedsNoThreshold) {
    envelope env(1000, 120);
    env.peak(100, 20.0);
    env.kept_out(300, 2.0);
    env.kept_out(330, 3.0);
    env.peak(400, 21.0);
    EXPECT_EQ(env.place(), (frames{100, 330, 400}));  // a gap of 300 frames, over 3 spans
    env.rises({290, 310});
    EXPECT_EQ(env.place(), (frames{100, 300, 300, 400}));
}

// The last peak serves no rise: an ordinary one then takes the place that needs no threshold.
TEST(Candidates, ARiseWithoutAPeakLeavesItsPlace) {
    envelope last(400, 120);
    last.kept_out(200, 9.0);
    last.peak(300, 5.0);
    EXPECT_EQ(last.place(), frames{300});
    last.rises({350});
    EXPECT_EQ(last.place(), (frames{200, 300}));
}

TEST(Candidates, GapsAreFilled) {
    envelope env(1000, 120);
    env.peak(100, 20.0);
    env.peak(800, 21.0);
    for (int64_t k = 0; k < 5; ++k) env.kept_out(200 + 100 * k, 1.0 + static_cast<double>(k));
    EXPECT_EQ(env.place(), (frames{100, 200, 300, 400, 500, 600, 800}));
    env.kept_out(700, 2.5);  // a sixth: the weakest stays out
    EXPECT_EQ(env.place(), (frames{100, 300, 400, 500, 600, 700, 800}));
    EXPECT_EQ(env.place(1), frames{800});  // no gap
}

// Five fit each gap. Nine gaps have 45, not more than 45, so a tenth is filled and no eleventh.
TEST(Candidates, FiftyAreAddedAtMost) {
    envelope env(4300, 120);
    for (int64_t k = 0; k <= 12; ++k) {
        const int64_t start = 100 + 320 * k;
        env.peak(start, 20.0 + static_cast<double>(k));
        for (int64_t t = 1; t <= 5 && k < 12; ++t) {
            env.kept_out(start + 48 * t, 1.0 + static_cast<double>(12 * t + k) / 99);
        }
    }
    EXPECT_EQ(env.place().size(), 13u + 50u);
    EXPECT_EQ(env.place(3).size(), 3u + 10u);
}

// Of 3, 9, 3 and 2, the two equal ones give the first of them twice.
TEST(Candidates, EqualPeaksBetweenTwoBeats) {
    const double heights[] = {0, 1, 0, 3, 0, 9, 0, 3, 0, 2};
    const int32_t peaks[] = {1, 3, 5, 7, 9};
    int32_t dst[3];
    ASSERT_EQ(bringMoreBeat(0, 99, dst, peaks, 5, 3, heights), 3);
    EXPECT_EQ(std::vector<int32_t>(dst, dst + 3), (std::vector<int32_t>{5, 3, 3}));
}
