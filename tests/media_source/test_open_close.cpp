#include <iterator>

#include "media_source/wexaaudio.h"
#include "tests/media_source/source_case.h"

namespace {

// What gives back the object that the call makes: "xaacfd_create" and "xaacfd_delete".
std::string remover_of(const std::string &maker) {
    const size_t cut = maker.rfind('_');
    return maker.substr(0, cut) + (maker.substr(cut) == "_open" ? "_close" : "_delete");
}

// The calls of an open that fails at the given call: up to it, its own clean-up of what was made,
// and the frame's close, when only the initialisation is left to undo.
names failing_opening(const source_row &row, size_t at) {
    const auto failing = row.opens.begin() + static_cast<std::ptrdiff_t>(at);
    names made;
    std::transform(row.opens.begin(), failing, std::back_inserter(made), remover_of);
    names calls(row.opens.begin(), failing + 1);
    names deinits;
    for (const std::string &removal : row.closes) {
        if (removal.find("_deinit") != std::string::npos) {
            deinits.push_back(removal);
        } else if (std::find(made.begin(), made.end(), removal) != made.end()) {
            calls.push_back(removal);
        }
    }
    const bool initialised = at >= row.libraries.size();
    for (int times = initialised ? 2 : 1; times > 0; --times) {
        calls.insert(calls.end(), deinits.begin(), deinits.end());
    }
    return calls;
}

using OpenClose = SourceTest;

TEST_F(OpenClose, CallsRecordsAndOrder) {
    for (const source_row &row : source_rows()) {
        SCOPED_TRACE(row.name);
        scripted::script what;
        what.tags = true;
        scripted::reset();
        ASSERT_EQ(open_row(row, what), 0);
        EXPECT_EQ(scripted::call_names(), row.opens);
        EXPECT_EQ(scripted::tag_buffers_left(), 0);
        EXPECT_EQ(src->codec, row.codec);
        EXPECT_EQ(src->frm_buf_size, row.frame_bytes);
        EXPECT_EQ(src->format.channels, row.channels);
        EXPECT_EQ(src->format.bits, 16);
        EXPECT_EQ(src->format.duration, what.duration);
        // Reader: word and information record zeroed. Records of the other calls likewise.
        const scripted::call reader = scripted::calls()[row.libraries.size()];
        EXPECT_EQ(reader.addresses[0], &src->io);
        EXPECT_EQ(reader.records[1], zeros(reader.records[1].size()));
        EXPECT_EQ(reader.records[2], zeros(reader.records[2].size()));
        scripted::forget_calls();
        close_source();
        EXPECT_EQ(scripted::call_names(), row.closes);
        EXPECT_EQ(scripted::live_objects(), 0);
        for (const std::string &library : row.libraries) {
            EXPECT_EQ(scripted::balance(library), 0) << library;
        }
    }
}

TEST_F(OpenClose, EachFailingStepIsCleanedUp) {
    for (const source_row &row : source_rows()) {
        for (size_t at = 0; at < row.opens.size(); ++at) {
            const std::string step = row.opens[at];
            if (row.failures[at] == 0) {
                continue;
            }
            SCOPED_TRACE(std::string(row.name) + ", " + step + ", call " + std::to_string(at));
            scripted::reset();
            const bool again = at > 0 && row.opens[at - 1] == step;
            scripted::answer(step, again ? std::vector<int32_t>{0, -9} : std::vector<int32_t>{-9});
            scripted::script what;
            what.tags = true;
            EXPECT_EQ(open_row(row, what), row.failures[at]);
            EXPECT_EQ(scripted::call_names(), failing_opening(row, at));
            EXPECT_EQ(scripted::live_objects(), 0);
            EXPECT_EQ(scripted::tag_buffers_left(), 0);
        }
    }
}

TEST_F(OpenClose, DecoderConfigurations) {
    const auto words = [](const source_row &row) {
        const scripted::call made =
            scripted::calls_of(
                row.opens[row.opens.back() == "xvorbisd_decode" ? row.opens.size() - 2
                                                                : row.opens.size() - 1])
                .back();
        std::vector<int32_t> found(made.records[0].size() / 4);
        memcpy(found.data(), made.records[0].data(), found.size() * 4);
        return found;
    };
    const std::vector<std::vector<int32_t>> expected = {
        {1, 2, 2, 0, 3, 22050, 5, 0}, {1, 2, 2, 0}, {1, 0, 2, 0},
        {1, 2, 2, 0, 3, 22050, 5, 0}, {1, 0, 2, 0}, {1, 1, 2, 0}};
    for (size_t i = 0; i < expected.size(); ++i) {
        const source_row &row = source_rows()[i];
        scripted::script what;
        what.sample_rate = 22050;
        what.channels = 5;
        ASSERT_EQ(open_row(row, what), 0);
        EXPECT_EQ(words(row), expected[i]) << row.name;
        EXPECT_EQ(src->format.sample_rate, 22050);
        EXPECT_EQ(src->format.channels, row.codec == 305 ? 5 : row.channels) << row.name;
        close_source();
    }
}

TEST_F(OpenClose, RatesAndChannelsAccepted) {
    struct {
        const char *row;
        int32_t rate;
        int32_t channels;
        int32_t code;
    } const cases[] = {
        {"aac", 7999, 2, -3},           {"aac", 8000, 2, 0},
        {"aac", 48000, 2, 0},           {"aac", 48001, 2, -3},
        {"flac", 7999, 2, -3},          {"flac", 192000, 0, 0},
        {"flac", 192001, 2, -3},        {"mpeg", 8000, 1, 0},
        {"mpeg", 48000, 2, 0},          {"mpeg", 48001, 2, -3},
        {"mpeg", 44100, 0, -3},         {"mpeg", 44100, -1, -3},
        {"mp4 with aac", 7999, 2, -3},  {"mp4 with aac", 48001, 2, -3},
        {"mp4 with mpeg", 7999, 2, 0},  {"mp4 with mpeg", 48001, 2, -3},
        {"mp4 with mpeg", 9000, 0, -3}, {"ogg", 1000, 2, 0},
        {"ogg", 48000, 2, 0},           {"ogg", 48001, 2, -3},
    };
    for (const auto &one : cases) {
        SCOPED_TRACE(std::string(one.row) + " " + std::to_string(one.rate));
        const source_row &row = source_row_of(one.row);
        scripted::script what;
        what.sample_rate = one.rate;
        what.channels = one.channels;
        what.tags = true;
        scripted::reset();
        EXPECT_EQ(open_row(row, what), one.code);
        if (one.code != 0) {  // everything made is given back, then the frame closes once more
            names expected = row.opens;
            expected.insert(expected.end(), row.closes.begin(), row.closes.end());
            for (const std::string &library : row.libraries) {
                expected.push_back(library + "_deinit");
            }
            EXPECT_EQ(scripted::call_names(), expected);
        }
        EXPECT_EQ(scripted::tag_buffers_left(), 0);
        close_source();
    }
}

TEST_F(OpenClose, ContainersChooseTheFirstAudioTrack) {
    for (const char *name : {"mp4 with aac", "ogg"}) {
        SCOPED_TRACE(name);
        const source_row &row = source_row_of(name);
        const bool mp4 = row.codec == 306;
        const int32_t most = mp4 ? 64 : 16;
        scripted::script what;
        what.kinds = {2, 0, 1, 1};
        scripted::reset();
        ASSERT_EQ(open_row(row, what), 0);
        EXPECT_EQ(scripted::calls_of(mp4 ? "xmp4fds_open" : "xoggds_open").back().number, 2);
        close_source();
        what.kinds = {2, 3};
        EXPECT_EQ(open_row(row, what), -7);
        what.kinds = {2, 1};
        what.kind_count = 1;
        EXPECT_EQ(open_row(row, what), -7);
        // A count beyond the record's room does not lead out of it.
        what.kinds.assign(static_cast<size_t>(most), 2);
        what.kind_count = 1'000'000'000;
        EXPECT_EQ(open_row(row, what), -7);
        what.kinds.back() = 1;
        EXPECT_EQ(open_row(row, what), 0);
        EXPECT_EQ(scripted::calls_of(mp4 ? "xmp4fds_open" : "xoggds_open").back().number, most - 1);
        close_source();
        what.codec = 0x54;
        EXPECT_EQ(open_row(row, what), mp4 ? -3 : -7);
    }
}

TEST_F(OpenClose, TrackSearchByItself) {
    xmp4_info mp4 = {};
    mp4.kind[3] = 1;
    mp4.track_count = 3;
    EXPECT_EQ(get_mp4_audiostream(&mp4), -1);
    mp4.track_count = 4;
    EXPECT_EQ(get_mp4_audiostream(&mp4), 3);
    xogg_info ogg = {};
    ogg.kind[1] = 1;
    ogg.stream_count = -1;
    EXPECT_EQ(get_ogg_audiostream(&ogg), -1);
    ogg.stream_count = 2;
    EXPECT_EQ(get_ogg_audiostream(&ogg), 1);
}

TEST_F(OpenClose, VorbisSetUpDataReachTheDecoder) {
    scripted::script what;
    what.setup = {9, 8, 7, 6, 5};
    ASSERT_EQ(open_row(source_row_of("ogg"), what), 0);
    const scripted::call set_up = scripted::calls_of("xvorbisd_decode").back();
    wexa_frame frame = {};
    wexa_output output = {};
    memcpy(&frame, set_up.records[0].data(), sizeof(frame));
    memcpy(&output, set_up.records[1].data(), sizeof(output));
    EXPECT_EQ(frame.bytes, 5);
    EXPECT_EQ(frame.word_20, 0);
    EXPECT_EQ(frame.codec, 323);
    EXPECT_EQ(output.data, nullptr);
    EXPECT_EQ(set_up.records[3], what.setup);
    close_source();
    what.setup_length = -1;
    EXPECT_EQ(open_row(source_row_of("ogg"), what), -7);
}

TEST_F(OpenClose, WithoutAHandleOrAProbeFile) {
    mtsrc_ctx empty = {};
    int32_t (*const opens[])(mtsrc_ctx *) = {mtsource_wav_open,  mtsource_aac_open,
                                             mtsource_flac_open, mtsource_mp123_open,
                                             mtsource_mp4a_open, mtsource_ogg_open};
    for (const auto open : opens) {
        EXPECT_EQ(open(nullptr), -4);
        EXPECT_EQ(open(&empty), -7);
    }
    for (const auto close : {mtsource_wav_close, mtsource_aac_close, mtsource_flac_close,
                             mtsource_mp123_close, mtsource_mp4a_close, mtsource_ogg_close}) {
        close(nullptr);
    }
    for (const auto reset : {mtsource_wav_reset, mtsource_aac_reset, mtsource_flac_reset,
                             mtsource_mp123_reset, mtsource_mp4a_reset, mtsource_ogg_reset}) {
        EXPECT_EQ(reset(nullptr), -4);
    }
    int64_t reached = 0;
    for (const auto seek : {mtsource_wav_seek, mtsource_aac_seek, mtsource_flac_seek,
                            mtsource_mp123_seek, mtsource_mp4a_seek, mtsource_ogg_seek}) {
        EXPECT_EQ(seek(nullptr, 0, &reached), -4);
    }
    mtsrc_frame frame = {};
    for (const auto read : {mtsource_wav_get_frm, mtsource_aac_get_frm, mtsource_flac_get_frm,
                            mtsource_mp123_get_frm, mtsource_mp4a_get_frm, mtsource_ogg_get_frm}) {
        EXPECT_EQ(read(nullptr, 0, &frame), -4);
    }
    EXPECT_EQ(mtsource_mp4a_seek(&empty, 0, &reached), -4);  // no stream
    EXPECT_EQ(scripted::call_names(), names{});
}

}  // namespace
