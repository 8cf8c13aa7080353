#include <gtest/gtest.h>

#include <cstdlib>
#include <vector>

#include "highlight/position.h"
#include "level_steps.h"

namespace {

constexpr int32_t kRate = 8000;

struct RESULT {
    uint32_t start;
    int32_t power_count;
};

// The PCM is of exactly its size.
RESULT find(std::vector<int16_t> pcm, int64_t duration_s, int32_t hl_param) {
    pcm.shrink_to_fit();
    TAVO_CTX ctx = {};
    ctx.pcm = pcm.data();
    ctx.pcm_bytes = static_cast<int64_t>(pcm.size() * sizeof(int16_t));
    ctx.fmt.sample_rate = kRate;
    ctx.duration = duration_s * kUnitsPerSecond;
    ctx.hl = static_cast<TAVO_HL_CTX *>(calloc(1, sizeof(TAVO_HL_CTX)));
    ctx.hl->hl_param = hl_param;
    ctx.hl->hl_pos = 12345;
    const uint32_t start = getHLPosition(&ctx);
    EXPECT_EQ(ctx.hl->hl_pos, start);
    const RESULT first = {start, ctx.hl->power_count};
    EXPECT_EQ(getHLPosition(&ctx), start);  // the envelope is replaced
    clearHighlgihtCtx(ctx.hl);
    return first;
}

// 120 s, loud from 60 s to 100 s. The window at 54 s is the last without the loud part: coarse
// start 54 s. Of the 27 frames from 51 s on, frame 22 is half, 23 wholly at the loud level from
// 60.2 s on; the rise is largest at 19, its smallest step leads from 23 to 24: 51 s + 9.2 s.
TEST(Position, CoarseThenFine) {
    const RESULT result =
        find(levels({{60 * kRate, 0.04}, {40 * kRate, 0.64}, {20 * kRate, 0.04}}), 120, 0);
    EXPECT_EQ(result.start, 60200u);
    EXPECT_EQ(result.power_count, 58);
}

TEST(Position, ShortOrSilent) {
    EXPECT_EQ(find({}, 120, 30).start, 0u);
    const RESULT result = find(levels({{6 * kRate - 1, 0.5}}), 5, 0);
    EXPECT_EQ(result.start, 0u);
    EXPECT_EQ(result.power_count, 0);
    EXPECT_EQ(find(std::vector<int16_t>(120 * kRate), 120, 30).start, 0u);
    clearHighlgihtCtx(nullptr);
}

// The only edge leads to the window at 112 s, the last but one of 120 s, whose tuning would need
// audio up to 120.6 s: the duration promises it, the PCM does not hold it.
TEST(Position, TheTuningNeverReadsPastThePcm) {
    std::vector<LEVEL> song = {{116 * kRate, 0.04}, {2 * kRate, 0.64}, {2 * kRate, 0.04}};
    EXPECT_EQ(find(levels(song), 200, 0).start, 112000u);
    // With that audio decoded the same start is tuned: of the frames from 109 s on, the rise is
    // largest at 14, and 18 to 19 is the level step after it: 109 s + 7.2 s.
    song.push_back({kRate, 0.04});
    EXPECT_EQ(find(levels(song), 200, 0).start, 116200u);
}

}  // namespace
