#include <gtest/gtest.h>

#include "pcm/decode.h"
#include "tests/pcm/plan_builder.h"

namespace {

constexpr int32_t kRate = 8000;
constexpr int64_t kTenSeconds = 100'000'000;  // units
const std::vector<int64_t> kCapacities = {72'000, 72'000, 72'000, 40'000};

// Ten seconds at 8000 Hz in four segments of 2.5 s. Every source falsifies its first 3000 bytes
// after a seek, as a decoder does that starts in mid-stream.
class ten_seconds : public testing::Test {
 protected:
    ten_seconds() : stream(noise(160'000, 1)), audio(4) {
        for (auto &each : audio) {
            each.stream = stream;
            each.rate = kRate;
            each.warm_up = 3000;
        }
        audio[0].warm_up = 0;
    }
    ~ten_seconds() override { tavo_decode_deinit(&ctx); }

    void lay() { lay_plan(&ctx, &audio, kCapacities, kTenSeconds); }
    int64_t decode() { return DecodePcmMT(&ctx, ctx.pcm, ctx.pcm_bytes); }
    byte_run decoded(int64_t bytes) const {
        const auto *first = reinterpret_cast<const uint8_t *>(ctx.pcm);
        return {first, first + bytes};
    }

    byte_run stream;
    std::vector<fake_audio> audio;
    TAVO_CTX ctx = {};
};

TEST_F(ten_seconds, seams_vanish) {
    lay();
    ASSERT_EQ(decode(), 160'000);
    EXPECT_EQ(decoded(160'000), stream);
    for (int i = 0; i < 4; ++i) {
        EXPECT_EQ(ctx.seg[i].got, kCapacities[static_cast<size_t>(i)]) << i;
        EXPECT_EQ(ctx.seg[i].done[i], 1) << i;
        const auto &wanted = audio[static_cast<size_t>(i)].wanted;
        EXPECT_EQ(*std::max_element(wanted.begin(), wanted.end()), 8192) << i;
    }
    // 72,000 bytes: eight whole requests and the rest; a full buffer asks for nothing more.
    EXPECT_EQ(audio[0].wanted.size(), 9U);
    EXPECT_EQ(audio[0].wanted.back(), 72'000 - 8 * 8192);
}

TEST_F(ten_seconds, last_bytes_come_with_the_end) {
    for (auto &each : audio) each.stream = slice(stream, 0, 159'001);
    lay();
    ASSERT_EQ(decode(), 159'001);
    EXPECT_EQ(decoded(159'001), slice(stream, 0, 159'001));
    EXPECT_EQ(ctx.seg[3].got, 39'001);
    EXPECT_EQ(audio[3].wanted.size(), 5U);  // nothing is asked for behind the end
}

TEST_F(ten_seconds, other_audio_is_appended) {
    audio[1].stream = noise(160'000, 2);
    lay();
    // 72,000 of the first; 56,000 of the second, in which the third finds nothing of its own
    // (16,000 + 56,000 left after its skip, of which 32,000 fit) and no room is left for the last.
    EXPECT_EQ(decode(), 0);
    ctx.seg_count = 3;
    for (int i = 0; i < 3; ++i) {
        ctx.seg[i].count = 3;
        mtsrc_seekstream(ctx.seg[i].src, ctx.seg[i].start, &ctx.seg[i].seek_pos);
    }
    ASSERT_EQ(decode(), 160'000);
    EXPECT_EQ(decoded(160'000), slice(stream, 0, 72'000) + slice(audio[1].stream, 56'000, 112'000) +
                                    slice(stream, 96'000, 128'000));
}

TEST_F(ten_seconds, failed_source_keeps_what_it_gave) {
    audio[0].fail_at = 64'000;  // seven whole requests fit, the eighth ends beyond
    lay();
    ASSERT_EQ(decode(), 160'000);
    EXPECT_EQ(ctx.seg[0].got, 57'344);
    EXPECT_EQ(decoded(160'000), stream);
}

TEST_F(ten_seconds, nothing_comes_of_an_empty_segment) {
    lay();
    audio[2].fail_at = 0;
    EXPECT_EQ(decode(), 0);
    EXPECT_EQ(ctx.seg[2].got, 0);
}

TEST_F(ten_seconds, nothing_comes_of_a_later_segment_within_its_skip) {
    for (auto &each : audio) each.stream = slice(stream, 0, 120'000 + 16'000);
    lay();
    EXPECT_EQ(decode(), 0);
    EXPECT_EQ(ctx.seg[3].got, 16'000);
}

TEST_F(ten_seconds, segment_without_a_source_is_marked_done) {
    lay();
    mtsrc_deinit(ctx.seg[3].src);
    ctx.seg[3].src = nullptr;
    EXPECT_EQ(decode(), 0);
    EXPECT_EQ(ctx.seg[3].done[3], 1);
}

TEST_F(ten_seconds, second_run_starts_from_cleared_flags) {
    lay();
    for (int round = 0; round < 2; ++round) {
        for (int i = 0; i < 4; ++i) {
            mtsrc_seekstream(ctx.seg[i].src, ctx.seg[i].start, &ctx.seg[i].seek_pos);
        }
        ASSERT_EQ(decode(), 160'000) << round;
    }
    EXPECT_EQ(decoded(160'000), stream);
}

TEST_F(ten_seconds, destination) {
    lay();
    EXPECT_EQ(DecodePcmMT(&ctx, nullptr, 160'000), 0);
    EXPECT_EQ(ctx.seg[1].got, 72'000);  // decoded all the same
    EXPECT_EQ(DecodePcmMT(&ctx, ctx.pcm, 0), 0);

    TAVO_CTX bare = {};
    EXPECT_EQ(DecodePcmMT(&bare, ctx.pcm, 160'000), 0);
}

TEST_F(ten_seconds, release_closes_every_source_once) {
    lay();
    ctx.seg_count = 1;  // a later plan of one segment leaves the others to the release
    tavo_decode_deinit(&ctx);
    for (const auto &each : audio) EXPECT_EQ(each.closed, 1);
    EXPECT_EQ(ctx.seg, nullptr);
    EXPECT_EQ(ctx.pcm, nullptr);
    EXPECT_EQ(ext_mutex_mt, nullptr);
    EXPECT_EQ(ext_cond_mt, nullptr);
    tavo_decode_deinit(&ctx);  // harmless
}

}  // namespace
