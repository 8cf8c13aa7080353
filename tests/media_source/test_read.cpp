// Reading, seeking and resetting: frames through the decoder into the queue and out of it.
#include "tests/media_source/source_case.h"

namespace {

using result = std::pair<int32_t, samples>;
using frames = std::vector<scripted::frame>;

constexpr int32_t kAll = 900'000;  // bytes; more than there are, fewer than the queue holds

// One stereo group, with the same in both channels. It is not the stream's first frame.
scripted::frame group(int16_t value, int32_t decode = 0, int32_t produced = 1) {
    return {{value, value}, 1000 + value, 0, decode, produced};
}

// The samples delivered of such groups: one, in Ogg both.
samples expected_of(const source_row &row, const samples &values) {
    samples out;
    for (const int16_t value : values) out.insert(out.end(), row.codec == 323 ? 2 : 1, value);
    return out;
}

struct Reading : SourceTest {
    // The code, and the samples delivered.
    result read(int32_t bytes) const {
        samples data(static_cast<size_t>(bytes / 2 + 2), 0x7EEE);
        mtsrc_frame frame = {data.data(), 0};
        const int32_t code = mtsrc_getstream(src, bytes, &frame);
        EXPECT_EQ(data.back(), 0x7EEE);
        return {code, {data.begin(), data.begin() + frame.size / 2}};
    }
    void expect_queue(std::ptrdiff_t rd, std::ptrdiff_t wr) const {
        EXPECT_TRUE(src->q_rd == src->q_base + rd && src->q_wr == src->q_base + wr);
        EXPECT_TRUE(src->q_fill == wr - rd && src->q_room == 1'048'576 - wr);
    }
};

TEST_F(Reading, FrameDecoderQueue) {
    for_each_row([&](const source_row &row) {
        const std::string get = row.reader + "_get_frm ", decode = row.decoder + "_decode ";
        open_frames(row, {group(10), group(20)});
        EXPECT_EQ(read(kAll), result(1, expected_of(row, {10, 20})));
        EXPECT_EQ(scripted::all.calls[0].number, row.frame_bytes);
        const std::string each = row.decoder.empty() ? get : get + decode;
        EXPECT_EQ(scripted::call_names(), each + each + get);
        if (row.decoder.empty()) return;
        const std::vector<std::string> records = scripted::all.calls[1].records;
        const wexa_frame frame = {nullptr, 0, 16, 0, row.codec, 0, {}};
        EXPECT_EQ(records[0].substr(8), bytes_of(frame).substr(8));
        wexa_output output = {};
        output.data = src->q_base;
        EXPECT_EQ(records[1], bytes_of(output));
        EXPECT_EQ(records[2], zeros(sizeof(wexa_status)));
    });
}

// One frame that is not decoded is skipped. A second in a row ends the call without a reset, as
// failures of the reader and impossible counts do: what was queued is kept.
TEST_F(Reading, FailuresAndFramesWithoutPcm) {
    for_each_row([&](const source_row &row) {
        const int32_t too_much =
            1'048'575 + (row.codec == 322 ? 131'070 : 0);  // past the end of a frame
        const struct {
            frames bad;  // between groups of 2 and 6
            int32_t code;
            size_t resets;
        } cases[] = {{{{{}, 9, 2}}, -6, 0},
                     {{{{4, 4}, 9, 0, 0, 1, {}, -1}}, -6, 0},
                     {{{{4, 4}, 9, 0, 0, 1, {}, row.frame_bytes + 1}}, -6, 0},
                     // With a decoder.
                     {{{{4, 4}, 9, 0, 0, 1, -2}}, -6, 0},
                     {{{{4, 4}, 9, 0, 0, 1, too_much}}, -6, 0},
                     {{group(4, -1)}, 1, 1},
                     {{group(4, 1), group(4, 0, 0), group(4, 1)}, 1, 2},
                     {{group(4, -1), group(4, -1), group(4, -1)}, -6, 2}};
        for (const auto &each : cases) {
            if (row.decoder.empty() && &each > &cases[2]) continue;
            SCOPED_TRACE(&each - cases);
            frames all = each.bad;
            all.insert(all.begin(), group(2));
            all.push_back(group(6));
            open_frames(row, all);
            const samples good = expected_of(row, {2, 6});
            EXPECT_EQ(read(kAll), result(each.code, each.code == 1 ? good : samples()));
            EXPECT_EQ(read(kAll), result(1, each.code == 1 ? samples() : good));
            EXPECT_EQ(scripted::calls_of("_reset").size(), each.resets);
        }
    });
    scripted::script empty_frames;  // forever
    empty_frames.last.result = 0;
    ASSERT_EQ(open_row(row_of("wav"), empty_frames), 0);
    EXPECT_EQ(read(2).first, -6);
}

TEST_F(Reading, ReductionsAndTheDelayOfMpegDecoders) {
    const samples pcm = {-3, 0, 3, 0, 32767, 32767, -32768, -32768, 32767, -32768, 7, 8};
    const samples first = {-3, 3, 32767, -32768, 32767, 7};
    const samples first_of_three = {-3, 0, -32768, -32768};
    samples late(1058, 1), kept(529, 1);  // one stereo group after the decoder's delay
    late.insert(late.end(), {7, 7});
    kept.push_back(7);
    // 7 and 6 bytes: a sample each, and 3 bytes that count. The second goes to an odd place.
    const frames odd = {{{0x0201, 5, 6, 7}, 1, 0, 0, 1, 7}, {{0x0A09, 7, 7, 7}, 2, 0, 0, 1, 6}};
    const struct {
        const char *row;
        int32_t channels;
        frames all;
        samples expected;
        int32_t rate = 44100;
    } cases[] = {
        {"aac", 2, {{pcm, 1}}, first},
        {"aac", 2, odd, {0x0201, 0x0905, 0x070A}},
        {"mp4 with mpeg", 3, {{pcm, 1}}, first_of_three},
        {"ogg", 2, {{pcm, 1}}, pcm},
        {"wav", 1, {{pcm, 1}, {{}, 2}}, pcm},
        {"wav", 3, {{pcm, 1}}, first_of_three},
        {"mpeg", 2, {{pcm, 1}}, {-1, 1, 32767, -32768, 0, 7}},  // the mean
        {"mpeg", 3, {{pcm, 1}}, {-1, 16383, -32768, -16380}},   // of the first two
        {"mpeg", 2, {{late, 0}, {{8, 8}, 9}}, {7, 8}},
        {"mpeg", 2, {{samples(800, 1), 0}, {{8, 8}, 9}}, {8}},  // shorter: no more than it
        {"mpeg", 2, {{late, 1}}, kept},
        {"mpeg", 2, {{late, 0}}, kept, 48000},
        {"mpeg", 1, {{late, 0}}, late},
        {"mp4 with mpeg", 2, {{late, 0}}, kept},
    };
    for (const auto &each : cases) {
        open_frames(row_of(each.row), each.all, each.channels, each.rate);
        EXPECT_EQ(read(kAll), result(1, each.expected)) << &each - cases;
    }
}

// The largest block, 65,535 sample pairs, decodes to twice the bytes free in the queue.
TEST_F(Reading, FlacBlocksOfAnySizeFitTheQueue) {
    samples block, expected;
    for (size_t i = 0; i < 131'070; ++i) block.push_back(static_cast<int16_t>(i / 2));
    for (size_t i = 0; i < 655'350; ++i) expected.push_back(block[i % 65'535 * 2]);
    open_frames(row_of("flac"), frames(10, {block, 1}));
    result got = read(kAll);
    const result rest = read(kAll);
    got.second.insert(got.second.end(), rest.second.begin(), rest.second.end());
    EXPECT_TRUE(got == result(0, expected) && rest.first == 1);
}

// Ogg delivers each decoded byte: 160 frames of 16,384 bytes, each sample the frame's number.
TEST_F(Reading, RequestsOfAnySizeAreDelivered) {
    frames numbered;
    for (int16_t i = 0; i < 160; ++i) {  // from frames that fill their buffer
        numbered.push_back({samples(8192, i), 1, 0, 0, 1, {}, 16'384});
    }
    open_frames(row_of("ogg"), numbered);
    EXPECT_EQ(read(0), result());
    EXPECT_EQ(scripted::call_names(), "");
    mtsrc_frame no_data = {nullptr, 0};
    EXPECT_EQ(read(-1).first, -4);
    EXPECT_EQ(mtsrc_getstream(src, 10, &no_data), -4);
    EXPECT_EQ(mtsrc_getstream(src, 10, nullptr), -4);
    // Free bytes of exactly one frame's size do not suffice: the bytes move first.
    for (int16_t i = 0; i < 63; ++i) EXPECT_EQ(read(16'384), result(0, samples(8192, i)));
    expect_queue(1'032'192, 1'032'192);
    EXPECT_EQ(read(2), result(0, {63}));
    expect_queue(2, 16'384);
    EXPECT_EQ(read(16'382), result(0, samples(8191, 63)));
    // 63 frames leave the bytes of one frame free, which do not suffice; the frames are kept.
    EXPECT_EQ(read(1'048'575), result(-4, {}));
    expect_queue(0, 1'032'192);
    for (int16_t i = 64; i < 160; ++i) EXPECT_EQ(read(16'384), result(0, samples(8192, i)));
    EXPECT_EQ(read(3'000'000), result(1, {}));  // more than the queue can hold, and nothing is left
    EXPECT_EQ(read(2), result(1, {}));          // the end is asked for each time
    EXPECT_EQ(scripted::calls_of("xoggds_get_frm").size(), 162u);
}

TEST_F(Reading, SeeksAndResets) {
    for_each_row([&](const source_row &row) {
        const bool wav = row.decoder.empty();  // moves in whole seconds, has nothing to reset
        const std::string reset = wav ? "" : row.decoder + "_reset ";
        scripted::script plan;
        plan.frames = {group(2), group(4), group(6)};
        plan.seeks = {{0, 5'000'000'000}, {-1, {}}};
        ASSERT_EQ(open_row(row, plan), 0);
        int64_t reached = 7;
        const std::pair<int64_t *, int32_t> seeks[] = {{&reached, 0}, {nullptr, -4}};
        for (const auto &[answer, code] : seeks) {
            EXPECT_EQ(read(1).first, 0);
            scripted::all.calls.clear();
            EXPECT_EQ(mtsrc_seekstream(src, 5'109'999'999, answer), code);
            EXPECT_EQ(scripted::call_names(), reset + row.reader + "_seek ");
            const scripted::call &seek = scripted::all.calls.back();
            EXPECT_EQ(seek.records[0], bytes_of<int64_t>(wav ? 510 : 5'109'999'999));
            EXPECT_TRUE(seek.addresses[1] == answer && seek.number == 0);
            expect_queue(0, 0);
        }
        EXPECT_EQ(reached, 5'000'000'000);
        EXPECT_EQ(read(1).first, 0);
        scripted::all.calls.clear();
        EXPECT_EQ(mtsrc_reset(src), -5);
        EXPECT_EQ(scripted::call_names(), reset);
        expect_queue(0, 0);
        EXPECT_EQ(read(1), result(1, {}));
    });
    // In MP4, another codec has no decoder: what is held is delivered.
    open_frames(row_of("mp4 with aac"), {group(2), group(4)});
    EXPECT_EQ(read(1).first, 0);
    src->codec = 307;
    EXPECT_EQ(read(1).first, 0);
    EXPECT_EQ(read(1).first, -6);
    src->codec = 306;
}

// The frame that aac_get_hz reads is consumed.
TEST_F(Reading, AacRateOfTheNextFrame) {
    open_frames(row_of("aac"),
                {{{2, 2}, 9, 0, 0, 1, {}, 24'576}, {{4, 4}, 9, 0, 0, 1, {}, 24'577}, group(6)});
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), 44100);
    const wexa_frame frame = {nullptr, 0, 24'576, 0, 306, 0, {}};
    EXPECT_EQ(scripted::all.calls[1].records[1].substr(8), bytes_of(frame).substr(8));
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
    EXPECT_EQ(read(kAll), result(1, {6}));
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
}

}  // namespace
