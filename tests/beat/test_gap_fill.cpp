#include <gtest/gtest.h>

#include "beat/candidates.h"
#include "tests/beat/beat_fixture.h"

namespace {

using frames = std::vector<int32_t>;

struct gap_case {
    const char *name;
    int32_t a, b;
    frames peaks;
    int32_t maxn;
    frames expected;
};

// Height of each frame's envelope.
constexpr double kHeights[] = {0, 0, 5, 0, 1, 0, 7, 0, 3, 0, 9, 0, 3, 0, 2, 0, 8, 0, 4, 0, 6};

}  // namespace

TEST(BringMoreBeat, Cases) {
    const frames all = {2, 4, 6, 8, 10, 12, 14, 16, 18, 20};
    const gap_case cases[] = {
        {"all of five, ascending", 2, 14, all, 5, {4, 6, 8, 10, 12}},
        {"the strongest of nine first", 2, 99, all, 5, {10, 16, 6, 20, 18}},
        {"one that rounding made smaller", 1, 13, all, 5, {4, 6, 8, 10, 12}},
        {"equal heights: the first one twice", 6, 20, {6, 8, 12, 14, 18, 20}, 3, {18, 8, 8}},
        {"equal heights, room for one", 6, 20, {6, 8, 12, 14, 18, 20}, 2, {18, 8}},
        {"neighbours", 4, 6, all, 5, {}},
        {"no later peak", 16, 99, all, 5, {18, 20}},
        {"no peak from a on", 21, 99, all, 5, {}},
        {"only the last", 20, 99, all, 5, {}},
        {"no room", 2, 14, all, 0, {}},
        {"no peaks", 2, 14, {}, 5, {}},
    };
    for (const gap_case &c : cases) {
        frames dst(static_cast<size_t>(c.maxn), -1);
        const int32_t found = bringMoreBeat(c.a, c.b, dst.data(), c.peaks.data(),
                                            static_cast<int32_t>(c.peaks.size()), c.maxn, kHeights);
        ASSERT_EQ(found, static_cast<int32_t>(c.expected.size())) << c.name;
        dst.resize(static_cast<size_t>(found));
        EXPECT_EQ(dst, c.expected) << c.name;
    }
}
