#include <memory>

#include "pcm/from_highlight.h"
#include "tests/pcm/song_plan.h"
#include "tests/support/fault_layer.h"

namespace {

constexpr int32_t kRate = 8000;
constexpr int64_t kBytes = 320'000;         // 20 s
constexpr int64_t kDuration = 200'000'000;  // units
constexpr int64_t kBlock = 4608;            // bytes from a seek position to the compared block

using positions = std::vector<int64_t>;

// A fixture for a stream of 20 s at 8000 Hz, decoded in four segments for mode 2.
class FromHighlight : public song_plan {
 protected:
    void decode(const std::string &played) {
        ASSERT_EQ(plan(kDuration, kRate, played), 0);
        ctx.hl = &hl;
        ctx.ana_rate = kAnalysisRate;
        ASSERT_EQ(DecodePcmMT(&ctx, ctx.pcm, ctx.pcm_bytes), kBytes);
    }
    // Expects a highlight at `pos` to be reported at `hl_pos` and `bytes` to become the signal.
    void expect_from(int64_t pos, const std::string &bytes, uint32_t hl_pos) {
        EXPECT_EQ(tavo_get_from_here(&ctx, pos), 0);
        EXPECT_EQ(ctx.pcm, nullptr);
        EXPECT_EQ(hl.hl_pos, hl_pos);
        EXPECT_EQ(read_output(std::exchange(ctx.ana, nullptr), ctx.ana_len),
                  convert_pcm(bytes.data(), bytes.size(), kRate));
    }

    const std::string stream = noise(kBytes, 1);
    TAVO_HL_CTX hl = {0, nullptr, 0, 4711};
};

TEST_F(FromHighlight, FirstSecondIsTheStartOfTheFile) {
    decode(stream);
    expect_from(1000, stream, 0);
    EXPECT_TRUE(sources[0].seeks.empty());
    decode(stream);
    // The signal is cut from the PCM. Only the source of the first record is used.
    for (int i = 0; i < 4; ++i) ctx.seg[i].got = 0;
    ctx.seg[0].fmt = {};
    ctx.seg[0].duration = 0;
    expect_from(1001, slice(stream, 16'016, kBytes), 1001);
    EXPECT_EQ(sources[0].seeks, positions{10'010'000});
    decode(stream);
    sources[0].seek_fails = true;  // the source delivers other audio, so the rest is decoded again
    expect_from(2500, slice(stream, 40'000, kBytes), 2500);
    EXPECT_EQ(sources[0].seeks, (positions{25'000'000, 25'000'000}));
}

TEST_F(FromHighlight, SeekPositionIsFoundInThePcm) {
    // After a seek to 2500 ms (byte 40,000), a decoded block is searched for in bytes 24,000 to
    // 87,999 of the PCM. If it is not there, the rest of the song is decoded again.
    const struct {
        const char *name;
        uint32_t ms;             // position that the seek reports
        int64_t reached;         // byte that the seek reaches
        positions copies;        // offsets to which the block is copied
        int64_t start;           // first byte of the signal
        bool found = true;       // false: the rest is decoded again
        int64_t bytes = kBytes;  // of the PCM
    } cases[] = {
        {"as expected", 2500, 40'000, {}, 40'000},
        {"first offset", 2500, 24'000 - kBlock, {}, 24'000 - kBlock},
        {"before it", 2500, 23'999 - kBlock, {}, 40'000, false},
        {"last offset", 2500, 87'999 - kBlock, {}, 87'999 - kBlock},
        {"after it", 2500, 88'000 - kBlock, {}, 40'000, false},
        {"odd offset", 2500, 50'001, {}, 50'001},
        {"the lowest in range", 2500, 40'000, {20'000, 30'001, 60'000}, 30'001 - kBlock},
        {"at the buffer's beginning", 1100, 17'600, {kBlock}, 0},
        {"not before it", 1100, 17'600, {kBlock - 1}, 17'600},
        {"last bytes of the PCM", 7000, 112'000, {}, 112'000, true, 112'000 + kBlock + 200},
        {"stale bytes", 7000, 112'000, {}, 112'000, false, 112'000 + kBlock + 199},
        {"probe just long enough", 19'500, kBytes - kBlock - 200, {}, kBytes - kBlock - 200},
        {"probe too short", 19'500, kBytes - kBlock - 199, {}, 312'000, false},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.name);
        std::string played = stream;
        for (const int64_t copy : each.copies) {
            std::copy_n(played.begin() + each.reached + kBlock, 200, played.begin() + copy);
        }
        decode(played);
        ctx.pcm_bytes = each.bytes;
        sources[0].seek_report = each.ms * kUnitsPerMs;
        sources[0].seek_target = each.reached;
        expect_from(each.ms + 1, slice(played, each.start, each.found ? each.bytes : kBytes),
                    each.ms);
        EXPECT_EQ(sources[0].seeks.size(), each.found ? 1U : 2U);
        EXPECT_NE(ctx.seg[0].buf, nullptr);
    }
}

TEST_F(FromHighlight, SecondDecodingReleasesTheFirst) {
    decode(stream);
    sources[0].seek_target = 0;  // outside the searched range
    EXPECT_EQ(tavo_get_from_here(&ctx, 15'000), 0);
    EXPECT_EQ(ctx.ana_len, kBytes / 4 / 2 * kAnalysisRate / kRate);
    decode(stream);
    sources[0].seek_report = kDuration;
    EXPECT_EQ(tavo_get_from_here(&ctx, 15'000), -2);
    EXPECT_EQ(hl.hl_pos, 20'000U);
}

// The record is a heap block of its own, so that a sanitizer detects a read past its end. The
// search covers only the bytes within the record's duration.
TEST_F(FromHighlight, ComparisonReadsOnlyItsRecord) {
    ASSERT_EQ(plan(kDuration, kRate, stream), 0);
    const auto seg = std::make_unique<TAVO_DECSEG>();
    seg->fmt.sample_rate = kRate;
    seg->src = ctx.seg[0].src;
    seg->start = 10'000'000;
    std::string pcm = stream;
    for (const auto &[duration, reached, found] :
         {std::tuple{41'250'000, 50'000 - kBlock - 200, true},
          {41'250'000, 50'000 - kBlock - 199, false},
          {0, 60'000, true}}) {
        seg->duration = duration;
        sources[0].at = reached;
        int64_t off = 43'000;
        const auto *samples = reinterpret_cast<const int16_t *>(pcm.data());
        fault::arm({fault::kMemory, 0});
        EXPECT_EQ(_compare_decoded(seg.get(), samples, &off), -1);
        fault::disarm();
        EXPECT_EQ(_compare_decoded(seg.get(), samples, &off), found ? 0 : -1);
        EXPECT_EQ(off, found ? reached : 43'000);
    }
}

}  // namespace
