#include <gtest/gtest.h>

#include "pcm/from_highlight.h"
#include "pcm/resample.h"
#include "tests/pcm/plan_builder.h"

namespace {

constexpr int32_t kRate = 8000;
constexpr int64_t kBytes = 320'000;         // 20 s
constexpr int64_t kDuration = 200'000'000;  // units

using signal = std::vector<double>;

signal converted(const byte_run &pcm) {
    std::vector<int16_t> samples(pcm.size() / 2);
    memcpy(samples.data(), pcm.data(), samples.size() * 2);
    int64_t n = 0;
    double *out = nullptr;
    EXPECT_EQ(dorn_resampler_run(samples.data(), static_cast<int64_t>(pcm.size()), kRate,
                                 kAnalysisRate, &n, &out),
              0);
    const signal result(out, out + n);
    free(out);
    return result;
}

// Twenty seconds at 8000 Hz, decoded from four segments, as the job of mode 2 finds them.
class from_highlight : public testing::Test {
 protected:
    from_highlight() : stream(noise(kBytes, 1)), audio(4) {}
    ~from_highlight() override {
        free(ctx.ana);
        tavo_decode_deinit(&ctx);
    }

    void decode() {
        for (auto &each : audio) {
            each.stream = stream;
            each.rate = kRate;
        }
        lay_plan(&ctx, &audio, {112'000, 112'000, 112'000, 80'000}, kDuration);
        ctx.hl = &hl;
        ctx.ana_rate = kAnalysisRate;
        ctx.pcm_bytes = DecodePcmMT(&ctx, ctx.pcm, ctx.pcm_bytes);
        ASSERT_EQ(ctx.pcm_bytes, kBytes);
        audio[0].seeks.clear();
    }
    void seek_gives(int64_t reported, int64_t landed) {
        audio[0].report = reported;
        audio[0].land = landed;
    }
    // The analysis signal is the stream from this byte on, and pcm is gone.
    void expect_from(int64_t byte) const {
        EXPECT_EQ(ctx.pcm, nullptr);
        EXPECT_TRUE(signal(ctx.ana, ctx.ana + ctx.ana_len) ==
                    converted(slice(stream, byte, kBytes)));
    }
    void again() {
        free(ctx.ana);
        ctx.ana = nullptr;
        tavo_decode_deinit(&ctx);
        decode();
    }

    byte_run stream;
    std::vector<fake_audio> audio;
    TAVO_HL_CTX hl = {0, nullptr, 0, 4711};
    TAVO_CTX ctx = {};
};

TEST_F(from_highlight, first_second_is_the_beginning) {
    decode();
    EXPECT_EQ(tavo_get_from_here(&ctx, 1000), 0);
    EXPECT_EQ(hl.hl_pos, 0U);
    EXPECT_TRUE(audio[0].seeks.empty());
    expect_from(0);
}

TEST_F(from_highlight, later_start_is_sought) {
    decode();
    EXPECT_EQ(tavo_get_from_here(&ctx, 1001), 0);
    EXPECT_EQ(audio[0].seeks, std::vector<int64_t>{10'010'000});
    EXPECT_EQ(hl.hl_pos, 1001U);
    expect_from(16'016);
}

TEST_F(from_highlight, search_range) {
    // Reported 2500 ms: expected at byte 40,000; the block, 4608 bytes further on, is looked for
    // at bytes 24,000 to 87,999. Outside, the stream is decoded again from 2.5 s.
    const struct {
        const char *name;
        int64_t landed;
        int64_t begins;
    } cases[] = {
        {"as expected", 40'000, 40'000},      {"first place", 24'000 - 4608, 24'000 - 4608},
        {"before it", 24'000 - 4609, 40'000}, {"last place", 87'999 - 4608, 87'999 - 4608},
        {"behind it", 88'000 - 4608, 40'000}, {"odd place", 50'001, 50'001},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.name);
        again();
        seek_gives(25'000'000, each.landed);
        EXPECT_EQ(tavo_get_from_here(&ctx, 2501), 0);
        EXPECT_EQ(audio[0].seeks.front(), 25'010'000);
        EXPECT_EQ(hl.hl_pos, 2500U);
        const bool found = each.begins == each.landed;
        EXPECT_EQ(audio[0].seeks.size(), found ? 1U : 2U);
        expect_from(each.begins);
    }
}

TEST_F(from_highlight, lowest_match_wins) {
    // The block at 44,608 occurs again within the range, and once before it.
    for (const int64_t copy : {20'000, 30'001, 60'000}) {
        std::copy_n(stream.begin() + 44'608, 200, stream.begin() + copy);
    }
    decode();
    seek_gives(25'000'000, 40'000);
    EXPECT_EQ(tavo_get_from_here(&ctx, 2500), 0);
    expect_from(30'001 - 4608);
}

TEST_F(from_highlight, match_that_would_begin_before_the_buffer_is_none) {
    // Reported 1.1 s: searched from byte 1600 on.
    std::copy_n(stream.begin() + 17'600 + 4608, 200, stream.begin() + 4607);
    decode();
    seek_gives(11'000'000, 17'600);
    EXPECT_EQ(tavo_get_from_here(&ctx, 1100), 0);
    expect_from(17'600);

    std::copy_n(stream.begin() + 17'600 + 4608, 200, stream.begin() + 4608);
    again();
    seek_gives(11'000'000, 17'600);
    EXPECT_EQ(tavo_get_from_here(&ctx, 1100), 0);
    expect_from(0);
}

TEST_F(from_highlight, match_behind_the_decoded_bytes_is_decoded_again) {
    // The records brought 20 s, but seams left 6: byte 112,000 of the buffer is stale.
    decode();
    ctx.pcm_bytes = 96'000;
    EXPECT_EQ(tavo_get_from_here(&ctx, 7000), 0);
    EXPECT_GT(audio[0].seeks.size(), 1U);
    expect_from(112'000);
}

TEST_F(from_highlight, search_stays_inside_the_replanned_buffer) {
    decode();
    for (int32_t i = 0; i < ctx.seg_count; ++i) {
        free(ctx.seg[i].buf);
        ctx.seg[i].buf = nullptr;
    }
    free(ctx.pcm);
    ctx.pcm = nullptr;
    ASSERT_EQ(construct_decbuf(&ctx, 100'000'000), 0);
    ctx.pcm_bytes = DecodePcmMT(&ctx, ctx.pcm, ctx.pcm_bytes);
    ASSERT_EQ(ctx.pcm_bytes, kBytes / 2);
    // The last 200 bytes of the 160,000 are the last candidate: asan sees any later one.
    for (auto &each : audio) each.stream = noise(kBytes, 9);
    int64_t off = kBytes / 2;
    EXPECT_EQ(_compare_decoded(&ctx.seg[0], ctx.pcm, &off), -1);
}

TEST_F(from_highlight, short_probe_finds_nothing) {
    for (const int64_t delivered : {4807, 4808}) {
        SCOPED_TRACE(delivered);
        again();
        seek_gives(195'000'000, kBytes - delivered);
        EXPECT_EQ(tavo_get_from_here(&ctx, 19'500), 0);
        // Half a second is left: planned anew for one thread, from the landing point's time.
        EXPECT_EQ(ctx.seg_count, delivered == 4807 ? 1 : 4);
        expect_from(delivered == 4807 ? 312'000 : kBytes - 4808);
    }
}

TEST_F(from_highlight, failed_seek_counts_as_having_reached) {
    decode();
    audio[0].failing_seeks = 1;  // the source stands behind its segment, at byte 112,000
    EXPECT_EQ(tavo_get_from_here(&ctx, 2500), 0);
    EXPECT_EQ(hl.hl_pos, 2500U);
    EXPECT_EQ(audio[0].seeks, (std::vector<int64_t>{25'000'000, 25'000'000}));
    expect_from(40'000);
}

TEST_F(from_highlight, failing_reads_lead_to_an_empty_signal) {
    decode();
    for (auto &each : audio) each.fail_at = 0;
    EXPECT_EQ(tavo_get_from_here(&ctx, 2500), 0);
    EXPECT_EQ(ctx.pcm_bytes, 0);
    EXPECT_EQ(ctx.ana_len, 0);
    EXPECT_NE(ctx.ana, nullptr);
    EXPECT_EQ(ctx.pcm, nullptr);
}

TEST_F(from_highlight, nothing_left_cannot_be_planned) {
    decode();
    seek_gives(kDuration, 0);
    EXPECT_EQ(tavo_get_from_here(&ctx, 15'000), -2);
    EXPECT_EQ(hl.hl_pos, 20'000U);
    EXPECT_EQ(ctx.pcm, nullptr);
    EXPECT_EQ(ctx.ana, nullptr);
    for (int i = 0; i < 4; ++i) EXPECT_EQ(ctx.seg[i].buf, nullptr);
}

TEST(compare_decoded, reads_only_what_the_records_say_was_decoded) {
    std::vector<fake_audio> audio(1);
    audio[0].stream = noise(100'000, 1);
    audio[0].rate = kRate;
    TAVO_DECSEG seg = {};
    seg.count = 1;
    seg.fmt.sample_rate = kRate;
    seg.src = open_fake(&audio[0]);
    const struct {
        int64_t decoded;
        int64_t landed;
        bool found;
    } cases[] = {
        {50'000, 50'000 - 4808, true},
        {50'000, 50'000 - 4807, false},
        {100, 40'000, false},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.landed);
        seg.got = each.decoded;
        // A buffer of its own, so that a read beyond its end is seen.
        std::vector<int16_t> pcm(static_cast<size_t>(each.decoded / 2));
        memcpy(pcm.data(), audio[0].stream.data(), static_cast<size_t>(each.decoded));
        audio[0].land = each.landed;
        int64_t reached = 0;
        mtsrc_seekstream(seg.src, 0, &reached);
        int64_t off = 43'000;
        EXPECT_EQ(_compare_decoded(&seg, pcm.data(), &off), each.found ? 0 : -1);
        EXPECT_EQ(off, each.found ? each.landed : 43'000);
    }
    mtsrc_deinit(seg.src);
}

}  // namespace
