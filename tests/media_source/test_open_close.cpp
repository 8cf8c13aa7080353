#include "media_source/wexaaudio.h"
#include "tests/media_source/source_case.h"

namespace {

using OpenClose = SourceTest;

TEST_F(OpenClose, CallsRecordsAndOrder) {
    for_each_row([&](const source_row &row) {
        scripted::script what;
        what.tags = true;
        what.sample_rate = 22050;
        what.channels = 5;
        what.duration = 123'456'789'012;
        ASSERT_EQ(open_row(row, what), 0);
        EXPECT_EQ(scripted::call_names(), row.opens);
        EXPECT_EQ(scripted::tag_buffers_left(), 0);
        EXPECT_EQ(src->codec, row.codec);
        EXPECT_EQ(src->frm_buf_size, row.frame_bytes);
        mtsrc_format format;
        memset(&format, 0xAB, sizeof(format));
        EXPECT_EQ(mtsrc_getstream_format(src, &format), 0);
        EXPECT_EQ(format.sample_rate, 22050);
        EXPECT_EQ(format.channels, row.channels ? row.channels : 5);
        EXPECT_EQ(format.bits, 16);
        EXPECT_EQ(format.duration, what.duration);
        const uint8_t *gap = reinterpret_cast<uint8_t *>(&format) + 12;  // the caller's
        EXPECT_EQ(byte_run(gap, gap + 4), byte_run(4, 0xAB));
        // Reader: the handle's callbacks, word and information record zeroed.
        const scripted::call reader = scripted::calls_of(row.opens[row.libraries.size()])[0];
        EXPECT_EQ(reader.addresses[0], &src->io);
        EXPECT_EQ(reader.records[1], zeros(reader.records[1].size()));
        EXPECT_EQ(reader.records[2], zeros(reader.records[2].size()));
        if (!row.decoder.empty()) {
            const byte_run config = scripted::calls_of(row.decoder + "_create")[0].records[0];
            std::vector<int32_t> words(config.size() / sizeof(int32_t));
            memcpy(words.data(), config.data(), config.size());
            EXPECT_EQ(words, row.config);
        }
        scripted::forget_calls();
        close_source();
        EXPECT_EQ(scripted::call_names(), row.closes);
    });
}

TEST_F(OpenClose, EachFailingStepIsCleanedUp) {
    for_each_row([&](const source_row &row) {
        for (size_t at = 0; at < row.opens.size(); ++at) {
            const std::string step = row.opens[at];
            if (row.failures[at] == 0) {
                continue;
            }
            SCOPED_TRACE(step + ", call " + std::to_string(at));
            const bool again = at > 0 && row.opens[at - 1] == step;
            scripted::answer(step, again ? std::vector<int32_t>{0, -9} : std::vector<int32_t>{-9});
            scripted::script what;
            what.tags = true;
            scripted::forget_calls();
            EXPECT_EQ(open_row(row, what), row.failures[at]);
            EXPECT_EQ(scripted::live_objects(), 0);
            EXPECT_EQ(scripted::tag_buffers_left(), 0);
            names calls = scripted::call_names();
            // The open that fails gives back what it initialised, then the frame closes once more.
            for (const std::string &library : row.libraries) {
                EXPECT_EQ(std::count(calls.begin(), calls.end(), library + "_deinit"),
                          at < row.libraries.size() ? 1 : 2);
            }
            calls.resize(at + 1);
            EXPECT_EQ(calls, names(row.opens.data(), row.opens.data() + at + 1));
        }
    });
}

TEST_F(OpenClose, RatesAndChannelsAccepted) {
    const auto expect_open = [&](const source_row &row, int32_t rate, int32_t channels, bool good) {
        SCOPED_TRACE(std::to_string(rate) + " Hz, " + std::to_string(channels) + " channels");
        scripted::script what;
        what.sample_rate = rate;
        what.channels = channels;
        what.tags = true;
        scripted::forget_calls();
        EXPECT_EQ(open_row(row, what), good ? 0 : -3);
        if (!good) {  // everything made is given back, then the frame closes once more
            names expected = row.opens;
            expected.insert(expected.end(), row.closes.begin(), row.closes.end());
            for (const std::string &library : row.libraries) {
                expected.push_back(library + "_deinit");
            }
            EXPECT_EQ(scripted::call_names(), expected);
        }
        EXPECT_EQ(scripted::tag_buffers_left(), 0);
        close_source();
    };
    struct {
        const char *row;
        int32_t least;  // Hz; 0: any
        int32_t most;
        bool channels_count;  // those that the file tells
    } const cases[] = {
        {"aac", 8000, 48000, false},       {"flac", 8000, 192000, false},
        {"mpeg", 0, 48000, true},          {"mp4 with aac", 8000, 48000, false},
        {"mp4 with mpeg", 0, 48000, true}, {"ogg", 0, 48000, false},
        {"wav", 0, 48000, true},
    };
    for (const auto &one : cases) {
        SCOPED_TRACE(one.row);
        const source_row &row = source_row_of(one.row);
        expect_open(row, 7999, 2, one.least == 0);
        expect_open(row, 8000, 1, true);
        expect_open(row, one.most, 2, true);
        expect_open(row, one.most + 1, 2, false);
        expect_open(row, 44100, 0, !one.channels_count);
        expect_open(row, 44100, -1, !one.channels_count);
    }
}

TEST_F(OpenClose, WavOfSixteenBitPcmOnly) {
    struct {
        const char *name;
        int32_t codec;
        int32_t bits;
        int32_t created;  // result of making the reader
    } const cases[] = {{"float", 3, 16, 0},
                       {"8 bits", kWexaPcm, 8, 0},
                       {"24 bits", kWexaPcm, 24, 0},
                       {"no reader and an empty record", 0, 0, -1}};
    for (const auto &one : cases) {
        SCOPED_TRACE(one.name);
        scripted::script what;
        what.codec = one.codec;
        what.bits = one.bits;
        scripted::answer("xwavd_create", {one.created});
        EXPECT_EQ(open_row(source_row_of("wav"), what), -3);
        EXPECT_EQ(scripted::live_objects(), 0);
    }
}

TEST_F(OpenClose, ContainersChooseTheFirstAudioTrack) {
    for (const char *name : {"mp4 with aac", "ogg"}) {
        SCOPED_TRACE(name);
        const source_row &row = source_row_of(name);
        const bool mp4 = row.codec == 306;
        std::vector<int32_t> no_audio(mp4 ? 64 : 16, 2);
        std::vector<int32_t> only_last = no_audio;
        only_last.back() = 1;
        struct {
            std::vector<int32_t> kinds;
            int32_t count;   // that the record tells
            int32_t chosen;  // -1: none
        } const cases[] = {
            {{2, 0, 1, 1}, 4, 2},
            {{2, 3}, 2, -1},
            {{2, 1}, 1, -1},
            // A count beyond the record's room does not lead out of it.
            {no_audio, 1'000'000'000, -1},
            {only_last, 1'000'000'000, mp4 ? 63 : 15},
        };
        scripted::script what;
        for (const auto &one : cases) {
            what.kinds = one.kinds;
            what.kind_count = one.count;
            EXPECT_EQ(open_row(row, what), one.chosen < 0 ? -7 : 0);
            if (one.chosen >= 0) {
                const auto opened = scripted::calls_of(mp4 ? "xmp4fds_open" : "xoggds_open");
                EXPECT_EQ(opened.back().number, one.chosen);
            }
            close_source();
        }
        what.codec = 0x54;
        EXPECT_EQ(open_row(row, what), mp4 ? -3 : -7);
    }
    xmp4_info mp4 = {};
    EXPECT_EQ(get_mp4_audiostream(&mp4), -1);
    xogg_info ogg = {};
    ogg.kind[0] = 1;
    ogg.stream_count = -1;
    EXPECT_EQ(get_ogg_audiostream(&ogg), -1);
}

TEST_F(OpenClose, VorbisSetUpDataReachTheDecoder) {
    scripted::script what;
    what.setup = {9, 8, 7, 6, 5};
    ASSERT_EQ(open_row(source_row_of("ogg"), what), 0);
    const scripted::call set_up = scripted::calls_of("xvorbisd_decode").back();
    const auto frame = recorded<wexa_frame>(set_up, 0);
    EXPECT_EQ(frame.bytes, 5);
    EXPECT_EQ(frame.word_20, 0);
    EXPECT_EQ(frame.codec, 323);
    EXPECT_EQ(recorded<wexa_output>(set_up, 1).data, nullptr);
    EXPECT_EQ(set_up.records[3], what.setup);
    close_source();
    // A block of 40 bytes holds 40, one of 41 holds more without a sanitizer: not a byte is added.
    what.setup = zeros(40);
    ASSERT_EQ(open_row(source_row_of("ogg"), what), 0);
    EXPECT_EQ(scripted::calls_of("xoggds_get_format").back().number, 40);
    close_source();
    what.setup_length = -1;
    EXPECT_EQ(open_row(source_row_of("ogg"), what), -7);
}

TEST_F(OpenClose, WithoutAHandleOrAProbeFile) {
    for_each_row([&](const source_row &row) {
        ASSERT_EQ(open_row(row, {}), 0);
        const mtsrc_ctx format = *src;
        close_source();
        scripted::forget_calls();
        mtsrc_ctx empty = {};
        mtsrc_frame frame = {};
        int64_t reached = 0;
        EXPECT_EQ(format.open(nullptr), -4);
        EXPECT_EQ(format.open(&empty), -7);
        format.close(nullptr);
        EXPECT_EQ(format.get_frm(nullptr, 0, &frame), -4);
        EXPECT_EQ(format.seek(nullptr, 0, &reached), -4);
        EXPECT_EQ(format.reset(nullptr), -4);
        EXPECT_EQ(scripted::call_names(), names{});
    });
    mtsrc_ctx no_stream = {};
    int64_t reached = 77;
    EXPECT_EQ(mtsource_mp4a_seek(&no_stream, 0, &reached), -4);
    // Neither does the frame write to it.
    ASSERT_EQ(open_row(source_row_of("mp4 with aac"), {}), 0);
    void *const stream = src->dstream;
    src->dstream = nullptr;
    EXPECT_EQ(mtsrc_seekstream(src, 5, &reached), -4);
    EXPECT_EQ(reached, 77);
    src->dstream = stream;
}

}  // namespace
