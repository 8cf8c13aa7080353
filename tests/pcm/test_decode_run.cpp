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
            each.rate = kRate;
            each.warm_up = 3000;
        }
        audio[0].warm_up = 0;
    }
    ~ten_seconds() override { tavo_decode_deinit(&ctx); }

    // Of a stream that ends after so many bytes.
    void lay(int64_t end = 160'000) {
        for (auto &each : audio) each.stream = slice(stream, 0, end);
        tavo_decode_deinit(&ctx);
        lay_plan(&ctx, &audio, kCapacities, kTenSeconds);
    }
    int64_t decode() { return DecodePcmMT(&ctx, ctx.pcm, ctx.pcm_bytes); }
    // Decoding gives the stream from its beginning to this byte.
    void expect_decoded(int64_t bytes) {
        ASSERT_EQ(decode(), bytes);
        const auto *first = reinterpret_cast<const uint8_t *>(ctx.pcm);
        EXPECT_EQ(byte_run(first, first + bytes), slice(stream, 0, bytes));
    }

    byte_run stream;
    std::vector<fake_audio> audio;
    TAVO_CTX ctx = {};
};

TEST_F(ten_seconds, seams_vanish) {
    lay();
    expect_decoded(160'000);
    for (int i = 0; i < 4; ++i) {
        ASSERT_EQ(ctx.seg[i].got, kCapacities[static_cast<size_t>(i)]) << i;
        EXPECT_EQ(ctx.seg[i].done[i], 1) << i;
        const auto &wanted = audio[static_cast<size_t>(i)].wanted;
        EXPECT_EQ(*std::max_element(wanted.begin(), wanted.end()), 8192) << i;
        mtsrc_seekstream(ctx.seg[i].src, ctx.seg[i].start, &ctx.seg[i].seek_pos);
    }
    // 72,000 bytes: eight whole requests and the rest; a full buffer asks for nothing more.
    EXPECT_EQ(audio[0].wanted.size(), 9U);
    EXPECT_EQ(audio[0].wanted.back(), 72'000 - 8 * 8192);
    expect_decoded(160'000);  // once more, although all flags are set
}

TEST_F(ten_seconds, last_bytes_come_with_the_end) {
    lay(159'001);
    expect_decoded(159'001);
    EXPECT_EQ(ctx.seg[3].got, 39'001);
    EXPECT_EQ(audio[3].wanted.size(), 5U);  // nothing is asked for behind the end
}

TEST_F(ten_seconds, failed_source_keeps_what_it_gave) {
    audio[0].fail_at = 64'000;  // seven whole requests fit, the eighth ends beyond
    lay();
    expect_decoded(160'000);
    EXPECT_EQ(ctx.seg[0].got, 57'344);
}

TEST_F(ten_seconds, reads_end_on_failure_codes_only) {
    for (const int32_t code : {-7, -5, -3, -1, 2, 255, -2, -4, -6}) {
        SCOPED_TRACE(code);
        for (auto &each : audio) each.code = code;
        lay();
        const bool failure = code == -2 || code == -4 || code == -6;
        EXPECT_EQ(decode(), failure ? 0 : 160'000);
    }
}

TEST_F(ten_seconds, empty_replies_are_read_over_until_the_guard) {
    for (const int replies : {65'535, 65'536}) {
        for (auto &each : audio) each.empty_replies = replies;
        lay();
        EXPECT_EQ(decode(), replies < 65'536 ? 160'000 : 0);
        for (auto &each : audio) each.empty_replies = 0;
    }
}

TEST_F(ten_seconds, nothing_comes_of_a_segment_without_audio) {
    // The last segment brings nothing, or its skip and no more.
    for (const int64_t got : {0, 16'000}) {
        SCOPED_TRACE(got);
        lay(120'000 + got);
        EXPECT_EQ(decode(), 0);
        EXPECT_EQ(ctx.seg[3].got, got);
    }
    lay();
    mtsrc_deinit(ctx.seg[3].src);
    ctx.seg[3].src = nullptr;
    EXPECT_EQ(decode(), 0);
    EXPECT_EQ(ctx.seg[3].done[3], 1);
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
    EXPECT_TRUE(ctx.seg == nullptr && ctx.pcm == nullptr);
    EXPECT_TRUE(ext_mutex_mt == nullptr && ext_cond_mt == nullptr);
    tavo_decode_deinit(&ctx);  // harmless

    lay();
    ctx.duration = 0;  // the plan's own count is the larger
    tavo_decode_deinit(&ctx);
    for (const auto &each : audio) EXPECT_EQ(each.closed, 2);
}

}  // namespace
