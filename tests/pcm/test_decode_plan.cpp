#include <unistd.h>

#include <cstdio>
#include <string>

#include "pcm/decode.h"
#include "tests/pcm/plan_builder.h"
#include "tests/support/scripted_codec.h"

namespace {

constexpr char kWav[] = "RIFF\0\0\0\0WAVEfmt ";
constexpr char kFlac[] = "fLaC            ";

// A file that recognition takes for the format wanted; the scripted codec library does the rest.
class decode_plan : public testing::Test {
 protected:
    decode_plan() {
        scripted::reset();
        script.channels = 1;
        script.sample_rate = 8000;
    }
    ~decode_plan() override {
        tavo_decode_deinit(&ctx);
        EXPECT_EQ(ext_mutex_mt, nullptr);
        EXPECT_EQ(scripted::live_objects(), 0);
        EXPECT_TRUE(scripted::faults().empty());
        remove(path.c_str());
    }

    void write(const char *head) {
        FILE *file = fopen(path.c_str(), "wb");
        ASSERT_NE(file, nullptr);
        fwrite(head, 1, 16, file);
        fclose(file);
    }

    int32_t init() {
        tavo_decode_deinit(&ctx);
        ctx = {};
        scripted::use(script);
        scripted::forget_calls();
        const TAVO_PARAM param = {path.c_str(), 0};
        return tavo_decode_init(&ctx, &param);
    }

    std::string path = testing::TempDir() + "tavo_plan_" + std::to_string(getpid());
    scripted::script script;
    TAVO_CTX ctx = {};
};

TEST_F(decode_plan, what_is_refused_and_how_many_segments) {
    write(kWav);
    const struct {
        int64_t duration;
        int32_t rate, code, segments;
        int64_t pcm_bytes;
    } cases[] = {
        {10'000'000, 44100, -3, 0, 0},
        {10'000'001, 44100, 0, 1, 88'200},
        {20'000'000, 7999, -3, 0, 0},
        {20'000'000, 8000, 0, 1, 32'000},
        {50'000'000, 8000, 0, 1, 80'000},
        {50'000'001, 8000, 0, 4, 80'000},
        {0, 8000, -3, 0, 0},
        {-50'000'000, 8000, -3, 0, 0},
        {INT64_MAX, 8000, -3, 0, 0},
        {INT64_MAX / 16'000 + 1, 8000, -3, 0, 0},  // the first product to overflow
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(testing::Message() << each.duration << " at " << each.rate);
        script.duration = each.duration;
        script.sample_rate = each.rate;
        EXPECT_EQ(init(), each.code);
        if (each.code != 0) {
            EXPECT_TRUE(ctx.seg == nullptr && ctx.pcm == nullptr && ext_mutex_mt == nullptr);
            EXPECT_EQ(scripted::live_objects(), 0);
            continue;
        }
        EXPECT_EQ(ctx.seg_count, each.segments);
        EXPECT_EQ(ctx.pcm_bytes, each.pcm_bytes);
        EXPECT_EQ(ctx.fmt.sample_rate, each.rate);
        EXPECT_EQ(ctx.duration, each.duration);
        EXPECT_EQ(scripted::live_objects(), each.segments);  // the probe is closed
        if (each.segments == 1) {
            EXPECT_EQ(ctx.seg[0].cap, each.pcm_bytes);
        }
    }
}

TEST_F(decode_plan, ten_seconds_at_8000_hz) {
    write(kFlac);
    script.duration = 100'000'000;
    for (const bool reports : {true, false}) {
        script.seeks =
            reports ? std::vector<scripted::seek>{{0, 1234}} : std::vector<scripted::seek>{{1, {}}};
        ASSERT_EQ(init(), 0);
        ASSERT_EQ(ctx.seg_count, 4);
        EXPECT_EQ(ctx.pcm_bytes, 160'000);
        for (int64_t i = 0; i < 160'000 / 2; ++i) ASSERT_EQ(ctx.pcm[i], 0);
        const auto seeks = scripted::calls_of("xflacfd_seek");
        ASSERT_EQ(seeks.size(), 4U);
        for (int i = 0; i < 4; ++i) {
            const TAVO_DECSEG &seg = ctx.seg[i];
            EXPECT_EQ(seg.start, i * 25'000'000);
            int64_t asked = -1;
            memcpy(&asked, seeks[size_t(i)].records.at(0).data(), sizeof(asked));
            EXPECT_EQ(asked, seg.start);
            // One that fails without a report leaves the position asked for.
            EXPECT_EQ(seg.seek_pos, reports ? 1234 : seg.start);
            EXPECT_EQ(seg.cap, i < 3 ? 72'000 : 40'000);
            EXPECT_EQ(seg.got, 0);
            EXPECT_EQ(seg.done, ctx.seg[0].done);
            EXPECT_EQ(seg.duration, 100'000'000);
        }
    }
}

TEST_F(decode_plan, sources_that_cannot_be_opened) {
    EXPECT_EQ(init(), -4);  // no such file
    write(kFlac);
    scripted::answer("xflac_init", {1});
    EXPECT_EQ(init(), -4);  // the probe: whatever its own code
    for (int good = 1; good <= 4; ++good) {
        SCOPED_TRACE(good);
        std::vector<int32_t> answers(static_cast<size_t>(good), 0);
        answers.push_back(1);
        scripted::answer("xflac_init", answers);
        EXPECT_EQ(init(), -255);  // a segment's: its own code
        EXPECT_EQ(ctx.seg, nullptr);
        EXPECT_EQ(scripted::live_objects(), 0);
    }
}

constexpr int64_t kDuration = 200'000'000;  // units

// A plan of which only the sources are left, as construct_decbuf expects it.
class second_plan : public testing::Test {
 protected:
    ~second_plan() override { tavo_decode_deinit(&ctx); }
    int32_t plan(int64_t start, size_t records = 4, int64_t duration = kDuration) {
        tavo_decode_deinit(&ctx);
        audio.assign(records, {});
        lay_plan(&ctx, &audio, std::vector<int64_t>(records, 1), duration);
        drop_buffers(&ctx);
        return construct_decbuf(&ctx, start);
    }

    std::vector<fake_audio> audio;
    TAVO_CTX ctx = {};
};

TEST_F(second_plan, covers_the_rest) {
    const struct {
        int64_t start;
        int32_t count;
        int64_t capacity;  // of the first segment
        int64_t last_capacity;
        int64_t pcm_bytes;
    } cases[] = {
        {100'000'000, 4, 72'000, 40'000, 160'000},  // 25,000,000 units each
        {149'999'999, 4, 52'000, 20'000, 80'000},   // 5 s and a unit: 12,500,000 each
        {150'000'000, 1, 80'000, 80'000, 80'000},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.start);
        ASSERT_EQ(plan(each.start), 0);
        EXPECT_EQ(ctx.seg_count, each.count);
        EXPECT_EQ(ctx.pcm_bytes, each.pcm_bytes);
        EXPECT_EQ(ctx.seg[each.count - 1].cap, each.last_capacity);
        EXPECT_EQ(ctx.seg[0].cap, each.capacity);
        const int64_t share = (kDuration - each.start) / each.count;
        for (int i = 0; i < each.count; ++i) {
            EXPECT_EQ(ctx.seg[i].start, each.start + i * share);
            EXPECT_EQ(ctx.seg[i].seek_pos, ctx.seg[i].start);
            EXPECT_EQ(ctx.seg[i].count, each.count);
            EXPECT_EQ(audio[static_cast<size_t>(i)].seeks.back(), ctx.seg[i].start);
        }
    }
}

TEST_F(second_plan, is_refused) {
    // One unit at 8000 Hz is no whole byte. With nothing left the steps are done all the same.
    for (const int64_t start : {kDuration, kDuration - 1, kDuration + 1, INT64_MAX, INT64_MIN}) {
        SCOPED_TRACE(start);
        EXPECT_EQ(plan(start), -2);
        const bool planned = start <= kDuration && start > 0;
        EXPECT_EQ(audio[0].seeks.size(), planned ? 2U : 1U);
        EXPECT_EQ(ctx.seg_count, planned ? 1 : 4);
        EXPECT_EQ(ctx.seg[0].start, planned ? start : 0);
        for (int i = 0; i < 4; ++i) EXPECT_EQ(ctx.seg[i].buf, nullptr);
        EXPECT_EQ(ctx.pcm, nullptr);
    }
}

TEST_F(second_plan, never_has_more_segments_than_records) {
    ASSERT_EQ(plan(-10'000'000, 1, 50'000'000), 0);  // six seconds
    EXPECT_EQ(ctx.seg_count, 1);
}

}  // namespace
