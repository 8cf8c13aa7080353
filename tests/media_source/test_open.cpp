// Tests opening and closing a source, through mtsrc.h and through the operations of each format.
#include <fcntl.h>

#include <tuple>

#include "tests/media_source/source_case.h"

namespace {

using OpenClose = SourceTest;

TEST_F(OpenClose, OpenCallsTheCodecLibraryInOrder) {
    for_each_row([&](const source_row &row) {
        ASSERT_EQ(open_row(row, {22050, 5, 16, {}, 123'456'789'012}), 0);
        EXPECT_EQ(fake_codec::call_names(), row.opens);
        EXPECT_TRUE(memcmp(&src->mark, "KOVA", 4) == 0 && src->codec == row.codec);
        EXPECT_EQ(src->frm_buf_size, row.frame_bytes);
        mtsrc_format format;
        memset(&format, 0xAB, sizeof format);
        EXPECT_EQ(mtsrc_getstream_format(src, &format), 0);
        EXPECT_TRUE(format.sample_rate == 22050 && format.duration == 123'456'789'012);
        EXPECT_TRUE(format.channels == (row.channels ? row.channels : 5) && format.bits == 16);
        EXPECT_EQ(bytes_of(format).substr(12, 4), "\xAB\xAB\xAB\xAB");
        // The reader gets the handle's callbacks and zeroed records. The decoder gets its settings.
        const std::vector<fake_codec::call> created = fake_codec::calls_of("_create");
        const std::string zeroed = created[0].records[1] + created[0].records[2];
        EXPECT_TRUE(created[0].addresses[0] == &src->io && zeroed == zeros(zeroed.size()));
        EXPECT_TRUE(row.decoder.empty() || created.back().records[0] == row.config);
    });
}

// After a failure, the format's open and mtsrc_open_mfal both de-initialise the codec library.
TEST_F(OpenClose, AFailedStepIsCleanedUp) {
    for_each_row([&](const source_row &row) {
        const size_t libraries = row.decoder.empty() ? 0 : row.tag ? 2 : 1;
        std::istringstream steps(row.opens), codes(row.codes);
        std::string step, before, done;
        for (int32_t code = 0; steps >> step && codes >> code; before = step) {
            SCOPED_TRACE(done += step + " ");
            if (code == 0) continue;
            fake_codec::state.results[step].assign(step == before ? 1 : 0, 0);
            fake_codec::state.results[step].push_back(-9);
            EXPECT_EQ(open_row(row), code);
            EXPECT_EQ(fake_codec::call_names().substr(0, done.size()), done);
            const size_t closes = step.find("_init") == std::string::npos ? 2 : 1;
            EXPECT_EQ(fake_codec::calls_of("_deinit").size(), closes * libraries);
        }
    });
}

TEST_F(OpenClose, UnsupportedRatesAndChannelsAreRefused) {
    for_each_row([&](const source_row &row) {
        const bool any = row.channels != 0;
        const std::tuple<int32_t, int32_t, bool> streams[] = {
            {row.min_rate - 1, 2, row.min_rate == 0},
            {row.min_rate, 1, true},
            {44100, 0, any},
            {row.max_rate + 1, 2, false},
            {row.max_rate, 2, true},
            {44100, -1, any}};
        for (const auto &[rate, channels, good] : streams) {
            EXPECT_EQ(open_row(row, {rate, channels}), good ? 0 : -3)
                << rate << " Hz, " << channels << " channels";
        }
    });
    // These WAV formats are unsupported. The last row has an empty record and no reader.
    const int32_t waves[][3] = {{3, 16, 0}, {kWexaPcm, 8, 0}, {kWexaPcm, 24, 0}, {0, 0, -1}};
    for (const auto &[codec, bits, created] : waves) {
        fake_codec::state.results["xwavd_create"] = {created};
        EXPECT_EQ(open_row(row_of("wav"), {44100, 2, bits, codec}), -3) << codec << ", " << bits;
    }
}

TEST_F(OpenClose, FirstAudioTrackIsChosen) {
    EXPECT_EQ(get_mp4_audiostream(nullptr), -1);
    EXPECT_EQ(get_ogg_audiostream(std::make_unique<xogg_info>().get()), -1);
    for (const bool mp4 : {true, false}) {
        const source_row &row = row_of(mp4 ? "mp4 with aac" : "ogg");
        const std::vector<int32_t> none(mp4 ? 64 : 16, 2);
        std::vector<int32_t> last = none;
        last.back() = 1;
        const struct {
            std::vector<int32_t> kinds;
            int32_t count;   // stated number of tracks; may exceed the record's size
            int32_t chosen;  // index of the chosen track, or -1
        } cases[] = {{{2, 0, 1, 1}, 4, 2},
                     {{2, 1}, 1, -1},
                     {none, 1'000'000'000, -1},
                     {last, 1'000'000'000, mp4 ? 63 : 15}};
        for (const auto &each : cases) {
            const fake_codec::stream_spec stream = {44100, 2, 16, {}, 0, each.kinds, each.count};
            EXPECT_EQ(open_row(row, stream), each.chosen < 0 ? -7 : 0) << each.count;
            EXPECT_TRUE(!src || fake_codec::calls_of("s_open")[0].number == each.chosen);
        }
        EXPECT_EQ(open_row(row, {44100, 2, 16, 0x54}), mp4 ? -3 : -7);
    }
}

TEST_F(OpenClose, DecoderReceivesTheVorbisSetUpData) {
    fake_codec::stream_spec stream;
    stream.setup = std::string(5'000'000, 'x');
    ASSERT_EQ(open_row(row_of("ogg"), stream), 0);
    const fake_codec::call decoded = fake_codec::calls_of("_decode")[0];
    const wexa_frame frame = {nullptr, 0, 5'000'000, 0, 323, 0, {}};
    EXPECT_EQ(decoded.records[0].substr(sizeof frame.data), bytes_of(frame).substr(8));
    EXPECT_EQ(decoded.records[1], zeros(sizeof(wexa_output)));
    EXPECT_TRUE(decoded.records[3] == stream.setup);
    for (const int32_t false_length : {(1 << 24) + 1, 4'999'999}) {
        stream.setup_length = false_length;
        EXPECT_EQ(open_row(row_of("ogg"), stream), -7) << false_length;
    }
}

TEST_F(OpenClose, BadHandlesAreRefused) {
    using codes = std::vector<int32_t>;
    int64_t reached = 77;
    char byte = 0;
    mtsrc_frame frame = {&byte, 77};
    mtsrc_format unused = {};
    mtsrc_ctx empty = {};
    for_each_row([&](const source_row &row) {
        ASSERT_EQ(open_row(row), 0);
        const mtsrc_ctx format = *src;
        close_source();
        fake_codec::state.calls.clear();
        format.close(nullptr);
        EXPECT_EQ(codes({format.open(nullptr), format.open(&empty), format.reset(nullptr),
                         format.seek(nullptr, 0, &reached), format.get_frm(nullptr, 0, &frame)}),
                  codes({-4, -7, -4, -4, -4}));
        EXPECT_EQ(fake_codec::call_names(), "");
    });
    ASSERT_EQ(open_row(row_of("mp4 with aac")), 0);
    void *const dstream = std::exchange(src->dstream, nullptr);
    EXPECT_EQ(mtsrc_seekstream(src, 5, &reached), -4);
    src->dstream = dstream;
    EXPECT_EQ(mtsrc_getstream_format(src, nullptr), -4);
    memcpy(&empty.mark, "KOVB", 4);
    for (mtsrc_ctx *bad : {static_cast<mtsrc_ctx *>(nullptr), &empty}) {
        EXPECT_EQ(codes({mtsrc_getstream_format(bad, &unused), mtsrc_reset(bad), mtsrc_deinit(bad),
                         mtsrc_seekstream(bad, 5, &reached), mtsrc_getstream(bad, 1, &frame)}),
                  codes(5, -4));
    }
    EXPECT_TRUE(frame.size == 77 && reached == 77);
}

TEST_F(OpenClose, UnusablePathsAreRefused) {
    const mtsrc_param no_path = {nullptr};
    EXPECT_TRUE(mtsrc_init(&no_path, &err) == nullptr && err == -4);
    EXPECT_EQ(open_path(file.path), -7);
    EXPECT_EQ(open_path(testing::TempDir()), -6);  // a directory can be opened but not read
    EXPECT_EQ(open_bytes(zeros(15)), -6);
    for (const std::string &refused : {zeros(100), kAsf}) EXPECT_EQ(open_bytes(refused), -3);
    for (const std::string &layer : {"\xFF\xFF\x10" + zeros(29) + "\xFF\xFF\x10\0"s,
                                     "\xFF\xFD\xA4" + zeros(573) + "\xFF\xFD\xA4\0"s}) {
        EXPECT_TRUE(open_bytes(layer) == 0 && src->codec == 305);  // Layers I and II
    }
    std::string &path = file.path;
    const std::string longest = path.insert(path.rfind('/'), 511 - path.size(), '/');
    EXPECT_EQ(open_path(longest), 0);
    EXPECT_EQ(open_path("/" + longest), -3);

    // If the caller's record contains a descriptor, the source reads a duplicate from the start.
    const int fd = open(path.c_str(), O_RDONLY);
    ASSERT_EQ(lseek(fd, 7, SEEK_SET), 7);
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.fd = fd;
    io.path = strdup("fd");
    fake_codec::state.results["xmp123fd_create"] = {-1};
    EXPECT_TRUE(mtsrc_open_mfal(&io, 0, &err) == nullptr && err == -7);
    EXPECT_STREQ(io.path, "fd");  // still owned by the caller
    src = mtsrc_open_mfal(&io, 0, &err);
    ASSERT_NE(src, nullptr);
    EXPECT_NE(src->probe_file->fd, fd);
    EXPECT_EQ(bytes_of(src->io), bytes_of(io));
    EXPECT_EQ(close(fd), 0);
    EXPECT_EQ(mtsrc_file_open(&src->io, 0), nullptr);
}

}  // namespace
