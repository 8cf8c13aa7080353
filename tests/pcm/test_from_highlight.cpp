#include <memory>

#include "pcm/from_highlight.h"
#include "tests/pcm/plan_builder.h"

namespace {

constexpr int32_t kRate = 8000;
constexpr int64_t kBytes = 320'000;         // 20 s
constexpr int64_t kDuration = 200'000'000;  // units
constexpr int64_t kBlock = 4608;            // where the probe's block begins, bytes of the probe

using positions = std::vector<int64_t>;

// Twenty seconds at 8000 Hz, decoded from four segments, as the job of mode 2 finds them.
class from_highlight : public testing::Test {
 protected:
    from_highlight() : stream(noise(kBytes, 1)), audio(4) {}
    ~from_highlight() override { release(); }

    void release() {
        free(ctx.ana);
        ctx.ana = nullptr;
        tavo_decode_deinit(&ctx);
    }
    void decode() {
        release();
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
    // The analysis signal of a highlight at pos is the stream from this byte on, and pcm is gone.
    void expect_from(int64_t pos, int64_t byte) {
        EXPECT_EQ(tavo_get_from_here(&ctx, pos), 0);
        EXPECT_EQ(ctx.pcm, nullptr);
        EXPECT_TRUE(std::vector<double>(ctx.ana, ctx.ana + ctx.ana_len) ==
                    converted(samples_of(slice(stream, byte, kBytes)), kRate));
    }

    byte_run stream;
    std::vector<fake_audio> audio;
    TAVO_HL_CTX hl = {0, nullptr, 0, 4711};
    TAVO_CTX ctx = {};
};

TEST_F(from_highlight, starts_after_the_first_second_are_sought) {
    decode();
    expect_from(1000, 0);
    EXPECT_EQ(hl.hl_pos, 0U);
    EXPECT_TRUE(audio[0].seeks.empty());
    decode();
    expect_from(1001, 16'016);
    EXPECT_EQ(hl.hl_pos, 1001U);
    EXPECT_EQ(audio[0].seeks, positions{10'010'000});
}

TEST_F(from_highlight, search_range) {
    // Reported 2500 ms: expected at byte 40,000; the block is looked for at bytes 24,000 to
    // 87,999. Outside, the stream is decoded again from 2.5 s.
    const struct {
        const char *name;
        int64_t landed;
        bool found;
    } cases[] = {
        {"as expected", 40'000, true},         {"first place", 24'000 - kBlock, true},
        {"before it", 23'999 - kBlock, false}, {"last place", 87'999 - kBlock, true},
        {"behind it", 88'000 - kBlock, false}, {"odd place", 50'001, true},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.name);
        decode();
        seek_gives(25'000'000, each.landed);
        expect_from(2501, each.found ? each.landed : 40'000);
        EXPECT_EQ(hl.hl_pos, 2500U);
        EXPECT_EQ(audio[0].seeks.front(), 25'010'000);
        EXPECT_EQ(audio[0].seeks.size(), each.found ? 1U : 2U);
    }
}

TEST_F(from_highlight, lowest_match_wins) {
    // The block occurs again within the range, and once before it.
    for (const int64_t copy : {20'000, 30'001, 60'000}) {
        std::copy_n(stream.begin() + 40'000 + kBlock, 200, stream.begin() + copy);
    }
    decode();
    seek_gives(25'000'000, 40'000);
    expect_from(2500, 30'001 - kBlock);
}

TEST_F(from_highlight, match_that_would_begin_before_the_buffer_is_none) {
    // Reported 1.1 s: searched from byte 1600 on.
    for (const bool outside : {true, false}) {
        std::copy_n(stream.begin() + 17'600 + kBlock, 200,
                    stream.begin() + (outside ? kBlock - 1 : kBlock));
        decode();
        seek_gives(11'000'000, 17'600);
        expect_from(1100, outside ? 17'600 : 0);
    }
}

TEST_F(from_highlight, match_behind_the_decoded_bytes_is_decoded_again) {
    // The records brought 20 s, but seams left 6: byte 112,000 of the buffer is stale.
    decode();
    ctx.pcm_bytes = 96'000;
    expect_from(7000, 112'000);
    EXPECT_GT(audio[0].seeks.size(), 1U);
}

TEST_F(from_highlight, pcm_of_the_caller_is_cut_without_decoding) {
    decode();
    for (int i = 0; i < 4; ++i) ctx.seg[i].got = 0;
    ctx.seg[0].fmt = {};
    ctx.seg[0].duration = 0;
    expect_from(2500, 40'000);
    EXPECT_EQ(audio[0].seeks.size(), 1U);
}

TEST_F(from_highlight, short_probe_finds_nothing) {
    for (const int64_t delivered : {kBlock + 199, kBlock + 200}) {
        SCOPED_TRACE(delivered);
        const bool found = delivered == kBlock + 200;
        decode();
        seek_gives(195'000'000, kBytes - delivered);
        expect_from(19'500, found ? kBytes - delivered : 312'000);
        // Half a second is left: planned anew for one thread, from the landing point's time.
        EXPECT_EQ(ctx.seg_count, found ? 4 : 1);
    }
}

TEST_F(from_highlight, failed_seek_counts_as_having_reached) {
    decode();
    audio[0].failing_seeks = 1;  // the source stands behind its segment, at byte 112,000
    expect_from(2500, 40'000);
    EXPECT_EQ(hl.hl_pos, 2500U);
    EXPECT_EQ(audio[0].seeks, (positions{25'000'000, 25'000'000}));
}

TEST_F(from_highlight, nothing_left_cannot_be_planned) {
    decode();
    seek_gives(kDuration, 0);
    EXPECT_EQ(tavo_get_from_here(&ctx, 15'000), -2);
    EXPECT_EQ(hl.hl_pos, 20'000U);
    EXPECT_TRUE(ctx.pcm == nullptr && ctx.ana == nullptr);
    for (int i = 0; i < 4; ++i) EXPECT_EQ(ctx.seg[i].buf, nullptr);
}

TEST(compare_decoded, reads_its_record_alone) {
    fake_audio audio;
    audio.stream = noise(100'000, 1);
    // One record on the heap, of a plan of four: any other that is read is seen.
    const auto seg = std::make_unique<TAVO_DECSEG>();
    seg->fmt.sample_rate = kRate;
    seg->src = open_fake(&audio);
    seg->start = 10'000'000;
    const struct {
        int64_t duration;  // 50,000 bytes of buffer, or untold
        int64_t landed;
        bool found;
    } cases[] = {
        {41'250'000, 50'000 - kBlock - 200, true},
        {41'250'000, 50'000 - kBlock - 199, false},
        {0, 60'000, true},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.landed);
        seg->duration = each.duration;
        // A buffer of its own, so that a read beyond its end is seen.
        const int64_t bytes = each.duration == 0 ? 100'000 : 50'000;
        const std::vector<int16_t> pcm = samples_of(slice(audio.stream, 0, bytes));
        audio.land = each.landed;
        int64_t reached = 0;
        mtsrc_seekstream(seg->src, 0, &reached);
        int64_t off = 43'000;
        EXPECT_EQ(_compare_decoded(seg.get(), pcm.data(), &off), each.found ? 0 : -1);
        EXPECT_EQ(off, each.found ? each.landed : 43'000);
    }
    mtsrc_deinit(seg->src);
}

}  // namespace
