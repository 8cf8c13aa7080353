#include "media_source/wexaaudio.h"
#include "tests/media_source/source_case.h"

namespace {

using Elementary = SourceTest;

constexpr int32_t kNothing = 99;  // in place of a result: a decoding that gives no PCM

// A frame of one stereo group, with the same in both channels.
scripted::frame group(int16_t value, int32_t decode = 0) {
    scripted::frame one;
    one.pcm = {value, value};
    one.decode = decode == kNothing ? 0 : decode;
    one.produced = decode == kNothing ? 0 : 1;
    one.start = 1000 + value;  // none is the stream's first
    return one;
}

// What is delivered of such groups: one sample, but by Ogg both.
samples expected_of(const source_row &row, const samples &values) {
    samples out;
    for (const int16_t value : values) {
        out.insert(out.end(), row.codec == 323 ? 2 : 1, value);
    }
    return out;
}

TEST_F(Elementary, FrameDecoderQueue) {
    for_each_row([&](const source_row &row) {
        open_frames(row, {group(10), group(20)});
        uint8_t *const queue = src->q_wr;
        EXPECT_EQ(read_all(), expected_of(row, {10, 20}));
        EXPECT_EQ(scripted::calls_of(row.read())[0].number, row.frame_bytes);
        if (row.decoder.empty()) {
            EXPECT_EQ(scripted::call_names(), names(3, row.read()));
            return;
        }
        EXPECT_EQ(scripted::call_names(),
                  (names{row.read(), row.decode(), row.read(), row.decode(), row.read()}));
        const scripted::call decoded = scripted::calls_of(row.decode())[0];
        const auto frame = recorded<wexa_frame>(decoded, 0);
        wexa_frame expected = {};
        expected.data = frame.data;
        expected.bytes = 16;
        expected.codec = row.codec;
        EXPECT_EQ(memcmp(&frame, &expected, sizeof(frame)), 0);
        EXPECT_EQ(memcmp(decoded.records[3].data(), "SCFR", 4), 0);
        wexa_output output = {};
        output.data = queue;
        EXPECT_EQ(memcmp(decoded.records[1].data(), &output, sizeof(output)), 0);
        EXPECT_EQ(decoded.records[2], zeros(sizeof(wexa_status)));
    });
}

// A second failure in a row ends the call without a reset and keeps what was queued; the next call
// starts afresh, so the third failure is its first.
TEST_F(Elementary, OneBadFrameIsSkippedTwoInARowFail) {
    struct {
        const char *name;
        std::vector<int32_t> decodes;
        int32_t code;
        size_t resets;
        samples delivered;
    } const cases[] = {
        {"apart", {0, -1, 0, 1, 0}, 1, 2, {2, 6, 10}},
        {"in a row", {0, -1, -1, -1, 0}, -6, 1, {2, 10}},
        {"with a frame between that gives nothing", {-1, kNothing, -1, 0}, 1, 2, {8}},
    };
    for_each_row([&](const source_row &row) {
        for (const auto &one : cases) {
            if (row.decoder.empty()) {
                continue;
            }
            SCOPED_TRACE(one.name);
            std::vector<scripted::frame> frames;
            for (const int32_t decode : one.decodes) {
                frames.push_back(group(static_cast<int16_t>(2 * frames.size() + 2), decode));
            }
            open_frames(row, frames);
            samples got;
            EXPECT_EQ(read(100, &got), one.code);
            EXPECT_EQ(scripted::calls_of(row.reset()).size(), one.resets);
            EXPECT_EQ(one.code == 1 ? got : read_all(), expected_of(row, one.delivered));
            close_source();
        }
    });
}

TEST_F(Elementary, ReaderFailuresAndImpossibleCountsEndTheCall) {
    for_each_row([&](const source_row &row) {
        std::vector<scripted::frame> faults(row.decoder.empty() ? 4 : 6, group(4));
        faults[0].result = 2;
        faults[1].result = -1;
        faults[2].read_bytes = -1;
        faults[3].read_bytes = row.frame_bytes + 1;
        if (!row.decoder.empty()) {
            faults[4].bytes = -2;
            // More than is left behind the first frame.
            faults[5].bytes = row.codec == 322 ? 1'048'575 + 131'070 : 1'048'575;
        }
        for (const scripted::frame &bad : faults) {
            SCOPED_TRACE(&bad - faults.data());
            open_frames(row, {group(2), bad, group(6)});
            EXPECT_EQ(read(100), -6);
            EXPECT_EQ(read_all(), expected_of(row, {2, 6}));
            close_source();
        }
    });
}

TEST_F(Elementary, Reductions) {
    scripted::frame empty = group(0);
    empty.pcm.clear();
    scripted::frame full = group(0);
    full.pcm = {-3, 0, 3, 0, 32767, 32767, -32768, -32768, 32767, -32768, 7, 8};
    const samples first = {-3, 3, 32767, -32768, 32767, 7};
    const samples first_of_three = {-3, 0, -32768, -32768};
    struct {
        const char *row;
        int32_t channels;
        samples expected;
    } const cases[] = {
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
    for (const auto &one : cases) {
        SCOPED_TRACE(std::string(one.row) + ", " + std::to_string(one.channels));
        open_frames(source_row_of(one.row), {empty, full}, one.channels);
        EXPECT_EQ(read_all(), one.expected);
        close_source();
    }
}

// 7 bytes of stereo: one sample, and 3 bytes that count. The next frame is decoded to an odd place.
TEST_F(Elementary, OddByteCounts) {
    scripted::frame odd = group(0);
    odd.pcm = {0x0201, 0x0403, 0x0605, 0x0807};
    odd.bytes = 7;
    open_frames(source_row_of("aac"), {odd, group(0x0A09)});
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
        scripted::script what;
        what.frames = one.frames;
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
    samples mono;
    scripted::frame block;
    for (int32_t i = 0; i < 65'535; ++i) {
        mono.push_back(static_cast<int16_t>(i % 32'000));
        block.pcm.insert(block.pcm.end(), 2, mono.back());
    }
    open_frames(source_row_of("flac"), std::vector<scripted::frame>(10, block));
    const samples all = read_all(8192);
    ASSERT_EQ(all.size(), mono.size() * 10);
    for (auto at = all.begin(); at != all.end(); at += 65'535) {
        EXPECT_TRUE(std::equal(mono.begin(), mono.end(), at));
    }
    for (const scripted::call &decoded : scripted::calls_of("xflacd_decode")) {
        const auto output = recorded<wexa_output>(decoded, 1);
        EXPECT_LE(static_cast<uint8_t *>(output.data) + 262'140, src->q_base + 1'048'576 + 131'070);
    }
    // 127 requests leave 8,176 of the first eight blocks' 1,048,560 bytes, with a room of 16; the
    // next moves them to the front before it fetches the ninth.
    close_source();
    open_frames(source_row_of("flac"), std::vector<scripted::frame>(10, block));
    const struct {
        int requests;
        ptrdiff_t rd, wr;
        int32_t room;
    } places[] = {{1, 8'192, 131'070, 917'506},
                  {126, 1'040'384, 1'048'560, 16},
                  {1, 8'192, 139'246, 909'330}};
    for (const auto &place : places) {
        for (int i = 0; i < place.requests; ++i) EXPECT_EQ(read(8192), 0);
        EXPECT_EQ(src->q_rd - src->q_base, place.rd);
        EXPECT_EQ(src->q_wr - src->q_base, place.wr);
        EXPECT_EQ(src->q_fill, place.wr - place.rd);
        EXPECT_EQ(src->q_room, place.room);
    }
    // With 917,506 bytes held no room is left for one more block.
    std::vector<scripted::frame> frames(7, block);
    frames.push_back(group(2));
    frames.back().pcm.assign(16, 2);
    frames.push_back(block);
    for (const int32_t want : {917'506, 917'507}) {
        close_source();
        open_frames(source_row_of("flac"), frames);
        EXPECT_EQ(read(want), want == 917'506 ? 0 : -4);
    }
}

TEST_F(Elementary, FramesThatAddNothingAreSkipped) {
    for (const int64_t blanks : {16'777'215, 16'777'216}) {
        scripted::script what;
        what.blanks = blanks;
        what.frames = {group(2)};
        ASSERT_EQ(open_row(source_row_of("wav"), what), 0);
        EXPECT_EQ(read(2), blanks == 16'777'215 ? 0 : -6);
        close_source();
    }
}

TEST_F(Elementary, SeeksAndResets) {
    for_each_row([&](const source_row &row) {
        const bool wav = row.decoder.empty();  // moves in whole seconds, has nothing to reset
        const names resets = wav ? names{} : names{row.reset()};
        names reset_and_seek = resets;
        reset_and_seek.push_back(row.seek());
        scripted::script what;
        what.frames = {group(2), group(4), group(6)};
        what.seeks = {{0, 5'000'000'000}, {-1, {}}, {0, {}}, {0, {}}};
        ASSERT_EQ(open_row(row, what), 0);
        const auto queued = static_cast<int32_t>(expected_of(row, {4}).size());
        EXPECT_EQ(read(1), 0);
        scripted::forget_calls();
        int64_t reached = 7;
        EXPECT_EQ(mtsrc_seekstream(src, 5'109'999'999, &reached), 0);
        EXPECT_EQ(reached, 5'000'000'000);
        EXPECT_EQ(scripted::call_names(), reset_and_seek);
        const scripted::call moved = scripted::calls_of(row.seek())[0];
        EXPECT_EQ(recorded<int64_t>(moved, 0), wav ? 510 : 5'109'999'999);
        EXPECT_EQ(moved.number, 0);
        EXPECT_EQ(src->q_fill, 0);
        EXPECT_EQ(src->q_wr, src->q_base);

        EXPECT_EQ(read(queued * 2 - 1), 0);
        EXPECT_GT(src->q_fill, 0);
        EXPECT_EQ(mtsrc_seekstream(src, 1, &reached), -4);
        EXPECT_EQ(src->q_fill, 0);
        EXPECT_EQ(src->q_room, src->q_cap);
        // The caller's pointer reaches the reader, which may leave its value alone.
        reached = 7;
        EXPECT_EQ(mtsrc_seekstream(src, 33, &reached), 0);
        EXPECT_EQ(reached, 7);
        EXPECT_EQ(scripted::calls_of(row.seek()).back().addresses[1], &reached);
        EXPECT_EQ(mtsrc_seekstream(src, 33, nullptr), 0);
        EXPECT_EQ(scripted::calls_of(row.seek()).back().addresses[1], nullptr);

        EXPECT_EQ(read(1), 0);
        scripted::forget_calls();
        EXPECT_EQ(mtsrc_reset(src), -5);
        EXPECT_EQ(scripted::call_names(), resets);
        EXPECT_EQ(src->q_fill, 0);
        EXPECT_EQ(read(1), 1);
    });
}

TEST_F(Elementary, Mp4WithAnotherCodecDeliversOnlyWhatIsHeld) {
    open_frames(source_row_of("mp4 with aac"), {group(2), group(4)});
    EXPECT_EQ(read(1), 0);
    src->codec = 307;
    EXPECT_EQ(read(1), 0);
    EXPECT_EQ(read(1), -6);
    src->codec = 306;
}

TEST_F(Elementary, AacRateOfTheNextFrame) {
    const source_row &row = source_row_of("aac");
    scripted::frame longest = group(2);
    longest.read_bytes = row.frame_bytes;
    scripted::frame too_long = group(2);
    too_long.read_bytes = row.frame_bytes + 1;
    open_frames(row, {group(2), longest, too_long, group(4), group(6)});
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), 44100);
    EXPECT_EQ(scripted::call_names(), (names{"xaacfd_get_frm", "xaacd_info"}));
    EXPECT_EQ(scripted::calls_of(row.read())[0].number, row.frame_bytes);
    const auto frame = recorded<wexa_frame>(scripted::calls_of("xaacd_info")[0], 1);
    EXPECT_EQ(frame.bytes, 16);
    EXPECT_EQ(frame.word_20, 0);
    EXPECT_EQ(frame.codec, 306);
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), 44100);
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
    scripted::answer("xaacd_info", {-1});
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
    EXPECT_EQ(read_all(), samples{6});  // those asked about are consumed
    EXPECT_EQ(aac_get_hz(src->demux, src->decoder), -1);
}

}  // namespace
