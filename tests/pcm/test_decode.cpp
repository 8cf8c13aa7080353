#include "tests/pcm/song_plan.h"

namespace {

constexpr int64_t kTenSeconds = 100'000'000;  // 100-ns units
constexpr int32_t kRate = 8000;               // one second is 16,000 bytes

using DecodePlan = song_plan;

TEST_F(DecodePlan, RefusesShortStreamsAndSegmentsTheOthers) {
    constexpr int64_t kSetup = INT64_MAX;  // start of a row without a second plan
    const struct {
        int64_t duration, start;
        int32_t rate, code, segments;
        int64_t pcm_bytes;
    } cases[] = {
        {10'000'001, kSetup, 44100, 0, 1, 88'200},
        {50'000'000, kSetup, 8000, 0, 1, 80'000},
        {50'000'001, kSetup, 8000, 0, 4, 80'000},
        {-50'000'000, kSetup, 8000, -3, 0, 0},
        {INT64_MAX / 16'000 + 1, kSetup, 8000, -3, 0, 0},  // the number of bytes overflows
        {200'000'000, 100'000'000, 8000, 0, 4, 160'000},
        {200'000'000, 149'999'999, 8000, 0, 4, 80'000},  // just over 5 s are left
        {200'000'000, 150'000'000, 8000, 0, 1, 80'000},
        {50'000'000, -10'000'000, 8000, 0, 1, 96'000},     // more than 5 s, but only one record
        {200'000'000, 200'000'000, 8000, -2, 1, 0},        // nothing is left
        {200'000'000, 199'999'999, 8000, -2, 1, 0},        // less than one byte is left
        {200'000'000, 200'000'001, 8000, -2, 0, 320'000},  // starts after the end
        {200'000'000, INT64_MIN, 8000, -2, 0, 320'000},
    };
    head = "RIFF....WAVEfmt ";
    codec_stream.seeks = {{1, {}}};  // seeks report no position, so the requested one counts
    for (const auto &each : cases) {
        SCOPED_TRACE(testing::Message() << each.duration << ' ' << each.start << ' ' << each.rate);
        int32_t code = plan(each.duration, each.rate);
        const int32_t records = ctx.seg_count;
        const bool again = each.start != kSetup;
        const int64_t start = again ? each.start : 0;
        EXPECT_EQ(fake_codec::state.objects.size(), static_cast<size_t>(records));
        if (again) {
            for (int32_t i = 0; i < records; ++i) free(ctx.seg[i].buf);
            free(ctx.pcm);
            code = construct_decbuf(&ctx, start);
        }
        EXPECT_EQ(code, each.code);
        EXPECT_EQ(ctx.pcm_bytes, each.pcm_bytes);
        EXPECT_EQ(ctx.pcm != nullptr, code == 0);
        const int64_t cleared = code == 0 ? each.pcm_bytes : 0;
        EXPECT_EQ(pcm(cleared), support::zeros(size_t(cleared)));
        for (int32_t i = 0; i < records; ++i) {
            const TAVO_DECSEG &seg = ctx.seg[i];
            const bool planned = i < each.segments;
            const bool last = i == each.segments - 1;
            EXPECT_EQ(sources[i].seeks.size(), again && planned ? 1U : 0U);
            EXPECT_EQ(seg.buf != nullptr, code == 0 && planned);
            if (!planned) continue;
            EXPECT_EQ(seg.cap, each.pcm_bytes / each.segments +
                                   (last ? 0 : 4 * each.rate));  // 2 s of overlap
            EXPECT_EQ(seg.start, start + i * ((each.duration - start) / each.segments));
            EXPECT_EQ(again ? sources[i].seeks[0] : seg.seek_pos, seg.start);
            EXPECT_TRUE(seg.index == i && seg.count == each.segments && ctx.seg_count == seg.count);
            EXPECT_TRUE(seg.duration == each.duration && seg.fmt.sample_rate == each.rate);
        }
    }
    // A second plan uses no more records than the first one, and it leaves `got` unchanged.
    ASSERT_EQ(plan(50'000'000, kRate), 0);
    free(ctx.pcm);
    free(ctx.seg[0].buf);
    ctx.seg[0].got = 7;
    ctx.duration = 200'000'000;
    EXPECT_EQ(construct_decbuf(&ctx, 160'000'000), 0);
    EXPECT_TRUE(ctx.seg_count == 1 && ctx.seg[0].cap == 64'000 && ctx.seg[0].got == 7);
    ctx.duration = 50'000'000;
    codec_stream.seeks = {{0, 1234}};
    EXPECT_EQ(plan(kTenSeconds, kRate), 0);
    for (int32_t i = 0; i < 4; ++i) EXPECT_EQ(ctx.seg[i].seek_pos, 1234);
}

TEST_F(DecodePlan, ClosesEverySource) {
    for (size_t good = 0; good <= 4; ++good) {
        std::deque<int32_t> &results = fake_codec::state.results["xflac_init"];
        results.assign(good, 0);
        results.push_back(1);
        // If the first source cannot be opened, the code is -4. For others it is the open's code.
        EXPECT_EQ(plan(kTenSeconds, kRate), good == 0 ? -4 : -255) << good;
        EXPECT_TRUE(ctx.seg == nullptr && fake_codec::state.objects.empty());
    }
    for (const bool by_duration : {true, false}) {
        ASSERT_EQ(plan(kTenSeconds, kRate), 0);
        if (by_duration) ctx.seg_count = 1;  // as after a second plan with one segment
        if (!by_duration) ctx.duration = 0;
        tavo_decode_deinit(&ctx);  // plan() calls it once more
        EXPECT_TRUE(fake_codec::state.objects.empty());
    }
}

// A fixture for a stream of 10 s at 8000 Hz, decoded in four segments of 2.5 s.
class Decode : public song_plan {
 protected:
    // Plans the decoding of the first `end` bytes of the stream.
    void plan_stream(int64_t end = 160'000) {
        ASSERT_EQ(plan(kTenSeconds, kRate, slice(stream, 0, end)), 0);
    }
    int64_t decode() { return DecodePcmMT(&ctx, ctx.pcm, ctx.pcm_bytes); }

    std::string stream = noise(160'000, 1);
};

// The last segment starts at byte 120,000, and its first second is skipped. A stream that ends
// before the end of that second has no output.
TEST_F(Decode, OutputEqualsTheStream) {
    for (const int64_t end : {160'000, 159'999, 136'200, 136'000, 120'000, 100'000}) {
        const int64_t want = end > 136'000 ? end : 0;
        plan_stream(end);
        EXPECT_EQ(decode(), want);
        EXPECT_EQ(pcm(want), slice(stream, 0, want));
        EXPECT_EQ(sources[0].max_request, 8192);
        EXPECT_EQ(ctx.seg[0].got, ctx.seg[0].cap);
    }
    plan_stream();
    EXPECT_EQ(DecodePcmMT(&ctx, ctx.pcm, 0), 0);
    EXPECT_EQ(DecodePcmMT(&ctx, nullptr, 160'000), 0);
    TAVO_CTX bare = {};
    EXPECT_EQ(DecodePcmMT(&bare, ctx.pcm, 160'000), 0);
    ctx.seg_count = 0;
    EXPECT_EQ(decode(), 0);
}

TEST_F(Decode, FailuresEndASegmentEmptyReadsDoNot) {
    const auto bytes = [&](int32_t code, int replies) {
        plan_stream();
        for (auto &source : sources) source.code = code;
        for (auto &source : sources) source.empty_replies = replies;
        return decode();
    };
    for (const int32_t code : {-2, -4, -6}) EXPECT_EQ(bytes(code, 1), 0) << code;
    for (const int32_t code : {-7, -3, -1, 2, 255}) EXPECT_EQ(bytes(code, 1), 160'000) << code;
    EXPECT_EQ(bytes(0, 65'535), 160'000);
    EXPECT_EQ(bytes(0, 65'536), 0);
    plan_stream();
    sources[0].fail_at = 64'000;  // the read that would pass this offset fails
    EXPECT_EQ(decode(), 160'000);
    EXPECT_EQ(ctx.seg[0].got, 57'344);
}

TEST_F(Decode, SpliceIsAtTheLastMatch) {
    const std::string a = noise(1000, 1), b = noise(200, 2), tail = noise(500, 3);
    const std::string silence = support::zeros(3000), blip = support::zeros(199) + "\7",
                      one = "\x9";
    const struct {
        const char *name;
        std::string first, second, want;
        int64_t capacity = 80'000;
    } cases[] = {
        {"200 bytes before the end", a, slice(a, 800, 1000) + tail, a + tail},
        {"an odd distance", a, slice(a, 799, 1000) + tail, a + tail},
        {"a byte short of it", a, slice(a, 801, 1000) + b, a + slice(a, 801, 1000) + b},
        {"at byte 1", a, slice(a, 1, 300) + tail, slice(a, 0, 300) + tail},
        {"at byte 0 only", a, slice(a, 0, 300) + tail, a + slice(a, 0, 300) + tail},
        {"the nearer of two", a + b + a + b + a, b + tail, a + b + a + b + tail},
        {"in 200 bytes of output", b, b + tail, b + b + tail},
        {"in 201 bytes of output", one + b, b + tail, one + b + tail},
        {"200 bytes after the skip", a, slice(a, 300, 500), slice(a, 0, 500)},
        {"199 bytes after the skip", a, slice(a, 300, 499), a + slice(a, 300, 499)},
        {"silence is not a block that ends loud", silence, blip, silence + blip},
        {"nor hides it", silence + blip + silence, blip, silence + blip},
        {"rewound bytes are used again", a, slice(a, 600, 1000) + b, a + slice(b, 0, 100), 1100},
        {"the rest is cut off", a, tail, a + slice(tail, 0, 100), 1100},
        {"no capacity for the second", a, tail, {}, 1000},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.name);
        plan_stream();
        ctx.seg_count = 2;
        for (int i = 0; i < 2; ++i) ctx.seg[i].count = 2;
        sources[0] = {each.first};
        sources[1] = {noise(16'000, 99) + each.second};
        ctx.seg[1].buf[16'199] = static_cast<uint8_t>(a[499]);  // past the decoded bytes
        EXPECT_EQ(pcm(DecodePcmMT(&ctx, ctx.pcm, each.capacity)), each.want);
    }
}

TEST(Stereo2Mono, RoundsTowardZero) {
    const int16_t frames[] = {-3, 0, 3, 0, 32767, 32767, -32768, -32768, 32767, -32768};
    sample_run mono(6, 77);
    stereo2mono(mono.data(), frames, 5);
    EXPECT_EQ(mono, (sample_run{-1, 1, 32767, -32768, 0, 77}));
}

}  // namespace
