#include "tests/media_source/source_case.h"

namespace {

using SourceWav = SourceTest;
using samples = std::vector<int16_t>;

scripted::script chunks_of(const std::vector<samples> &chunks, int32_t channels) {
    scripted::script what;
    what.channels = channels;
    for (const samples &pcm : chunks) {
        scripted::frame one;
        one.pcm = pcm;
        what.frames.push_back(one);
    }
    return what;
}

TEST_F(SourceWav, OpensAndCloses) {
    ASSERT_EQ(open_file(wav_file(), scripted::script{}), 0);
    EXPECT_EQ(src->codec, 2006);
    EXPECT_EQ(src->frm_buf_size, 16384);
    EXPECT_EQ(src->decoder, nullptr);
    EXPECT_EQ(src->dstream, nullptr);
    EXPECT_EQ(src->format.channels, 2);
    const scripted::call made = scripted::calls_of("xwavd_create")[0];
    EXPECT_EQ(made.addresses[0], &src->io);
    EXPECT_EQ(made.records[1], zeros(4));
    EXPECT_EQ(made.records[2], zeros(48));
    close_source();
    EXPECT_EQ(scripted::call_names(), (names{"xwavd_create", "xwavd_delete"}));
}

TEST_F(SourceWav, WhatIsRefused) {
    struct {
        const char *name;
        int32_t codec;
        int32_t bits;
        int32_t rate;
        int32_t channels;
        int32_t code;
    } const cases[] = {
        {"float", 3, 16, 44100, 2, -3},           {"8 bits", 300, 8, 44100, 2, -3},
        {"24 bits", 300, 24, 44100, 2, -3},       {"96 kHz", 300, 16, 96000, 2, -3},
        {"48.001 kHz", 300, 16, 48001, 2, -3},    {"48 kHz", 300, 16, 48000, 2, 0},
        {"8 kHz", 300, 16, 8000, 1, 0},           {"no channel", 300, 16, 44100, 0, -3},
        {"channels < 0", 300, 16, 44100, -2, -3},
    };
    for (const auto &one : cases) {
        SCOPED_TRACE(one.name);
        scripted::script what;
        what.codec = one.codec;
        what.bits = one.bits;
        what.sample_rate = one.rate;
        what.channels = one.channels;
        scripted::reset();
        EXPECT_EQ(open_file(wav_file(), what), one.code);
        close_source();
        EXPECT_EQ(scripted::call_names(), (names{"xwavd_create", "xwavd_delete"}));
    }
}

TEST_F(SourceWav, WithoutAReader) {
    scripted::answer("xwavd_create", {-1});
    EXPECT_EQ(open_file(wav_file(), scripted::script{}), -7);
    scripted::script empty_record;
    empty_record.codec = 0;
    empty_record.bits = 0;
    scripted::answer("xwavd_create", {-1});
    EXPECT_EQ(open_file(wav_file(), empty_record), -3);
    EXPECT_EQ(scripted::call_names(), (names{"xwavd_create", "xwavd_create"}));
}

TEST_F(SourceWav, KeepsTheFirstChannel) {
    const std::vector<samples> chunks = {{1, -1, 2, -2, 3, -3}, {}, {4, -4, 5, -5, 6, -6}};
    ASSERT_EQ(open_file(wav_file(), chunks_of(chunks, 2)), 0);
    EXPECT_EQ(read_all(), (samples{1, 2, 3, 4, 5, 6}));
    close_source();
    ASSERT_EQ(open_file(wav_file(), chunks_of(chunks, 3)), 0);
    EXPECT_EQ(read_all(), (samples{1, -2, 4, -5}));
    close_source();
    ASSERT_EQ(open_file(wav_file(), chunks_of(chunks, 1)), 0);
    EXPECT_EQ(read_all(), (samples{1, -1, 2, -2, 3, -3, 4, -4, 5, -5, 6, -6}));
}

TEST_F(SourceWav, ReaderFailuresAndImpossibleCountsEndTheCall) {
    for (int fault = 0; fault < 3; ++fault) {
        scripted::script what = chunks_of({{1, 2}, {3, 4}, {5, 6}}, 1);
        if (fault == 0) {
            what.frames[1].result = -1;
        } else {
            what.frames[1].read_bytes = fault == 1 ? -1 : 16385;
        }
        ASSERT_EQ(open_file(wav_file(), what), 0);
        EXPECT_EQ(read(100), -6);
        EXPECT_EQ(read_all(), (samples{1, 2, 5, 6}));
        close_source();
    }
}

TEST_F(SourceWav, SeeksInWholeSeconds) {
    scripted::script what = chunks_of({{1, 2}, {3, 4}}, 1);
    what.seeks = {{0, 20'000'000}, {0, {}}, {-1, {}}};
    ASSERT_EQ(open_file(wav_file(), what), 0);
    EXPECT_EQ(read(1), 0);
    const auto seconds = [](size_t call) {
        int64_t value = -1;
        memcpy(&value, scripted::calls_of("xwavd_seek")[call].records[0].data(), sizeof(value));
        return value;
    };
    int64_t reached = 0;
    EXPECT_EQ(mtsrc_seekstream(src, 29'000'000, &reached), 0);
    EXPECT_EQ(seconds(0), 2);
    EXPECT_EQ(reached, 20'000'000);
    EXPECT_EQ(src->q_fill, 0);
    EXPECT_EQ(mtsrc_seekstream(src, 5'000'000, &reached), 0);
    EXPECT_EQ(seconds(1), 0);
    EXPECT_EQ(reached, 5'000'000);
    EXPECT_EQ(read(1), 0);
    EXPECT_EQ(mtsrc_seekstream(src, 10'000'000, &reached), -4);
    EXPECT_EQ(seconds(2), 1);
    EXPECT_EQ(src->q_fill, 0);
    EXPECT_EQ(mtsrc_reset(src), -5);
}

}  // namespace
