#include <gtest/gtest.h>

#include <vector>

#include "highlight/search.h"

namespace {

// Envelopes of 60 points (2 s each) and a largest value of 1: the normalised values are these. From
// 90 s on, edges count from point 9 on and up to point 60 - 25 = 35; below, from 0 to 50.
struct RUN {
    int count;
    float value;
};

std::vector<float> runs(const std::vector<RUN> &list, size_t points = 60) {
    std::vector<float> power;
    for (const RUN &run : list) {
        power.insert(power.end(), static_cast<size_t>(run.count), run.value);
    }
    EXPECT_EQ(power.size(), points);
    return power;
}

uint32_t search(std::vector<float> power, int32_t duration_s, int32_t hl_param = 0) {
    TAVO_HL_CTX hl = {};
    hl.hl_param = hl_param;
    hl.power = power.data();
    hl.power_count = static_cast<int32_t>(power.size());
    return _get_HL_simple(&hl, duration_s);
}

TEST(Search, TheRiseIntoTheLoudPassage) {
    auto song = runs({{20, 0.4f}, {10, 0.9f}, {1, 1.0f}, {19, 0.9f}, {10, 0.4f}});
    EXPECT_EQ(search(song, 120), 38000u);
    for (float &value : song) value *= 0.125f;  // measured by its largest
    EXPECT_EQ(search(song, 120), 38000u);
}

// Edge at 14: 0.1 to 0.45 in one step, score 0.35 + 0.35. Edge at 28: a smaller step, 0.3, but from
// 0.225 on average to 0.65, score 0.425 + 0.3.
TEST(Search, ASmallerStepWithTheBetterScoreWins) {
    const std::vector<RUN> song = {{3, 0.1f}, {1, 1.0f},  {11, 0.1f},  {6, 0.45f},
                                   {7, 0.1f}, {1, 0.35f}, {12, 0.65f}, {19, 0.1f}};
    EXPECT_EQ(search(runs(song), 120), 56000u);
}

// Edge at 13: 0.5625 + 0.4375. Edge at 30: 0.5 + 0.5. All exact in binary.
TEST(Search, OfEqualScoresTheLargerStepWins) {
    const std::vector<RUN> song = {{3, 0.125f},  {1, 1.0f},   {9, 0.125f}, {1, 0.375f},
                                   {7, 0.8125f}, {10, 0.25f}, {10, 0.75f}, {19, 0.25f}};
    EXPECT_EQ(search(runs(song), 120), 60000u);
}

TEST(Search, TheOpeningCountsInShortSongsOnly) {
    const auto song = runs({{5, 0.25f}, {10, 1.0f}, {16, 0.25f}, {10, 0.75f}, {19, 0.25f}});
    EXPECT_EQ(search(song, 180), 60000u);
    EXPECT_EQ(search(song, 90), 60000u);
    EXPECT_EQ(search(song, 89), 8000u);
}

// At the last scored point the edge itself is the answer; one later it is the point after the edge,
// as the last edge left when none passes.
TEST(Search, TheEndIsNotScored) {
    const struct {
        int rise;
        int loud;
        int32_t duration_s;
        uint32_t ms;
    } cases[] = {{35, 10, 90, 70000}, {36, 10, 90, 74000}, {35, 10, 89, 70000},
                 {36, 10, 89, 72000}, {50, 5, 89, 100000}, {51, 5, 89, 104000}};
    for (const auto &c : cases) {
        const auto song =
            runs({{c.rise + 1, 0.25f}, {c.loud, 1.0f}, {59 - c.rise - c.loud, 0.25f}});
        EXPECT_EQ(search(song, c.duration_s), c.ms) << c.rise << " in " << c.duration_s << " s";
    }
}

// Thirty loud passages, the last the loudest: it is the last one that is looked at.
TEST(Search, ThirtyPassages) {
    std::vector<RUN> passages;
    for (int k = 0; k < 29; ++k) passages.insert(passages.end(), {{4, 0.25f}, {6, 0.75f}});
    passages.insert(passages.end(), {{4, 0.25f}, {6, 1.0f}, {30, 0.25f}});
    EXPECT_EQ(search(runs(passages, 330), 660), 2000u * 293u);
}

// Bursts of two points are too short to be scored: the first edge that no valley follows closely is
// taken, at the point after it. Dips below 0.336 are low points; the valley is the last of them.
TEST(Search, WithoutAScoreAValleyNearTheEdgeRulesItOut) {
    const auto song = [](const std::vector<RUN> &after_the_edge) {
        std::vector<RUN> list = {{20, 0.5f}, {1, 1.0f}, {1, 0.9f}};
        list.insert(list.end(), after_the_edge.begin(), after_the_edge.end());
        list.insert(list.end(), {{4, 0.5f}, {2, 0.85f}, {28, 0.5f}});
        return runs(list);
    };
    auto near = song({{1, 0.3f}, {1, 0.1f}, {1, 0.4f}, {1, 0.5f}});
    EXPECT_EQ(search(near, 120), 60000u);  // the valley at 23 is 3 after 20
    near[52] = 0.1f;                       // a second one
    EXPECT_EQ(search(near, 120), 60000u);
    const auto far = song({{1, 0.5f}, {1, 0.3f}, {1, 0.1f}, {1, 0.4f}});
    EXPECT_EQ(search(far, 120), 40000u);  // at 24 it is 4 after
}

TEST(Search, ASongLoudFromItsFirstPointHasASegmentThere) {
    // One edge, at 5, inside the loud passage that is open from the start; the later rise has no
    // strict maximum. Without the segment the answer would be the point after the edge.
    const auto song =
        runs({{6, 0.75f}, {24, 1.0f}, {11, 0.25f}, {1, 0.5f}, {1, 0.75f}, {8, 0.875f}, {9, 0.25f}});
    EXPECT_EQ(search(song, 80), 10000u);
}

TEST(Search, NoRisingEdge) {
    std::vector<float> falling;
    for (int k = 0; k < 60; k++) falling.push_back(1.0f - static_cast<float>(k) / 64.0f);
    EXPECT_EQ(search(falling, 120), 0u);
    EXPECT_EQ(search(std::vector<float>(60, 1.0f), 120), 0u);
}

TEST(Search, TooLittleOrNothing) {
    EXPECT_EQ(search(runs({{11, 0.25f}, {2, 1.0f}}, 13), 100), 0u);  // 9 are skipped
    EXPECT_EQ(search(std::vector<float>(60, 0.0f), 120), 0u);
    TAVO_HL_CTX empty = {};
    EXPECT_EQ(_get_HL_simple(&empty, 120), 0u);
    // One point more is enough: its only edge, at 11, is not scored and gives the point after.
    EXPECT_EQ(search(runs({{12, 0.25f}, {2, 1.0f}}, 14), 100), 24000u);
}

// Segments (9, 13) and (29, 49), no valleys; the edge at 29 is chosen and the region ends at 49,
// 20 points on.
TEST(Search, ARequestedLengthMovesTheStart) {
    const auto song = runs({{10, 0.25f}, {4, 0.75f}, {16, 0.25f}, {20, 1.0f}, {10, 0.25f}});
    const struct {
        int32_t hl_param;
        uint32_t ms;
    } cases[] = {
        {0, 58000},   {-30, 58000}, {44, 58000},  // 22 points reach back 2: not worth moving
        {46, 58000},                              // ideal 26: 29 is the nearest boundary
        {60, 26000},                              // ideal 19: 13 is
        {61, 26000},                              // the same number of points
        {74, 26000},                              // ideal 12
        {102, 18000},                             // 9 + 51 reaches the end: the first segment
        {104, 18000},                             // and 9 + 52 passes it
    };
    for (const auto &c : cases) EXPECT_EQ(search(song, 120, c.hl_param), c.ms) << c.hl_param;
}

// What passes the song's end begins at the first segment or the first valley, whichever is earlier,
// or at the one there is. The dips to 0.1 are far below the rest.
TEST(Search, ALengthBeyondTheEndStartsEarly) {
    const auto valley_first = runs({{20, 0.5f}, {1, 0.1f}, {9, 0.5f}, {20, 1.0f}, {10, 0.5f}});
    EXPECT_EQ(search(valley_first, 120, 80), 40000u);  // 20 + 40; the segment is at 29
    const auto segment_first = runs({{10, 0.5f}, {20, 1.0f}, {9, 0.5f}, {1, 0.1f}, {20, 0.5f}});
    EXPECT_EQ(search(segment_first, 120, 102), 18000u);  // 9 + 51; the valley is at 39
    const auto valley_only = runs({{20, 0.5f}, {1, 1.0f}, {10, 0.5f}, {1, 0.1f}, {28, 0.5f}});
    EXPECT_EQ(search(valley_only, 120, 58), 62000u);  // 31 + 29
}

}  // namespace
