// Tests reads, seeks and resets of a source, whose frames pass through a decoder and a queue.
#include "tests/media_source/source_case.h"

namespace {

using result = std::pair<int32_t, samples>;
using frames = std::vector<fake_codec::frame>;

constexpr int32_t kAll = 900'000;  // bytes; less than the queue's size

// Returns a frame of one stereo pair. As its start is not 0, it does not count as the first frame.
fake_codec::frame pair_frame(int16_t value, int32_t decode_result = 0, int32_t produced = 1) {
    return {{value, value}, 1000 + value, 0, decode_result, produced};
}

// Returns a frame that cannot be read, or with a false size of itself or of its samples.
fake_codec::frame bad_frame(int32_t read_result, std::optional<int32_t> read_bytes = {},
                            std::optional<int32_t> bytes = {}) {
    return {{4, 4}, 1004, read_result, 0, 1, bytes, read_bytes};
}

// Returns the samples that a source delivers for pair frames: one per frame, or two in Ogg.
samples expected_of(const source_row &row, const samples &values) {
    samples out;
    for (const int16_t value : values) out.insert(out.end(), row.codec == 323 ? 2 : 1, value);
    return out;
}

struct Reading : SourceTest {
    // Returns the result code and the delivered samples.
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

TEST_F(Reading, FramesAreDecodedIntoTheQueue) {
    for_each_row([&](const source_row &row) {
        const std::string get = row.reader + "_get_frm ", decode = row.decoder + "_decode ";
        open_frames(row, {pair_frame(10), pair_frame(20)});
        EXPECT_EQ(read(kAll), result(1, expected_of(row, {10, 20})));
        EXPECT_EQ(fake_codec::state.calls[0].number, row.frame_bytes);
        const std::string frame_calls = row.decoder.empty() ? get : get + decode;
        EXPECT_EQ(fake_codec::call_names(), frame_calls + frame_calls + get);
        if (row.decoder.empty()) return;
        const std::vector<std::string> records = fake_codec::state.calls[1].records;
        const wexa_frame frame = {nullptr, 0, sizeof(void *), 0, row.codec, 0, {}};
        EXPECT_EQ(records[0].substr(8), bytes_of(frame).substr(8));
        wexa_output output = {};
        output.data = src->q_base;
        EXPECT_EQ(records[1], bytes_of(output));
        EXPECT_EQ(records[2], zeros(sizeof(wexa_status)));
    });
}

// An undecodable frame is skipped, and the decoder is reset. If the next frame is undecodable too,
// or a frame is unreadable or has an impossible size, the read fails. The next read then succeeds.
TEST_F(Reading, OneUndecodableFrameIsSkipped) {
    for_each_row([&](const source_row &row) {
        const int32_t too_many = 1'048'575 + (row.codec == 322 ? 131'070 : 0);
        const struct {
            frames bad;  // between good frames with the samples 2 and 6
            int32_t code;
            size_t resets;
        } cases[] = {{{bad_frame(2)}, -6, 0},
                     {{bad_frame(0, -1)}, -6, 0},
                     {{bad_frame(0, row.frame_bytes + 1)}, -6, 0},
                     // The other cases need a decoder.
                     {{bad_frame(0, {}, -2)}, -6, 0},
                     {{bad_frame(0, {}, too_many)}, -6, 0},
                     {{pair_frame(4, -1)}, 1, 1},
                     {{pair_frame(4, 1), pair_frame(4, 0, 0), pair_frame(4, 1)}, 1, 2},
                     {{pair_frame(4, -1), pair_frame(4, -1), pair_frame(4, -1)}, -6, 2}};
        for (const auto &each : cases) {
            if (row.decoder.empty() && &each > &cases[2]) continue;
            SCOPED_TRACE(&each - cases);
            frames stream = each.bad;
            stream.insert(stream.begin(), pair_frame(2));
            stream.push_back(pair_frame(6));
            open_frames(row, stream);
            const samples good = expected_of(row, {2, 6});
            EXPECT_EQ(read(kAll), result(each.code, each.code == 1 ? good : samples()));
            EXPECT_EQ(read(kAll), result(1, each.code == 1 ? samples() : good));
            EXPECT_EQ(fake_codec::calls_of("_reset").size(), each.resets);
        }
    });
#ifndef __SANITIZE_ADDRESS__               // millions of reads, which would take a minute
    fake_codec::stream_spec empty_frames;  // repeated forever
    empty_frames.last.read_result = 0;
    ASSERT_EQ(open_row(row_of("wav"), empty_frames), 0);
    EXPECT_EQ(read(2).first, -6);
#endif
}

TEST_F(Reading, PcmIsReducedToOneChannel) {
    const samples pcm = {-3, 0, 3, 0, 32767, 32767, -32768, -32768, 32767, -32768, 7, 8};
    const samples first = {-3, 3, 32767, -32768, 32767, 7};
    const samples first_of_three = {-3, 0, -32768, -32768};
    samples late(1058, 1), after_delay(529, 1);  // one stereo pair after the decoder's delay
    late.insert(late.end(), {7, 7});
    after_delay.push_back(7);
    // Frames with an odd number of bytes are joined without a gap.
    const frames odd = {{{0x0201, 5, 6, 7}, 1, 0, 0, 1, 7}, {{0x0A09, 7, 7, 7}, 2, 0, 0, 1, 6}};
    const struct {
        const char *row;
        int32_t channels;
        frames stream;
        samples expected;
        int32_t rate = 44100;
    } cases[] = {
        {"aac", 2, {{pcm, 1}}, first},
        {"aac", 2, odd, {0x0201, 0x0905, 0x070A}},
        {"mp4 with mpeg", 3, {{pcm, 1}}, first_of_three},
        {"ogg", 2, {{pcm, 1}}, pcm},
        {"wav", 1, {{pcm, 1}, {{}, 2}}, pcm},
        {"wav", 3, {{pcm, 1}}, first_of_three},
        {"mpeg", 2, {{pcm, 1}}, {-1, 1, 32767, -32768, 0, 7}},  // the mean of both channels
        {"mpeg", 3, {{pcm, 1}}, {-1, 16383, -32768, -16380}},   // the mean of the first two
        {"mpeg", 2, {{late, 0}, {{8, 8}, 9}}, {7, 8}},
        {"mpeg", 2, {{samples(800, 1), 0}, {{8, 8}, 9}}, {8}},  // drops one frame at most
        {"mpeg", 2, {{late, 1}}, after_delay},
        {"mpeg", 2, {{late, 0}}, after_delay, 48000},
        {"mpeg", 1, {{late, 0}}, late},
        {"mp4 with mpeg", 2, {{late, 0}}, after_delay},
    };
    for (const auto &each : cases) {
        open_frames(row_of(each.row), each.stream, each.channels, each.rate);
        EXPECT_EQ(read(kAll), result(1, each.expected)) << &each - cases;
    }
}

TEST_F(Reading, LargestFlacBlockFitsTheQueue) {
    samples block, expected;
    for (size_t i = 0; i < 131'070; ++i) block.push_back(static_cast<int16_t>(i / 2));
    for (size_t i = 0; i < 655'350; ++i) expected.push_back(block[i % 65'535 * 2]);
    open_frames(row_of("flac"), frames(10, {block, 1}));
    result got = read(kAll);
    const result rest = read(kAll);
    got.second.insert(got.second.end(), rest.second.begin(), rest.second.end());
    EXPECT_TRUE(got == result(0, expected) && rest.first == 1);
}

// The stream has 160 frames of 16,384 bytes. Every sample of a frame is the frame's number.
TEST_F(Reading, RequestsOfAnySizeAreDelivered) {
    frames numbered;
    for (int16_t i = 0; i < 160; ++i) {  // the frames fill their buffer
        numbered.push_back({samples(8192, i), 1, 0, 0, 1, {}, 16'384});
    }
    open_frames(row_of("ogg"), numbered);
    EXPECT_EQ(read(0), result());
    EXPECT_EQ(fake_codec::call_names(), "");
    mtsrc_frame no_data = {nullptr, 0};
    EXPECT_EQ(read(-1).first, -4);
    EXPECT_EQ(mtsrc_getstream(src, 10, &no_data), -4);
    EXPECT_EQ(mtsrc_getstream(src, 10, nullptr), -4);
    // If there is space for only one more frame, the queue first moves its bytes to the start.
    for (int16_t i = 0; i < 63; ++i) EXPECT_EQ(read(16'384), result(0, samples(8192, i)));
    expect_queue(1'032'192, 1'032'192);
    EXPECT_EQ(read(2), result(0, {63}));
    expect_queue(2, 16'384);
    EXPECT_EQ(read(16'382), result(0, samples(8191, 63)));
    // A request for almost the whole queue fails, but the queue keeps the frames read so far.
    EXPECT_EQ(read(1'048'575), result(-4, {}));
    expect_queue(0, 1'032'192);
    for (int16_t i = 64; i < 160; ++i) EXPECT_EQ(read(16'384), result(0, samples(8192, i)));
    EXPECT_EQ(read(3'000'000), result(1, {}));  // at the end a request of any size is valid
    EXPECT_EQ(read(2), result(1, {}));          // the reader is called again each time
    EXPECT_EQ(fake_codec::calls_of("xoggds_get_frm").size(), 162u);
}

TEST_F(Reading, SeekAndResetEmptyTheQueue) {
    for_each_row([&](const source_row &row) {
        const bool wav = row.decoder.empty();  // WAV has no decoder and seeks to whole seconds
        const std::string reset = wav ? "" : row.decoder + "_reset ";
        fake_codec::stream_spec stream;
        stream.frames = {pair_frame(2), pair_frame(4), pair_frame(6)};
        stream.seeks = {{0, 5'000'000'000}, {-1, {}}};
        ASSERT_EQ(open_row(row, stream), 0);
        int64_t reached = 7;
        const std::pair<int64_t *, int32_t> seeks[] = {{&reached, 0}, {nullptr, -4}};
        for (const auto &[answer, code] : seeks) {
            EXPECT_EQ(read(1).first, 0);
            fake_codec::state.calls.clear();
            EXPECT_EQ(mtsrc_seekstream(src, 5'109'999'999, answer), code);
            EXPECT_EQ(fake_codec::call_names(), reset + row.reader + "_seek ");
            const fake_codec::call &seek = fake_codec::state.calls.back();
            EXPECT_EQ(seek.records[0], bytes_of<int64_t>(wav ? 510 : 5'109'999'999));
            EXPECT_TRUE(seek.addresses[1] == answer && seek.number == 0);
            expect_queue(0, 0);
        }
        EXPECT_EQ(reached, 5'000'000'000);
        EXPECT_EQ(read(1).first, 0);
        fake_codec::state.calls.clear();
        EXPECT_EQ(mtsrc_reset(src), -5);
        EXPECT_EQ(fake_codec::call_names(), reset);
        expect_queue(0, 0);
        EXPECT_EQ(read(1), result(1, {}));
    });
    // An MP4 source with an unknown codec decodes nothing and delivers only what is in the queue.
    open_frames(row_of("mp4 with aac"), {pair_frame(2), pair_frame(4)});
    EXPECT_EQ(read(1).first, 0);
    src->codec = 307;
    EXPECT_EQ(read(1).first, 0);
    EXPECT_EQ(read(1).first, -6);
    src->codec = 306;
}

// aac_get_hz reads the rate from the next frame, which is then lost.
TEST_F(Reading, AacRateComesFromTheNextFrame) {
    open_frames(row_of("aac"), {bad_frame(0, 24'576), bad_frame(0, 24'577), pair_frame(6)});
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), 44100);
    const wexa_frame frame = {nullptr, 0, 24'576, 0, 306, 0, {}};
    EXPECT_EQ(fake_codec::state.calls[1].records[1].substr(8), bytes_of(frame).substr(8));
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
    EXPECT_EQ(read(kAll), result(1, {6}));
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
}

}  // namespace
