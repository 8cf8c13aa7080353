// Reading, seeking and resetting: frames through the decoder into the queue and out of it.
#include "tests/media_source/source_case.h"

namespace {

constexpr int32_t kNothing = 99;  // in place of a result: a decoding that gives no PCM

// A frame of one stereo group, with the same in both channels.
scripted::frame group(int16_t value, int32_t decode = 0) {
    scripted::frame made;
    made.pcm = {value, value};
    made.decode = decode == kNothing ? 0 : decode;
    made.produced = decode == kNothing ? 0 : 1;
    made.start = 1000 + value;  // none is the stream's first
    return made;
}

scripted::frame ramp(size_t pairs, int64_t start = 1) {
    scripted::frame made;
    made.start = start;
    for (size_t i = 0; i < pairs; ++i) made.pcm.insert(made.pcm.end(), 2, static_cast<int16_t>(i));
    return made;
}

// What is delivered of such groups: one sample, but by Ogg both.
samples expected_of(const source_row &row, const samples &values) {
    samples out;
    for (const int16_t value : values) out.insert(out.end(), row.codec == 323 ? 2 : 1, value);
    return out;
}

struct Reading : SourceTest {
    void expect_queue(std::ptrdiff_t rd, std::ptrdiff_t wr) const {
        EXPECT_EQ(src->q_rd - src->q_base, rd);
        EXPECT_EQ(src->q_wr - src->q_base, wr);
        EXPECT_EQ(src->q_fill, wr - rd);
        EXPECT_EQ(src->q_room, 1'048'576 - wr);
        EXPECT_EQ(src->q_cap, 1'048'576);
    }
};

TEST_F(Reading, FrameDecoderQueue) {
    for_each_row([&](const source_row &row) {
        const std::string read = row.reader + "_get_frm", decode = row.decoder + "_decode";
        open_frames(row, {group(10), group(20)});
        EXPECT_EQ(read_all(), expected_of(row, {10, 20}));
        EXPECT_EQ(last_call(read).number, row.frame_bytes);
        if (row.decoder.empty()) {
            EXPECT_EQ(scripted::call_names(), names(3, read));
            return;
        }
        EXPECT_EQ(scripted::call_names(), (names{read, decode, read, decode, read}));
        const scripted::call decoded = scripted::calls_of(decode)[0];
        const auto frame = recorded<wexa_frame>(decoded, 0);
        wexa_frame expected = {};
        expected.data = frame.data;
        expected.bytes = 16;
        expected.codec = row.codec;
        EXPECT_EQ(memcmp(&frame, &expected, sizeof frame), 0);
        wexa_output output = {};
        output.data = src->q_base;
        EXPECT_EQ(memcmp(decoded.records[1].data(), &output, sizeof output), 0);
        EXPECT_EQ(decoded.records[2], zeros(sizeof(wexa_status)));
    });
}

// A second failure in a row ends the call without a reset and keeps what was queued; the next call
// starts afresh, so the third failure is its first.
TEST_F(Reading, OneBadFrameIsSkippedTwoInARowFail) {
    const struct {
        const char *name;
        std::vector<int32_t> decodes;
        int32_t code;
        size_t resets;
        samples delivered;
    } cases[] = {
        {"apart", {0, -1, 0, 1, 0}, 1, 2, {2, 6, 10}},
        {"in a row", {0, -1, -1, -1, 0}, -6, 1, {2, 10}},
        {"with a frame between that gives nothing", {-1, kNothing, -1, 0}, 1, 2, {8}},
    };
    for_each_row([&](const source_row &row) {
        for (const auto &each : cases) {
            if (row.decoder.empty()) continue;
            SCOPED_TRACE(each.name);
            std::vector<scripted::frame> frames;
            for (const int32_t decode : each.decodes) {
                frames.push_back(group(static_cast<int16_t>(2 * frames.size() + 2), decode));
            }
            open_frames(row, frames);
            samples got;
            EXPECT_EQ(read(100, &got), each.code);
            EXPECT_EQ(scripted::calls_of(row.decoder + "_reset").size(), each.resets);
            EXPECT_EQ(each.code == 1 ? got : read_all(), expected_of(row, each.delivered));
        }
    });
}

TEST_F(Reading, ReaderFailuresAndImpossibleCountsEndTheCall) {
    for_each_row([&](const source_row &row) {
        std::vector<scripted::frame> faults(row.decoder.empty() ? 4 : 6, group(4));
        faults[0].result = 2;
        faults[1].result = -1;
        faults[2].read_bytes = -1;
        faults[3].read_bytes = row.frame_bytes + 1;
        if (!row.decoder.empty()) {
            faults[4].bytes = -2;
            // More than is left behind the first frame.
            faults[5].bytes = 1'048'575 + (row.codec == 322 ? 131'070 : 0);
        }
        for (const scripted::frame &bad : faults) {
            SCOPED_TRACE(&bad - faults.data());
            open_frames(row, {group(2), bad, group(6)});
            EXPECT_EQ(read(100), -6);
            EXPECT_EQ(read_all(), expected_of(row, {2, 6}));
        }
    });
}

TEST_F(Reading, FramesThatAddNothingAreSkipped) {
    for (const int64_t blanks : {16'777'215, 16'777'216}) {
        scripted::script plan;
        plan.blanks = blanks;
        plan.frames = {group(2)};
        ASSERT_EQ(open_row(source_row_of("wav"), plan), 0);
        EXPECT_EQ(read(2), blanks == 16'777'215 ? 0 : -6);
        close_source();
    }
}

TEST_F(Reading, Reductions) {
    scripted::frame full = group(0);
    full.pcm = {-3, 0, 3, 0, 32767, 32767, -32768, -32768, 32767, -32768, 7, 8};
    const samples first = {-3, 3, 32767, -32768, 32767, 7};
    const samples first_of_three = {-3, 0, -32768, -32768};
    const struct {
        const char *row;
        int32_t channels;
        samples expected;
    } cases[] = {
        {"aac", 2, first},
        {"flac", 2, first},
        {"mp4 with aac", 2, first},
        {"mp4 with mpeg", 2, first},
        {"mp4 with mpeg", 3, first_of_three},
        {"mpeg", 1, full.pcm},
        {"mpeg", 2, {-1, 1, 32767, -32768, 0, 7}},  // the mean
        {"mpeg", 3, {-1, 16383, -32768, -16380}},   // of the first two
        {"ogg", 2, full.pcm},
        {"wav", 1, full.pcm},
        {"wav", 2, first},
        {"wav", 3, first_of_three},
    };
    for (const auto &each : cases) {
        open_frames(source_row_of(each.row), {full}, each.channels);
        EXPECT_EQ(read_all(), each.expected) << each.row << ", " << each.channels;
    }
    // 7 bytes of stereo: one sample, and 3 bytes that count. The next frame goes to an odd place.
    scripted::frame odd = group(0);
    odd.pcm = {0x0201, 0x0403, 0x0605, 0x0807};
    odd.bytes = 7;
    open_frames(source_row_of("aac"), {odd, group(0x0A09)});
    uint8_t data[16] = {};
    mtsrc_frame frame = {data, 0};
    EXPECT_EQ(mtsrc_getstream(src, 16, &frame), 1);
    EXPECT_EQ(byte_run(data, data + frame.size), (byte_run{1, 2, 3, 9, 10}));
}

TEST_F(Reading, MpegDropsTheDecodersDelayOnce) {
    const struct {
        const char *name;
        const char *row;
        int32_t rate, channels;
        std::vector<scripted::frame> frames;
        size_t samples;
        int16_t first;
    } cases[] = {
        {"44.1 kHz stereo", "mpeg", 44100, 2, {ramp(1152, 0), ramp(1152, 9)}, 1775, 529},
        {"48 kHz", "mpeg", 48000, 2, {ramp(1152, 0)}, 1152, 0},
        {"mono", "mpeg", 44100, 1, {ramp(576, 0)}, 1152, 0},
        {"not the first frame", "mpeg", 44100, 2, {ramp(1152, 1)}, 1152, 0},
        {"shorter: all of it, no more", "mpeg", 44100, 2, {ramp(384, 0), ramp(384, 9)}, 384, 0},
        {"MP4", "mp4 with mpeg", 44100, 2, {ramp(1152, 0)}, 1152, 0},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.name);
        open_frames(source_row_of(each.row), each.frames, each.channels, each.rate);
        const samples got = read_all();
        ASSERT_EQ(got.size(), each.samples);
        EXPECT_EQ(got[0], each.first);
    }
}

// The largest block, 65,535 sample pairs, decodes to twice the bytes that the queue has room for.
TEST_F(Reading, FlacMovesLikeTheOthersAndHasRoomForItsLargestBlock) {
    const scripted::frame block = ramp(65'535);
    const std::vector<scripted::frame> blocks(10, block);
    open_frames(source_row_of("flac"), blocks);
    const samples all = read_all();
    ASSERT_EQ(all.size(), 655'350u);
    for (size_t i = 0; i < all.size(); ++i) {
        ASSERT_EQ(all[i], static_cast<int16_t>(i % 65'535)) << i;
    }
    for (const scripted::call &decoded : scripted::calls_of("xflacd_decode")) {
        const auto output = recorded<wexa_output>(decoded, 1);
        EXPECT_LE(static_cast<uint8_t *>(output.data) + 262'140, src->q_base + 1'048'576 + 131'070);
    }
    // 127 requests leave 8,176 of the first eight blocks' 1,048,560 bytes, with a room of 16; the
    // next moves them to the front before it fetches the ninth.
    open_frames(source_row_of("flac"), blocks);
    EXPECT_EQ(read(8192), 0);
    expect_queue(8'192, 131'070);
    for (int i = 1; i < 127; ++i) EXPECT_EQ(read(8192), 0);
    expect_queue(1'040'384, 1'048'560);
    EXPECT_EQ(read(8192), 0);
    expect_queue(8'192, 139'246);
    // With 917,506 bytes held there is no room for one more block.
    std::vector<scripted::frame> frames(7, block);
    frames.push_back(ramp(8));
    frames.push_back(block);
    for (const int32_t want : {917'506, 917'507}) {
        open_frames(source_row_of("flac"), frames);
        EXPECT_EQ(read(want), want == 917'506 ? 0 : -4);
    }
}

// Ogg delivers each decoded byte: 160 frames of 16,384 bytes, each sample the frame's number.
TEST_F(Reading, TheQueueDeliversAnyPiece) {
    std::vector<scripted::frame> frames(160, group(0));
    for (size_t i = 0; i < frames.size(); ++i) frames[i].pcm.assign(8192, static_cast<int16_t>(i));
    open_frames(source_row_of("ogg"), frames);
    const auto expect_read = [this](int32_t bytes, int32_t code, const samples &expected) {
        samples got;
        EXPECT_EQ(read(bytes, &got), code);
        EXPECT_EQ(got, expected);
    };
    expect_read(0, 0, {});
    EXPECT_EQ(scripted::call_names(), names{});
    expect_read(2, 0, {0});
    expect_read(16'382, 0, samples(8191, 0));
    EXPECT_EQ(scripted::calls_of("xoggds_get_frm").size(), 1u);
    EXPECT_EQ(read(-1), -4);
    mtsrc_frame no_data = {nullptr, 0};
    EXPECT_EQ(mtsrc_getstream(src, 10, &no_data), -4);
    EXPECT_EQ(mtsrc_getstream(src, 10, nullptr), -4);
    // A room of just one frame's size is too short: the bytes move first.
    for (int16_t i = 1; i < 63; ++i) expect_read(16'384, 0, samples(8192, i));
    expect_queue(1'032'192, 1'032'192);
    expect_read(2, 0, {63});
    expect_queue(2, 16'384);
    // 16,382 bytes and 63 frames fill the queue but for two bytes. Nothing is lost.
    expect_read(1'048'575, -4, {});
    expect_queue(0, 1'048'574);
    expect_read(16'382, 0, samples(8191, 63));
    for (int16_t i = 64; i < 160; ++i) expect_read(16'384, 0, samples(8192, i));
    expect_read(3'000'000, 1, {});  // more than the queue can hold, and nothing is left
    expect_read(2, 1, {});          // the end is asked for each time
    EXPECT_EQ(scripted::calls_of("xoggds_get_frm").size(), 162u);
}

TEST_F(Reading, SeeksAndResets) {
    for_each_row([&](const source_row &row) {
        const bool wav = row.decoder.empty();  // moves in whole seconds, has nothing to reset
        const names resets = wav ? names{} : names{row.decoder + "_reset"};
        names reset_and_seek = resets;
        reset_and_seek.push_back(row.reader + "_seek");
        scripted::script plan;
        plan.frames = {group(2), group(4), group(6)};
        plan.seeks = {{0, 5'000'000'000}, {-1, {}}, {0, {}}, {0, {}}};
        ASSERT_EQ(open_row(row, plan), 0);
        EXPECT_EQ(read(1), 0);
        scripted::forget_calls();
        int64_t reached = 7;
        EXPECT_EQ(mtsrc_seekstream(src, 5'109'999'999, &reached), 0);
        EXPECT_EQ(reached, 5'000'000'000);
        EXPECT_EQ(scripted::call_names(), reset_and_seek);
        const scripted::call moved = last_call(row.reader + "_seek");
        EXPECT_EQ(recorded<int64_t>(moved, 0), wav ? 510 : 5'109'999'999);
        EXPECT_EQ(moved.number, 0);
        expect_queue(0, 0);

        EXPECT_EQ(read(1), 0);
        EXPECT_EQ(mtsrc_seekstream(src, 1, &reached), -4);
        expect_queue(0, 0);
        // The caller's pointer reaches the reader, which may leave its value alone.
        reached = 7;
        EXPECT_EQ(mtsrc_seekstream(src, 33, &reached), 0);
        EXPECT_EQ(reached, 7);
        EXPECT_EQ(last_call(row.reader + "_seek").addresses[1], &reached);
        EXPECT_EQ(mtsrc_seekstream(src, 33, nullptr), 0);
        EXPECT_EQ(last_call(row.reader + "_seek").addresses[1], nullptr);

        EXPECT_EQ(read(1), 0);
        scripted::forget_calls();
        EXPECT_EQ(mtsrc_reset(src), -5);
        EXPECT_EQ(scripted::call_names(), resets);
        expect_queue(0, 0);
        EXPECT_EQ(read(1), 1);
    });
}

TEST_F(Reading, Mp4WithAnotherCodecDeliversOnlyWhatIsHeld) {
    open_frames(source_row_of("mp4 with aac"), {group(2), group(4)});
    EXPECT_EQ(read(1), 0);
    src->codec = 307;
    EXPECT_EQ(read(1), 0);
    EXPECT_EQ(read(1), -6);
    src->codec = 306;
}

TEST_F(Reading, AacRateOfTheNextFrame) {
    scripted::frame too_long = group(2);
    too_long.read_bytes = 24'577;
    open_frames(source_row_of("aac"), {group(2), too_long, group(4), group(6)});
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), 44100);
    EXPECT_EQ(scripted::call_names(), (names{"xaacfd_get_frm", "xaacd_info"}));
    EXPECT_EQ(last_call("xaacfd_get_frm").number, 24'576);
    const auto frame = recorded<wexa_frame>(last_call("xaacd_info"), 1);
    EXPECT_EQ(frame.bytes, 16);
    EXPECT_EQ(frame.word_20, 0);
    EXPECT_EQ(frame.codec, 306);
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
    scripted::answer("xaacd_info", {-1});
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
    EXPECT_EQ(read_all(), samples{6});  // those asked about are consumed
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
}

}  // namespace
