// Opening and closing: through the frame and through each format's own operations.
#include <fcntl.h>

#include <algorithm>

#include "tests/media_source/source_case.h"

namespace {

using OpenClose = SourceTest;

TEST_F(OpenClose, CallsRecordsAndOrder) {
    for_each_row([&](const source_row &row) {
        scripted::script plan;
        plan.tags = true;
        plan.sample_rate = 22050;
        plan.channels = 5;
        plan.duration = 123'456'789'012;
        ASSERT_EQ(open_row(row, plan), 0);
        EXPECT_EQ(memcmp(&src->mark, "KOVA", 4), 0);
        EXPECT_EQ(scripted::call_names(), words(row.opens));
        EXPECT_EQ(src->codec, row.codec);
        EXPECT_EQ(src->frm_buf_size, row.frame_bytes);
        mtsrc_format format, expected;
        memset(&format, 0xAB, sizeof format);
        memset(&expected, 0xAB, sizeof expected);  // the gap behind bits is the caller's
        expected.sample_rate = 22050;
        expected.channels = row.channels ? row.channels : 5;
        expected.bits = 16;
        expected.duration = plan.duration;
        EXPECT_EQ(mtsrc_getstream_format(src, &format), 0);
        EXPECT_EQ(memcmp(&format, &expected, sizeof format), 0);
        // Reader: the handle's callbacks, word and information record zeroed.
        const scripted::call reader = last_call(words(row.opens)[row.libraries]);
        EXPECT_EQ(reader.addresses[0], &src->io);
        EXPECT_EQ(reader.records[1], zeros(reader.records[1].size()));
        EXPECT_EQ(reader.records[2], zeros(reader.records[2].size()));
        if (!row.decoder.empty()) {
            const byte_run config = last_call(row.decoder + "_create").records[0];
            ASSERT_EQ(config.size(), row.config.size() * 4);
            EXPECT_EQ(memcmp(config.data(), row.config.data(), config.size()), 0);
        }
    });
}

// The open that fails gives back what it initialised, then the frame closes once more.
TEST_F(OpenClose, EachFailingStepIsCleanedUp) {
    for_each_row([&](const source_row &row) {
        names calls = words(row.opens);
        for (size_t at = calls.size(); at > 0; --at) {
            const std::string step = calls[at - 1];
            if (row.codes[at - 1] == 0) continue;
            SCOPED_TRACE(step + ", call " + std::to_string(at));
            const bool again = at > 1 && calls[at - 2] == step;
            scripted::answer(step, again ? std::vector<int32_t>{0, -9} : std::vector<int32_t>{-9});
            scripted::script plan;
            plan.tags = true;
            EXPECT_EQ(open_row(row, plan), row.codes[at - 1]);
            names made = scripted::call_names();
            const auto closed = std::count_if(
                made.begin(), made.end(),
                [](const std::string &call) { return call.find("_deinit") != std::string::npos; });
            const auto libraries = static_cast<std::ptrdiff_t>(row.libraries);
            EXPECT_EQ(closed, at <= row.libraries ? libraries : 2 * libraries);
            calls.resize(at);
            made.resize(at);
            EXPECT_EQ(made, calls);
        }
    });
}

TEST_F(OpenClose, RatesAndChannelsAccepted) {
    const struct {
        const char *row;
        int32_t least;  // Hz; 0: any
        int32_t most;
        bool channels_count;  // those that the file tells
    } cases[] = {
        {"aac", 8000, 48000, false},       {"flac", 8000, 192000, false},
        {"mpeg", 0, 48000, true},          {"mp4 with aac", 8000, 48000, false},
        {"mp4 with mpeg", 0, 48000, true}, {"ogg", 0, 48000, false},
        {"wav", 0, 48000, true},
    };
    for (const auto &each : cases) {
        const source_row &row = source_row_of(each.row);
        const struct {
            int32_t rate, channels;
            bool good;
        } streams[] = {{7999, 2, each.least == 0},
                       {8000, 1, true},
                       {each.most, 2, true},
                       {each.most + 1, 2, false},
                       {44100, 0, !each.channels_count},
                       {44100, -1, !each.channels_count}};
        for (const auto &stream : streams) {
            SCOPED_TRACE(testing::Message() << each.row << ", " << stream.rate << " Hz, "
                                            << stream.channels << " channels");
            scripted::script plan;
            plan.sample_rate = stream.rate;
            plan.channels = stream.channels;
            plan.tags = true;
            EXPECT_EQ(open_row(row, plan), stream.good ? 0 : -3);
            close_source();
        }
    }
}

TEST_F(OpenClose, WavOfSixteenBitPcmOnly) {
    const struct {
        const char *name;
        int32_t codec, bits, created;  // created: result of making the reader
    } cases[] = {{"float", 3, 16, 0},
                 {"8 bits", kWexaPcm, 8, 0},
                 {"24 bits", kWexaPcm, 24, 0},
                 {"no reader and an empty record", 0, 0, -1}};
    for (const auto &each : cases) {
        scripted::script plan;
        plan.codec = each.codec;
        plan.bits = each.bits;
        scripted::answer("xwavd_create", {each.created});
        EXPECT_EQ(open_row(source_row_of("wav"), plan), -3) << each.name;
    }
}

TEST_F(OpenClose, ContainersChooseTheFirstAudioTrack) {
    for (const bool mp4 : {true, false}) {
        const source_row &row = source_row_of(mp4 ? "mp4 with aac" : "ogg");
        std::vector<int32_t> only_last(mp4 ? 64 : 16, 2);
        const std::vector<int32_t> no_audio = only_last;
        only_last.back() = 1;
        const struct {
            std::vector<int32_t> kinds;
            int32_t count;   // that the record tells
            int32_t chosen;  // -1: none
        } cases[] = {
            {{2, 0, 1, 1}, 4, 2},
            {{2, 1}, 1, -1},
            {{1}, -1, -1},
            // A count beyond the record's room does not lead out of it.
            {no_audio, 1'000'000'000, -1},
            {only_last, 1'000'000'000, mp4 ? 63 : 15},
        };
        scripted::script plan;
        for (const auto &each : cases) {
            SCOPED_TRACE(testing::Message() << row.name << ", " << each.count << " told");
            plan.kinds = each.kinds;
            plan.kind_count = each.count;
            EXPECT_EQ(open_row(row, plan), each.chosen < 0 ? -7 : 0);
            EXPECT_TRUE(each.chosen < 0 || last_call(row.reader + "_open").number == each.chosen);
            close_source();
        }
        plan.codec = 0x54;
        EXPECT_EQ(open_row(row, plan), mp4 ? -3 : -7);
    }
}

TEST_F(OpenClose, VorbisSetUpDataReachTheDecoder) {
    scripted::script plan;
    // Of this length a block of its own pages has at most 8 bytes more, of one byte more a page.
    constexpr int32_t kLength = (15 << 20) - 24;
    plan.setup = byte_run(kLength, 9);
    ASSERT_EQ(open_row(source_row_of("ogg"), plan), 0);
    EXPECT_LE(last_call("xoggds_get_format").number, kLength + 8);
    const scripted::call set_up = last_call("xvorbisd_decode");
    const auto frame = recorded<wexa_frame>(set_up, 0);
    EXPECT_EQ(frame.bytes, kLength);
    EXPECT_EQ(frame.word_20, 0);
    EXPECT_EQ(frame.codec, 323);
    EXPECT_EQ(recorded<wexa_output>(set_up, 1).data, nullptr);
    EXPECT_TRUE(set_up.records[3] == plan.setup);
    close_source();
    for (const int32_t length : {-1, (1 << 24) + 1}) {
        plan.setup_length = length;
        EXPECT_EQ(open_row(source_row_of("ogg"), plan), -7);
    }
}

TEST_F(OpenClose, WithoutAHandleAProbeFileOrTheMark) {
    int64_t reached = 77;
    mtsrc_frame frame = {};
    for_each_row([&](const source_row &row) {
        ASSERT_EQ(open_row(row, {}), 0);
        const mtsrc_ctx format = *src;
        close_source();
        scripted::forget_calls();
        mtsrc_ctx empty = {};
        EXPECT_EQ(format.open(nullptr), -4);
        EXPECT_EQ(format.open(&empty), -7);
        format.close(nullptr);
        EXPECT_EQ(format.get_frm(nullptr, 0, &frame), -4);
        EXPECT_EQ(format.seek(nullptr, 0, &reached), -4);
        EXPECT_EQ(format.reset(nullptr), -4);
        EXPECT_EQ(scripted::call_names(), names{});
    });
    // The frame does not write to reached either.
    ASSERT_EQ(open_row(source_row_of("mp4 with aac"), {}), 0);
    void *const stream = src->dstream;
    src->dstream = nullptr;
    EXPECT_EQ(mtsrc_seekstream(src, 5, &reached), -4);
    src->dstream = stream;
    EXPECT_EQ(mtsrc_getstream_format(src, nullptr), -4);
    mtsrc_ctx unmarked = {};
    memcpy(&unmarked.mark, "KOVB", 4);
    for (mtsrc_ctx *bad : {static_cast<mtsrc_ctx *>(nullptr), &unmarked}) {
        mtsrc_format format = {};
        char byte = 0;
        frame = {&byte, 77};
        EXPECT_EQ(mtsrc_getstream_format(bad, &format), -4);
        EXPECT_EQ(mtsrc_seekstream(bad, 5, &reached), -4);
        EXPECT_EQ(mtsrc_getstream(bad, 1, &frame), -4);
        EXPECT_EQ(mtsrc_reset(bad), -4);
        EXPECT_EQ(mtsrc_deinit(bad), -4);
        EXPECT_EQ(frame.size, 77);
    }
    EXPECT_EQ(reached, 77);
}

TEST_F(OpenClose, PathsAndFilesThatDoNotOpen) {
    EXPECT_EQ(open_path(path), -7);
    EXPECT_EQ(open_path(testing::TempDir()), -6);  // a directory opens, but cannot be read
    write(zeros(15));
    EXPECT_EQ(open_path(path), -6);
    write(zeros(100));
    EXPECT_EQ(open_path(path), -3);
    write(
        {0x30, 0x26, 0xB2, 0x75, 0x8E, 0x66, 0xCF, 0x11, 0xA6, 0xD9, 0, 0xAA, 0, 0x62, 0xCE, 0x6C});
    EXPECT_EQ(open_path(path), -3);  // ASF
    EXPECT_EQ(scripted::call_names(), names{});
    const mtsrc_param no_path = {nullptr};
    EXPECT_EQ(mtsrc_init(&no_path, &err), nullptr);
    EXPECT_EQ(err, -4);

    for (const byte_run &content :  // Layers I and II
         {byte_run{0xFF, 0xFF, 0x10} + zeros(29) + byte_run{0xFF, 0xFF, 0x10, 0},
          byte_run{0xFF, 0xFD, 0xA4} + zeros(573) + byte_run{0xFF, 0xFD, 0xA4, 0}}) {
        write(content);
        ASSERT_EQ(open_path(path), 0);
        EXPECT_EQ(src->codec, 305);
        close_source();
    }
    std::string longest = path;
    longest.insert(path.rfind('/'), 511 - path.size(), '/');
    EXPECT_EQ(open_path(longest), 0);
    close_source();
    EXPECT_EQ(open_path("/" + longest), -3);
}

// The caller's record: a descriptor, read from its start, and callbacks that count what is open.
int opened = 0;

TEST_F(OpenClose, ACallersOwnRecord) {
    write(source_row_of("flac").file);
    const int fd = open(path.c_str(), O_RDONLY);
    ASSERT_EQ(lseek(fd, 7, SEEK_SET), 7);
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.open = [](const mtsrc_io *of, int32_t mode) {
        ++opened;
        EXPECT_EQ(mode, 0);
        return mtsrc_file_open(of, mode);
    };
    io.close = [](mtsrc_file *file) {
        --opened;
        return mtsrc_file_close(file);
    };
    io.fd = fd;
    io.path = strdup("fd");
    scripted::answer("xflacfd_create", {-1});
    EXPECT_EQ(mtsrc_open_mfal(&io, 0, &err), nullptr);
    EXPECT_EQ(err, -7);
    EXPECT_EQ(opened, 0);
    EXPECT_STREQ(io.path, "fd");  // the caller's after a failure
    src = mtsrc_open_mfal(&io, 0, &err);
    ASSERT_NE(src, nullptr);
    EXPECT_EQ(opened, 1);
    EXPECT_NE(src->probe_file->fd, fd);
    // The codec library got the handle's own copy of the record.
    const scripted::call made = last_call("xflacfd_create");
    EXPECT_EQ(made.addresses[0], &src->io);
    EXPECT_EQ(memcmp(made.records[0].data(), &io, sizeof io), 0);
    close_source();
    EXPECT_EQ(opened, 0);
    EXPECT_EQ(close(fd), 0);
    std::string closed = "fd";
    io.path = closed.data();
    EXPECT_EQ(mtsrc_file_open(&io, 0), nullptr);
}

}  // namespace
