#include "media_source/wexaaudio.h"
#include "tests/media_source/source_case.h"

namespace {

using Elementary = SourceTest;
using samples = std::vector<int16_t>;

// Frames of one stereo group, (first, 0), so that every reduction but MPEG's gives `first`.
scripted::frame group(int16_t first, int32_t decode = 0) {
    scripted::frame one;
    one.pcm = {first, 0};
    one.decode = decode;
    one.start = 1000 + first;  // none is the stream's first
    return one;
}

scripted::script frames_of(const std::vector<scripted::frame> &frames) {
    scripted::script what;
    what.frames = frames;
    return what;
}

// The bytes of a delivered frame of group(first) for a row: Ogg keeps both samples.
samples expected_of(const source_row &row, const samples &firsts) {
    samples out;
    for (const int16_t first : firsts) {
        if (row.codec == 323) {
            out.insert(out.end(), {first, 0});
        } else {
            const bool mean = std::string(row.name) == "mpeg";
            out.push_back(static_cast<int16_t>(mean ? first / 2 : first));
        }
    }
    return out;
}

TEST_F(Elementary, FrameDecoderQueue) {
    for (const source_row &row : source_rows()) {
        SCOPED_TRACE(row.name);
        scripted::reset();
        ASSERT_EQ(open_row(row, frames_of({group(10), group(20)})), 0);
        scripted::forget_calls();
        samples got;
        const uint8_t *before = src->q_wr;
        EXPECT_EQ(read(100, &got), 1);
        EXPECT_EQ(got, expected_of(row, {10, 20}));
        EXPECT_EQ(scripted::call_names(),
                  (names{row.read, row.decode, row.read, row.decode, row.read}));
        EXPECT_EQ(scripted::calls_of(row.read)[0].number, row.frame_bytes);
        const scripted::call decoded = scripted::calls_of(row.decode)[0];
        wexa_frame frame = {};
        memcpy(&frame, decoded.records[0].data(), sizeof(frame));
        wexa_frame expected = {};
        expected.data = frame.data;
        expected.bytes = 16;
        expected.codec = row.codec;
        EXPECT_EQ(memcmp(&frame, &expected, sizeof(frame)), 0);
        EXPECT_EQ(memcmp(decoded.records[3].data(), "SCFR", 4), 0);
        wexa_output output = {};
        output.data = const_cast<uint8_t *>(before);
        EXPECT_EQ(memcmp(decoded.records[1].data(), &output, sizeof(output)), 0);
        EXPECT_EQ(decoded.records[2], zeros(sizeof(wexa_status)));
        close_source();
    }
}

TEST_F(Elementary, OneBadFrameIsSkippedTwoInARowFail) {
    for (const source_row &row : source_rows()) {
        SCOPED_TRACE(row.name);
        scripted::reset();
        ASSERT_EQ(
            open_row(row, frames_of({group(2), group(4, -1), group(6), group(8, 1), group(10)})),
            0);
        scripted::forget_calls();
        samples got;
        EXPECT_EQ(read(100, &got), 1);
        EXPECT_EQ(got, expected_of(row, {2, 6, 10}));
        EXPECT_EQ(scripted::calls_of(row.reset).size(), 2u);
        close_source();

        // The second failure ends the call without a reset and keeps what was queued; the next call
        // starts afresh, so the third failure is its first.
        ASSERT_EQ(open_row(row, frames_of({group(2), group(4, -1), group(6, -1), group(8, -1),
                                           group(10)})),
                  0);
        scripted::forget_calls();
        EXPECT_EQ(read(100), -6);
        EXPECT_EQ(scripted::call_names().back(), row.decode);
        EXPECT_EQ(scripted::calls_of(row.reset).size(), 1u);
        EXPECT_EQ(read(100, &got), 1);
        EXPECT_EQ(got, expected_of(row, {2, 10}));
        close_source();
    }
}

TEST_F(Elementary, AFrameThatGivesNothingIsNoFailure) {
    for (const source_row &row : source_rows()) {
        SCOPED_TRACE(row.name);
        scripted::frame nothing = group(4);
        nothing.produced = 0;
        scripted::reset();
        ASSERT_EQ(open_row(row, frames_of({group(2, -1), nothing, group(6, -1), group(8)})), 0);
        samples got;
        EXPECT_EQ(read(100, &got), 1);
        EXPECT_EQ(got, expected_of(row, {8}));
        close_source();
    }
}

TEST_F(Elementary, ReaderFailuresAndImpossibleCountsEndTheCall) {
    for (const source_row &row : source_rows()) {
        for (int fault = 0; fault < 6; ++fault) {
            SCOPED_TRACE(std::string(row.name) + ", fault " + std::to_string(fault));
            scripted::frame bad = group(4);
            switch (fault) {
                case 0:
                    bad.result = 2;
                    break;
                case 1:
                    bad.result = -1;
                    break;
                case 2:
                    bad.bytes = -2;
                    break;
                case 3:
                    bad.bytes = 1'048'576;
                    break;  // more than is left behind the first frame
                case 4:
                    bad.read_bytes = -1;
                    break;
                default:
                    bad.read_bytes = row.frame_bytes + 1;
            }
            scripted::reset();
            ASSERT_EQ(open_row(row, frames_of({group(2), bad, group(6)})), 0);
            EXPECT_EQ(read(100), -6);
            samples got;
            EXPECT_EQ(read(100, &got), 1);
            EXPECT_EQ(got, expected_of(row, {2, 6}));
            close_source();
        }
    }
}

TEST_F(Elementary, Reductions) {
    scripted::frame pairs;
    pairs.start = 5;
    pairs.pcm = {-3, 0, 3, 0, 32767, 32767, -32768, -32768, 32767, -32768, 7, 8};
    const samples first = {-3, 3, 32767, -32768, 32767, 7};
    for (const source_row &row : source_rows()) {
        SCOPED_TRACE(row.name);
        ASSERT_EQ(open_row(row, frames_of({pairs})), 0);
        const samples mean = {-1, 1, 32767, -32768, 0, 7};
        EXPECT_EQ(read_all(), row.codec == 323                  ? pairs.pcm
                              : std::string(row.name) == "mpeg" ? mean
                                                                : first);
        close_source();
    }
    // Three channels: the mean of the first two, the first alone, and one channel as it is.
    scripted::script three = frames_of({pairs});
    three.channels = 3;
    ASSERT_EQ(open_row(source_row_of("mpeg"), three), 0);
    EXPECT_EQ(read_all(), (samples{-1, 16383, -32768, -16380}));
    close_source();
    ASSERT_EQ(open_row(source_row_of("mp4 with mpeg"), three), 0);
    EXPECT_EQ(read_all(), (samples{-3, 0, -32768, -32768}));
    close_source();
    three.channels = 1;
    ASSERT_EQ(open_row(source_row_of("mpeg"), three), 0);
    EXPECT_EQ(read_all(), pairs.pcm);
}

// 7 bytes of stereo: one sample, and 3 bytes that count. The next frame is decoded to an odd place.
TEST_F(Elementary, OddByteCounts) {
    scripted::frame odd = group(0);
    odd.pcm = {0x0201, 0x0403, 0x0605, 0x0807};
    odd.bytes = 7;
    ASSERT_EQ(open_row(source_row_of("aac"), frames_of({odd, group(0x0A09)})), 0);
    uint8_t data[16] = {};
    mtsrc_frame frame = {data, 0};
    EXPECT_EQ(mtsrc_getstream(src, 16, &frame), 1);
    EXPECT_EQ(frame.size, 5);
    EXPECT_EQ(byte_run(data, data + 5), (byte_run{1, 2, 3, 9, 10}));
}

TEST_F(Elementary, MpegDropsTheDecodersDelayOnce) {
    const auto ramp = [](size_t pairs, int64_t start) {
        scripted::frame one;
        one.start = start;
        for (size_t i = 0; i < pairs; ++i) {
            one.pcm.insert(one.pcm.end(), 2, static_cast<int16_t>(i));
        }
        return one;
    };
    struct {
        const char *name;
        const char *row;
        int32_t rate;
        int32_t channels;
        std::vector<scripted::frame> frames;
        size_t samples;
        int16_t first;
    } const cases[] = {
        {"44.1 kHz stereo", "mpeg", 44100, 2, {ramp(1152, 0), ramp(1152, 9)}, 1775, 529},
        {"48 kHz", "mpeg", 48000, 2, {ramp(1152, 0)}, 1152, 0},
        {"mono", "mpeg", 44100, 1, {ramp(576, 0)}, 1152, 0},
        {"not the first frame", "mpeg", 44100, 2, {ramp(1152, 1)}, 1152, 0},
        {"exactly the delay", "mpeg", 44100, 2, {ramp(529, 0), ramp(3, 9)}, 3, 0},
        {"shorter: all of it, no more", "mpeg", 44100, 2, {ramp(384, 0), ramp(384, 9)}, 384, 0},
        {"MP4", "mp4 with mpeg", 44100, 2, {ramp(1152, 0)}, 1152, 0},
    };
    for (const auto &one : cases) {
        SCOPED_TRACE(one.name);
        scripted::script what = frames_of(one.frames);
        what.sample_rate = one.rate;
        what.channels = one.channels;
        ASSERT_EQ(open_row(source_row_of(one.row), what), 0);
        const samples got = read_all();
        ASSERT_EQ(got.size(), one.samples);
        EXPECT_EQ(got[0], one.first);
        close_source();
    }
}

// The largest block, 65,535 sample pairs, is twice the room that the queue keeps for other formats.
TEST_F(Elementary, FlacHasRoomForItsLargestBlock) {
    scripted::frame block;
    block.pcm.resize(size_t{65'535} * 2);
    for (size_t i = 0; i < block.pcm.size(); i += 2) {
        block.pcm[i] = static_cast<int16_t>(i / 2 % 32'000);
    }
    ASSERT_EQ(open_row(source_row_of("flac"), frames_of({20, block})), 0);
    size_t total = 0;
    int32_t code = 0;
    while (code == 0) {
        samples got;
        code = read(8192, &got);
        for (size_t i = 0; i < got.size(); ++i) {
            ASSERT_EQ(got[i], block.pcm[(total + i) % 65'535 * 2]);
        }
        total += got.size();
    }
    EXPECT_EQ(code, 1);
    EXPECT_EQ(total, size_t{65'535} * 20);
    EXPECT_TRUE(scripted::flac_flag_always_set());
    for (const scripted::call &decoded : scripted::calls_of("xflacd_decode")) {
        wexa_output output = {};
        memcpy(&output, decoded.records[1].data(), sizeof(output));
        EXPECT_LE(static_cast<uint8_t *>(output.data) + 262'140, src->q_base + src->q_cap);
    }
}

TEST_F(Elementary, SeeksAndResets) {
    for (const source_row &row : source_rows()) {
        SCOPED_TRACE(row.name);
        scripted::script what = frames_of({group(2), group(4), group(6)});
        what.seeks = {{0, 5'000'000'000}, {-1, {}}, {0, {}}};
        scripted::reset();
        ASSERT_EQ(open_row(row, what), 0);
        const size_t queued = expected_of(row, {4}).size();
        EXPECT_EQ(read(1), 0);
        scripted::forget_calls();
        int64_t reached = 7;
        EXPECT_EQ(mtsrc_seekstream(src, 5'100'000'000, &reached), 0);
        EXPECT_EQ(reached, 5'000'000'000);
        EXPECT_EQ(scripted::call_names(), (names{row.reset, row.seek}));
        const scripted::call moved = scripted::calls_of(row.seek)[0];
        int64_t position = 0;
        memcpy(&position, moved.records[0].data(), sizeof(position));
        EXPECT_EQ(position, 5'100'000'000);
        EXPECT_EQ(moved.number, 0);
        EXPECT_EQ(src->q_fill, 0);
        EXPECT_EQ(src->q_wr, src->q_base);

        EXPECT_EQ(read(static_cast<int32_t>(queued) * 2 - 1), 0);
        EXPECT_GT(src->q_fill, 0);
        EXPECT_EQ(mtsrc_seekstream(src, 1, &reached), -4);
        EXPECT_EQ(src->q_fill, 0);
        EXPECT_EQ(src->q_room, src->q_cap);
        EXPECT_EQ(mtsrc_seekstream(src, 33, &reached), 0);  // moves without saying where
        EXPECT_EQ(reached, 33);

        EXPECT_EQ(read(1), 0);
        scripted::forget_calls();
        EXPECT_EQ(mtsrc_reset(src), -5);
        EXPECT_EQ(scripted::call_names(), names{row.reset});
        EXPECT_EQ(src->q_fill, 0);
        EXPECT_EQ(read(1), 1);
        close_source();
    }
}

TEST_F(Elementary, Mp4WithAnotherCodecDeliversOnlyWhatIsHeld) {
    ASSERT_EQ(open_row(source_row_of("mp4 with aac"), frames_of({group(2), group(4)})), 0);
    EXPECT_EQ(read(1), 0);
    src->codec = 307;
    EXPECT_EQ(read(1), 0);
    EXPECT_EQ(read(1), -6);
    src->codec = 306;
}

TEST_F(Elementary, AacRateOfTheNextFrame) {
    scripted::script what = frames_of({group(2), group(4)});
    what.sample_rate = 32000;
    ASSERT_EQ(open_row(source_row_of("aac"), what), 0);
    scripted::forget_calls();
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), 32000);
    EXPECT_EQ(scripted::call_names(), (names{"xaacfd_get_frm", "xaacd_info"}));
    EXPECT_EQ(scripted::calls()[0].number, 24576);
    wexa_frame frame = {};
    memcpy(&frame, scripted::calls()[1].records[1].data(), sizeof(frame));
    EXPECT_EQ(frame.bytes, 16);
    EXPECT_EQ(frame.word_20, 0);
    EXPECT_EQ(frame.codec, 306);
    EXPECT_EQ(read_all(), samples{4});  // the frame is consumed
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
}

TEST_F(Elementary, AacRateThatCannotBeHad) {
    for (const int32_t bytes : {24576, 24577}) {
        scripted::script what = frames_of({group(2)});
        what.frames[0].read_bytes = bytes;
        ASSERT_EQ(open_row(source_row_of("aac"), what), 0);
        EXPECT_EQ(aac_get_hz(src->demux, src->decoder), bytes == 24576 ? what.sample_rate : -1);
        close_source();
    }
    ASSERT_EQ(open_row(source_row_of("aac"), frames_of({group(2), group(4)})), 0);
    scripted::answer("xaacd_info", {-1});
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
}

}  // namespace
