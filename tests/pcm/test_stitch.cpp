#include "tests/pcm/plan_builder.h"

namespace {

constexpr int32_t kRate = 100;  // Hz: the skip is 200 bytes
constexpr int64_t kSkip = 200;

// Decodes one segment per run and gives the stitched bytes; later runs get their skip in front.
byte_run stitched(const std::vector<byte_run> &runs, int64_t capacity = 100'000) {
    std::vector<fake_audio> audio(4);
    std::vector<int64_t> caps;
    for (size_t i = 0; i < runs.size(); ++i) {
        audio[i].rate = kRate;
        audio[i].land = 0;
        audio[i].stream = i == 0 ? runs[i] : noise(kSkip, 99) + runs[i];
        caps.push_back(100'000);
    }
    for (size_t i = runs.size(); i < 4; ++i) caps.push_back(1);
    TAVO_CTX ctx;
    lay_plan(&ctx, &audio, caps, 60'000'000);
    ctx.seg_count = static_cast<int32_t>(runs.size());
    for (int32_t i = 0; i < ctx.seg_count; ++i) ctx.seg[i].count = ctx.seg_count;

    byte_run out(static_cast<size_t>(capacity));
    const int64_t bytes = DecodePcmMT(&ctx, out.data(), capacity);
    out.resize(static_cast<size_t>(bytes));
    tavo_decode_deinit(&ctx);
    return out;
}

TEST(stitch, seam_is_laid_at_the_last_match) {
    const byte_run a = noise(1000, 1);
    const byte_run b = noise(200, 2);
    const byte_run tail = noise(500, 3);
    struct {
        const char *name;
        byte_run first;
        byte_run second;
        byte_run want;
    } const cases[] = {
        {"200 bytes before the end", a, slice(a, 800, 1000) + tail, a + tail},
        {"an odd distance", a, slice(a, 799, 1000) + tail, a + tail},
        {"one byte short of the block", a, slice(a, 801, 1000) + tail,
         a + slice(a, 801, 1000) + tail},
        {"at byte 1", a, slice(a, 1, 300) + tail, slice(a, 0, 300) + tail},
        {"at byte 0 only", a, slice(a, 0, 300) + tail, a + slice(a, 0, 300) + tail},
        {"the nearer of two", a + b + a + b + a, b + tail, a + b + a + b + tail},
        {"output of 200 bytes is not searched", slice(a, 0, 200), slice(a, 0, 200) + tail,
         slice(a, 0, 200) + slice(a, 0, 200) + tail},
        {"output of 201 bytes is", slice(a, 0, 201), slice(a, 1, 201) + tail,
         slice(a, 0, 201) + tail},
        {"200 bytes after the skip suffice", a, slice(a, 300, 500), slice(a, 0, 500)},
        {"fewer after the skip are appended", a, slice(a, 300, 499), a + slice(a, 300, 499)},
    };
    for (const auto &each : cases) {
        EXPECT_EQ(stitched({each.first, each.second}), each.want) << each.name;
    }
}

TEST(stitch, near_misses_do_not_match) {
    // Silence all along but for one byte of the block: the first bytes alone must not decide.
    byte_run silence(3000, 0);
    byte_run block(200, 0);
    block[199] = 7;
    EXPECT_EQ(stitched({silence, block}), silence + block);
    silence[1234] = 7;
    EXPECT_EQ(stitched({silence, block}), slice(silence, 0, 1235));
}

TEST(stitch, rewound_room_is_used_again) {
    const byte_run a = noise(1000, 1);
    const byte_run tail = noise(900, 3);
    const byte_run second = slice(a, 600, 1000) + tail;
    EXPECT_EQ(stitched({a, second}, 1100), a + slice(tail, 0, 100));
    EXPECT_EQ(stitched({a, tail}, 1100), a + slice(tail, 0, 100));
    EXPECT_EQ(stitched({a}, 300), slice(a, 0, 300));
    EXPECT_TRUE(stitched({a, tail}, 1000).empty());  // no room for the second
}

TEST(stereo2mono, halves_toward_zero) {
    const int16_t frames[] = {-3, 0, 3, 0, 32767, 32767, -32768, -32768, 32767, -32768, 5, 6};
    int16_t mono[7] = {0, 0, 0, 0, 0, 0, 77};
    stereo2mono(mono, frames, 6);
    const int16_t want[7] = {-1, 1, 32767, -32768, 0, 5, 77};
    for (int i = 0; i < 7; ++i) EXPECT_EQ(mono[i], want[i]) << i;
    stereo2mono(mono, frames, -1);
    EXPECT_EQ(mono[0], -1);
}

}  // namespace
