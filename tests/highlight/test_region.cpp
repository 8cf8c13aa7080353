#include <gtest/gtest.h>

#include <vector>

#include "highlight/region.h"

namespace {

using Indexes = std::vector<int32_t>;

// A loud song with some points at other levels; mean 0.5.
struct SONG {
    int32_t n;
    float std;
    std::vector<std::pair<int32_t, float>> points;
};

uint32_t region(const SONG &song, int32_t chosen, int32_t len_pts, Indexes valleys,
                const Indexes &pairs) {
    std::vector<float> norm(static_cast<size_t>(song.n), 0.875f);
    for (const auto &point : song.points) norm[static_cast<size_t>(point.first)] = point.second;
    const int32_t nv = static_cast<int32_t>(valleys.size());
    valleys.resize(15);
    return tavo_select_highlight_region(norm.data(), song.n, len_pts, chosen, nv, valleys.data(),
                                        pairs.empty() ? nullptr : pairs.data(),
                                        static_cast<int32_t>(pairs.size() / 2), 0.5f, song.std);
}

const SONG kLoud = {120, 0.25f, {}};

TEST(Region, EndsAtTheNextValley) {
    EXPECT_EQ(region(kLoud, 40, 15, {34, 50}, {}), 34u);
    EXPECT_EQ(region(kLoud, 40, 12, {34, 50}, {}), 40u);  // 2 points back are not worth it
    EXPECT_EQ(region(kLoud, 40, 13, {34, 50}, {}), 37u);  // 34 is 3 off: the ideal start itself
    EXPECT_EQ(region(kLoud, 40, 30, {65}, {}), 35u);      // 25 points on
    EXPECT_EQ(region(kLoud, 40, 30, {66}, {}), 10u);      // 26 are too far, and no end is found
}

TEST(Region, TheValleyBefore) {
    // Ideal start 35 in all of these.
    EXPECT_EQ(region(kLoud, 40, 15, {37, 50}, {}), 37u);
    EXPECT_EQ(region(kLoud, 40, 15, {38, 50}, {}), 35u);
    EXPECT_EQ(region(kLoud, 40, 15, {35, 40, 50}, {}), 35u);
    EXPECT_EQ(region(kLoud, 40, 15, {34, 40, 50}, {}), 35u);  // at chosen itself: none before
    // Ideal 31: from 39 back to 30, the last that comes nearer.
    EXPECT_EQ(region(kLoud, 40, 19, {20, 30, 34, 39, 50}, {}), 30u);
    // Ideal 1: the song's first point is no candidate.
    EXPECT_EQ(region(kLoud, 6, 9, {0, 10}, {}), 1u);
}

// The drop at 46 comes too early; at 48 and 49 it is not followed by another, but nothing is lower.
TEST(Region, TheFirstSevenPointsAreNoEnd) {
    const SONG early = {120, 0.25f, {{46, 0.25f}, {48, 0.25f}, {49, 0.25f}}};
    EXPECT_EQ(region(early, 40, 15, {}, {}), 33u);
}

TEST(Region, SegmentBoundaryOrValley) {
    // Ideal start 35; the walk through the boundaries stops where the distance no longer falls.
    EXPECT_EQ(region(kLoud, 40, 15, {38, 50}, {32, 60}), 38u);  // equally near: the valley
    EXPECT_EQ(region(kLoud, 40, 15, {38, 50}, {33, 60}), 33u);
    EXPECT_EQ(region(kLoud, 40, 15, {38, 50}, {20, 33}), 33u);  // also as the last boundary
    EXPECT_EQ(region(kLoud, 40, 15, {50}, {20, 33}), 35u);      // which needs a valley
    EXPECT_EQ(region(kLoud, 40, 15, {50}, {20, 33, 60, 70}), 33u);
    EXPECT_EQ(region(kLoud, 40, 15, {50}, {20, 60}), 20u);  // 60 is farther
    EXPECT_EQ(region(kLoud, 40, 15, {50}, {0, 90}), 35u);   // 0 is no boundary
}

// Without a valley the end is sought from 14 s to 48 s after chosen (40): points 47 to 64.
TEST(Region, TheEndFoundByScanning) {
    const SONG deep = {120, 0.25f, {{50, 0.375f}, {51, 0.375f}, {52, 0.375f}, {53, 0.375f}}};
    EXPECT_EQ(region(deep, 40, 15, {}, {}), 35u);  // a fall of one deviation ends it at 50

    SONG shallow = deep;
    shallow.std = 0.625f;
    shallow.points.insert(shallow.points.end(),
                          {{55, 0.3125f}, {57, 0.375f}, {58, 0.375f}, {60, 0.375f}});
    EXPECT_EQ(region(shallow, 40, 20, {}, {}), 35u);  // the deepest of the falls, 55

    SONG first_deep_enough = shallow;
    first_deep_enough.std = 0.5f;  // reached at 50 exactly
    EXPECT_EQ(region(first_deep_enough, 40, 15, {}, {}), 35u);

    const SONG dip = {120, 0.25f, {{50, 0.375f}, {54, 0.25f}}};
    EXPECT_EQ(region(dip, 40, 19, {}, {}), 35u);        // no fall that lasts: the lowest, 54
    EXPECT_EQ(region(dip, 40, 25, {}, {30, 60}), 30u);  // a segment around chosen: its end, 60
    EXPECT_EQ(region(dip, 40, 19, {}, {10, 40, 60, 70}), 40u);  // 40 is not inside (10, 40)
}

TEST(Region, TheScanAtTheEndOfTheSong) {
    const SONG loud = {50, 0.25f, {}};
    EXPECT_EQ(region(loud, 40, 14, {}, {}), 35u);  // nothing low: the last point, 49
    // A low point whose followers are missing is no lasting fall, but the lowest point.
    const SONG low = {50, 0.25f, {{48, 0.25f}}};
    EXPECT_EQ(region(low, 40, 14, {}, {}), 34u);
    // The last place where both followers exist.
    const SONG drop = {50, 0.25f, {{46, 0.25f}, {48, 0.25f}, {49, 0.25f}}};
    EXPECT_EQ(region(drop, 39, 13, {}, {}), 33u);
}

TEST(Region, TheRegionFitsInTheSong) {
    const SONG song = {100, 0.25f, {}};
    EXPECT_EQ(region(song, 90, 10, {98}, {30, 99}), 90u);  // ends at 100 exactly
    EXPECT_EQ(region(song, 90, 11, {99}, {30, 99}), 30u);  // the earlier of 99 and 30
    EXPECT_EQ(region(song, 90, 11, {99}, {}), 0u);         // no segment reads 0
    EXPECT_EQ(region(song, 90, 11, {99}, {95, 99}), 0u);   // neither fits
    EXPECT_EQ(region(song, 98, 3, {20}, {30, 99}), 20u);
    EXPECT_EQ(region(song, 90, INT32_MAX, {}, {}), 0u);
}

TEST(Region, AStartOutsideTheSong) {
    EXPECT_EQ(region(kLoud, 120, 15, {50}, {}), 0u);
    EXPECT_EQ(region(kLoud, -1, 15, {50}, {}), 0u);
}

}  // namespace
