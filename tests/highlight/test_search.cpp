// Valleys, the search and the region, on loudness curves drawn by hand.
#include <gtest/gtest.h>

#include <algorithm>
#include <sstream>
#include <string>
#include <vector>

#include "highlight/region.h"
#include "highlight/search.h"

namespace {

using indexes = std::vector<int32_t>;

// Curves of points (2 s each) and a largest value of 1: the normalised values are these. From 90 s
// on, edges count from point 9 on and up to 25 points before the end; below, from 0 and up to 10.
// Pairs of how many points have which value.
std::vector<float> runs(const std::string &pairs, size_t points = 60) {
    std::vector<float> power;
    std::istringstream in(pairs);
    float value = 0.0f;
    for (size_t count = 0; in >> count >> value;) power.insert(power.end(), count, value);
    EXPECT_EQ(power.size(), points);
    return power;
}

uint32_t search(std::vector<float> power, int32_t duration_s, int32_t hl_param = 0) {
    TAVO_HL_CTX hl = {hl_param, power.data(), static_cast<int32_t>(power.size()), 0};
    return _get_HL_simple(&hl, duration_s);
}

// A loud song with some points at other levels; mean 0.5.
struct song {
    int32_t n;
    float std;
    std::vector<std::pair<int32_t, float>> points;
};

uint32_t region(const song &of, int32_t chosen, int32_t len_pts, indexes found,
                const indexes &pairs) {
    std::vector<float> norm(static_cast<size_t>(of.n), 0.875f);
    for (const auto &point : of.points) norm[static_cast<size_t>(point.first)] = point.second;
    const auto nv = static_cast<int32_t>(found.size());
    found.resize(15);
    return tavo_select_highlight_region(norm.data(), of.n, len_pts, chosen, nv, found.data(),
                                        pairs.empty() ? nullptr : pairs.data(),
                                        static_cast<int32_t>(pairs.size() / 2), 0.5f, of.std);
}

}  // namespace

// Mean above 0.5: below 0.75 - 1.5 x 0.25 = 0.375. Mean 0.5 exactly is not above: below 0.375 as
// well, not 0.3125.
TEST(Valleys, LoudSongsNeedDeeperDips) {
    const float values[] = {1.0f, 0.4375f, 1.0f, 1.0f, 1.0f, 0.25f, 1.0f, 0.34375f, 1.0f};
    int32_t out[15];
    ASSERT_EQ(tavo_find_valley(values, 7, out, 0.75f, 0.25f, 2.0f), 1);
    EXPECT_EQ(out[0], 5);
    EXPECT_EQ(tavo_find_valley(values + 6, 3, out, 0.5f, 0.125f, 2.0f), 1);
    EXPECT_EQ(tavo_find_valley(values + 6, 3, out, 0.5625f, 0.25f, 2.0f), 0);
}

TEST(Search, Edges) {
    const struct {
        const char *curve;
        int32_t duration_s;
        uint32_t ms;
    } cases[] = {
        {"20 0.4 10 0.9 1 1 19 0.9 10 0.4", 120, 38000},  // into the loud passage
        // Edge at 14: 0.1 to 0.45 in one step, score 0.35 + 0.35. Edge at 28: a smaller step, 0.3,
        // but from 0.225 on average to 0.65, score 0.425 + 0.3.
        {"3 0.1 1 1 11 0.1 6 0.45 7 0.1 1 0.35 12 0.65 19 0.1", 120, 56000},
        // Edge at 13: 0.5625 + 0.4375. Edge at 30: 0.5 + 0.5. All exact in binary; the larger step.
        {"3 0.125 1 1 9 0.125 1 0.375 7 0.8125 10 0.25 10 0.75 19 0.25", 120, 60000},
        // The opening counts in short songs only.
        {"5 0.25 10 1 16 0.25 10 0.75 19 0.25", 90, 60000},
        {"5 0.25 10 1 16 0.25 10 0.75 19 0.25", 89, 8000},
        // One edge, at 5, inside the loud passage that is open from the start; the later rise has
        // no strict maximum. Without the segment the answer would be the point after the edge.
        {"6 0.75 24 1 11 0.25 1 0.5 1 0.75 8 0.875 9 0.25", 80, 10000},
        // At the last scored point the edge itself is the answer; one later it is the point after
        // the edge, as the last edge left when none passes.
        {"36 0.25 10 1 14 0.25", 90, 70000},
        {"37 0.25 10 1 13 0.25", 90, 74000},
        {"51 0.25 5 1 4 0.25", 89, 100000},
        {"52 0.25 5 1 3 0.25", 89, 104000},
        // Bursts of two points are too short to be scored: the first edge that no valley follows
        // closely is taken, at the point after it. Dips below 0.336 are low points; the valley is
        // the last of them: at 23, 3 after the edge at 20, or at 24.
        {"20 0.5 1 1 1 0.9 1 0.3 1 0.1 1 0.4 5 0.5 2 0.85 28 0.5", 120, 60000},
        {"20 0.5 1 1 1 0.9 1 0.5 1 0.3 1 0.1 1 0.4 4 0.5 2 0.85 28 0.5", 120, 40000},
        // Three points are too short, too. Of 60 values, 34 are quiet, 37 at most 0.85, 45 at most
        // 0.9: the 60th percentile is 0.85, so the largest step, to 0.85 at 10, leads nowhere, and
        // the next one, to 0.9 at 31, does.
        {"9 0.5 1 0.1 3 0.85 2 0.5 3 1 2 0.5 3 1 2 0.5 3 1 2 0.5 1 0.25 3 0.9 2 0.5 3 1 2 0.5 3 1 "
         "2 "
         "0.5 3 0.9 2 0.5 2 0.9 7 0.5",
         80, 62000},
        {"30 1 30 0.5", 120, 0},  // no rising edge
        {"60 0", 120, 0},
    };
    for (const auto &c : cases) EXPECT_EQ(search(runs(c.curve), c.duration_s), c.ms) << c.curve;
    // 9 are skipped and 4 are too few; one point more is enough, its only edge, at 11, is not
    // scored.
    EXPECT_EQ(search(runs("11 0.25 2 1", 13), 100), 0u);
    EXPECT_EQ(search(runs("12 0.25 2 1", 14), 100), 24000u);
}

// Thirty loud passages, the last the loudest: it is the last one that is looked at.
TEST(Search, ThirtyPassages) {
    std::string passages;
    for (int k = 0; k < 29; ++k) passages += "4 0.25 6 0.75 ";
    EXPECT_EQ(search(runs(passages + "4 0.25 6 1 30 0.25", 330), 660), 2000u * 293u);
}

// Segments (9, 13) and (29, 49), no valleys; the edge at 29 is chosen and the region ends at 49,
// 20 points on.
TEST(Search, ARequestedLengthMovesTheStart) {
    const auto curve = runs("10 0.25 4 0.75 16 0.25 20 1 10 0.25");
    const std::pair<int32_t, uint32_t> cases[] = {
        {0, 58000},   {-30, 58000}, {44, 58000},  // 22 points reach back 2: not worth moving
        {46, 58000},                              // ideal 26: 29 is the nearest boundary
        {60, 26000},                              // ideal 19: 13 is
        {61, 26000},                              // the same number of points
        {102, 18000},                             // 9 + 51 reaches the end: the first segment
        {104, 18000},                             // and 9 + 52 passes it
    };
    for (const auto &c : cases) EXPECT_EQ(search(curve, 120, c.first), c.second) << c.first;
    // What passes the end begins at the first segment or the first valley, whichever is earlier, or
    // at the one there is. The dips to 0.1 are far below the rest.
    const auto valley_first = runs("20 0.5 1 0.1 9 0.5 20 1 10 0.5");
    EXPECT_EQ(search(valley_first, 120, 80), 40000u);  // 20 + 40; the segment is at 29
    const auto segment_first = runs("10 0.5 20 1 9 0.5 1 0.1 20 0.5");
    EXPECT_EQ(search(segment_first, 120, 102), 18000u);  // 9 + 51; the valley is at 39
    const auto valley_only = runs("20 0.5 1 1 10 0.5 1 0.1 28 0.5");
    EXPECT_EQ(search(valley_only, 120, 58), 62000u);  // 31 + 29
}

// Chosen 40 in a song of 120 points unless said otherwise.
TEST(Region, Places) {
    const song loud = {120, 0.25f, {}}, hundred = {100, 0.25f, {}}, fifty = {50, 0.25f, {}};
    const song deep = {120, 0.25f, {{50, 0.375f}, {51, 0.375f}, {52, 0.375f}, {53, 0.375f}}};
    song shallow = {120, 0.625f, deep.points};
    shallow.points.insert(shallow.points.end(),
                          {{55, 0.3125f}, {57, 0.375f}, {58, 0.375f}, {60, 0.375f}});
    const song enough = {120, 0.5f, shallow.points};
    const song dip = {120, 0.25f, {{50, 0.375f}, {54, 0.25f}}};
    const song early = {120, 0.25f, {{46, 0.25f}, {48, 0.25f}, {49, 0.25f}}};
    const song low = {50, 0.25f, {{48, 0.25f}}};
    const song drop = {50, 0.25f, {{46, 0.25f}, {48, 0.25f}, {49, 0.25f}}};
    const struct {
        const char *name;
        const song *of;
        int32_t chosen, len_pts;
        indexes valleys, pairs;
        uint32_t start;
    } cases[] = {
        {"the next valley is the end", &loud, 40, 15, {34, 50}, {}, 34},
        {"2 points back are not worth it", &loud, 40, 12, {34, 50}, {}, 40},
        {"34 is 3 off: the ideal start itself", &loud, 40, 13, {34, 50}, {}, 37},
        {"25 points on", &loud, 40, 30, {65}, {}, 35},
        {"26 are too far, and no end is found", &loud, 40, 30, {66}, {}, 10},
        // Ideal start 35.
        {"the valley before", &loud, 40, 15, {37, 50}, {}, 37},
        {"3 off", &loud, 40, 15, {38, 50}, {}, 35},
        {"at chosen itself: none before", &loud, 40, 15, {34, 40, 50}, {}, 35},
        {"back to the last that comes nearer to 31", &loud, 40, 19, {20, 30, 34, 39, 50}, {}, 30},
        {"the song's first point is no candidate", &loud, 6, 9, {0, 10}, {}, 1},
        {"equally near: the valley", &loud, 40, 15, {38, 50}, {32, 60}, 38},
        {"a segment's boundary", &loud, 40, 15, {38, 50}, {33, 60}, 33},
        {"also as the last boundary", &loud, 40, 15, {38, 50}, {20, 33}, 33},
        {"which needs a valley", &loud, 40, 15, {50}, {20, 33}, 35},
        {"another follows", &loud, 40, 15, {50}, {20, 33, 60, 70}, 33},
        {"60 is farther", &loud, 40, 15, {50}, {20, 60}, 20},
        {"0 is no boundary", &loud, 40, 15, {50}, {0, 90}, 35},
        // Without a valley the end is sought from 14 s to 48 s after chosen: points 47 to 64.
        {"a fall of one deviation ends it at 50", &deep, 40, 15, {}, {}, 35},
        {"the deepest of the falls, 55", &shallow, 40, 20, {}, {}, 35},
        {"one deviation, reached at 50 exactly", &enough, 40, 15, {}, {}, 35},
        {"no fall that lasts: the lowest, 54", &dip, 40, 19, {}, {}, 35},
        {"a segment around chosen: its end, 60", &dip, 40, 25, {}, {30, 60}, 30},
        {"40 is not inside (10, 40)", &dip, 40, 19, {}, {10, 40, 60, 70}, 40},
        {"46 is too early; nothing is lower than 48", &early, 40, 15, {}, {}, 33},
        {"nothing low: the last point, 49", &fifty, 40, 14, {}, {}, 35},
        {"a low point without followers is no fall", &low, 40, 14, {}, {}, 34},
        {"the last place with both followers", &drop, 39, 13, {}, {}, 33},
        {"ends at 100 exactly", &hundred, 90, 10, {98}, {30, 99}, 90},
        {"too long: the earlier of 99 and 30", &hundred, 90, 11, {99}, {30, 99}, 30},
        {"no segment reads 0", &hundred, 90, 11, {99}, {}, 0},
        {"neither fits", &hundred, 90, 11, {99}, {95, 99}, 0},
        {"the valley is earlier", &hundred, 98, 3, {20}, {30, 99}, 20},
        {"endless", &hundred, 90, INT32_MAX, {}, {}, 0},
        {"behind the song", &loud, 120, 15, {50}, {}, 0},
        {"before it", &loud, -1, 15, {50}, {}, 0},
    };
    for (const auto &c : cases) {
        EXPECT_EQ(region(*c.of, c.chosen, c.len_pts, c.valleys, c.pairs), c.start) << c.name;
    }
}
