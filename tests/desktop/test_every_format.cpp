// What every format's reader and decoder owe, on the files of the fixtures.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "tests/desktop/codec_test.h"

namespace codec_test {
namespace {

class Seams : public testing::TestWithParam<const char *> {};

TEST_P(Seams, AreExact) {
    expect_exact_seams(fixture(GetParam()));
}

INSTANTIATE_TEST_SUITE_P(Files, Seams,
                         testing::Values("cbr.mp3", "cbr48.mp3", "vbr.mp3", "vbr_no_table.mp3",
                                         "checked.mp3", "mono.mp3", "lsf.mp3", "low.mp3",
                                         "tagged.mp3", "layer2.mp2", "song.flac", "no_table.flac",
                                         "short_blocks.flac", "huge_blocks.flac", "mono.flac",
                                         "six.flac", "wide.flac", "noise.flac", "low.aac",
                                         "noisy.aac", "high.aac", "mono.aac", "six.aac", "core.aac",
                                         "last.m4a", "first.m4a", "fragmented.mp4", "video.mp4",
                                         "tagged.m4a", "layer3.mp4", "stereo3.mp4", "song.ogg",
                                         "other.ogg", "mono.ogg", "six.ogg", "video.ogv"));

TEST(Files, HoldTheSameSamples) {
    const struct {
        const char *file, *like;
    } pairs[] = {
        // Without loss, whatever the blocks and with or without a table for seeking.
        {"song.flac", "song.wav"},
        {"no_table.flac", "song.wav"},
        {"short_blocks.flac", "song.wav"},
        {"huge_blocks.flac", "song.wav"},
        {"mono.flac", "mono.wav"},
        {"six.flac", "six.wav"},
        // The frame with the encoder's table is no music.
        {"vbr.mp3", "vbr_no_table.mp3"},
        // The same frames, however they are packed and whatever is beside them.
        {"last.m4a", "low.aac"},
        {"first.m4a", "low.aac"},
        {"fragmented.mp4", "low.aac"},
        {"video.mp4", "low.aac"},
        {"tagged.m4a", "low.aac"},
        {"video.ogv", "song.ogg"},
        // Of a mono stream the bare source drops nothing and averages nothing.
        {"layer3.mp4", "mono.mp3"},
    };
    for (const auto &pair : pairs) {
        SCOPED_TRACE(pair.file);
        expect_same(read_all(fixture(pair.file)), read_all(fixture(pair.like)));
    }
    // Of a stereo stream the bare source drops the start.
    EXPECT_EQ(read_all(fixture("stereo3.mp4")).size(), read_all(fixture("cbr.mp3")).size() + 529);
}

// The file delivers one byte at a time to the readers; recognition, which opens it first, asks for
// whole heads.
mtsrc_file *recognised;

int64_t read_a_byte(mtsrc_file *file, void *buf, int32_t count) {
    return mtsrc_file_read(file, buf, file == recognised ? count : std::min(count, 1));
}

TEST(Files, MayDeliverOneByteAtATime) {
    for (const char *name :
         {"song.wav", "cbr.mp3", "song.flac", "low.aac", "last.m4a", "song.ogg"}) {
        SCOPED_TRACE(name);
        mtsrc_io io = io_for(fixture(name));
        io.path = strdup(fixture(name).c_str());  // the source's, once it is open
        io.read = read_a_byte;
        io.open = [](const mtsrc_io *of, int32_t mode) {
            mtsrc_file *opened = mtsrc_file_open(of, mode);
            if (recognised == nullptr) recognised = opened;
            return opened;
        };
        recognised = nullptr;
        int32_t err = 0;
        mtsrc_ctx *source = mtsrc_open_mfal(&io, 0, &err);
        ASSERT_NE(source, nullptr) << err;
        expect_same(read(source, SIZE_MAX), read_all(fixture(name)));
        mtsrc_deinit(source);
    }
}

// The channels of a file of 16-bit samples behind a 44-byte header.
std::vector<samples> wav_channels(const std::string &path) {
    const bytes file = load(path);
    std::vector<samples> channels(file[22]);
    for (size_t i = 44; i + 2 <= file.size(); i += 2) {
        channels[(i - 44) / 2 % channels.size()].push_back(
            static_cast<int16_t>(file[i] | file[i + 1] << 8));
    }
    return channels;
}

// Mean square of the difference to a channel that comes so many samples late, over a second.
double distance(const samples &got, const samples &channel, size_t late) {
    double sum = 0;
    for (size_t i = 120'000; i < 164'100; ++i) {
        const double d = got[i + late] - channel[i];
        sum += d * d;
    }
    return sum / 44'100;
}

// Where loss is allowed, the right channel still comes out at the right place: at any other it is
// farther away.
TEST(LossyFiles, HaveTheSongInItsPlace) {
    const struct {
        const char *file, *song;
        bool mean;  // of the channels; the first one alone otherwise
        size_t late;
        int clear;  // how many times the loss the song's power is at least
    } files[] = {
        // The encoder delays by 576, the decoder by 529 of which the source drops as many.
        {"vbr.mp3", "song.wav", true, 576, 100},    {"high.aac", "song48.wav", false, 1024, 100},
        {"mono.aac", "mono.wav", false, 1024, 100}, {"six.aac", "six.wav", false, 1024, 300},
        {"song.ogg", "song.wav", true, 0, 100},     {"mono.ogg", "mono.wav", true, 0, 100},
        {"six.ogg", "six.wav", true, 0, 20},
    };
    for (const auto &each : files) {
        SCOPED_TRACE(each.file);
        const samples got = read_all(fixture(each.file));
        const std::vector<samples> channels = wav_channels(fixture(each.song));
        samples mean(channels[0].size());
        for (size_t i = 0; i < mean.size(); ++i) {
            int sum = 0;
            for (const samples &channel : channels) sum += channel[i];
            mean[i] = static_cast<int16_t>(sum / static_cast<int>(channels.size()));
        }
        EXPECT_TRUE(each.late != 0 || got.size() == mean.size());
        const samples &wanted = each.mean ? mean : channels[0];
        const samples &wrong = each.mean ? channels[0] : mean;
        const double near = distance(got, wanted, each.late);
        EXPECT_GT(distance(wanted, samples(wanted.size()), 0), each.clear * near);
        if (channels.size() > 1) {
            EXPECT_GT(distance(got, wrong, each.late), 4 * near);
        }
        for (size_t late = each.late < 16 ? 0 : each.late - 16; late < each.late + 16; ++late) {
            if (late == each.late) continue;
            EXPECT_LT(near, distance(got, wanted, late)) << late;
        }
    }
}

// The sound beside it is, and has its own duration.
TEST(Video, IsNotOpened) {
    const auto expect = [](const auto &file, int32_t count,
                           void *(*open)(void *, int32_t, void *)) {
        SCOPED_TRACE(file.path);
        ASSERT_EQ(count, 2);
        EXPECT_NE(file.info.kind[0], kWexaKindAudio);
        EXPECT_EQ(file.info.kind[1], kWexaKindAudio);
        for (const int32_t index : {-1, 0, 2}) {
            EXPECT_EQ(open(file.reader, index, nullptr), nullptr);
        }
        EXPECT_NE(open(file.reader, 1, nullptr), nullptr);
    };
    const direct_mp4 mp4(fixture("video.mp4"));
    expect(mp4, mp4.info.track_count, xmp4fds_open);
    EXPECT_EQ(mp4.info.duration * 44100 / kUnits,
              static_cast<int64_t>(read_all(fixture("low.aac")).size()));
    const direct_ogg ogg(fixture("video.ogv"));
    expect(ogg, ogg.info.stream_count, xoggds_open);
}

TEST(Files, OfOtherCodecsAreRefused) {
    EXPECT_EQ(opened(fixture("alac.m4a")).error, -3);
    EXPECT_EQ(opened(fixture("silent.mp4")).error, -7);
    EXPECT_EQ(opened(fixture("opus.ogg")).error, -7);
}

// Nothing of a format but its first bytes, or not even these.
TEST(Noise, IsRefused) {
    const char *const heads[] = {"", "RIFF....WAVEfmt ", "fLaC", "....ftyp", "OggS", "ADIF", "ID3"};
    for (const char *head : heads) {
        for (const size_t size : {3U, 100U, 100'000U}) {
            for (const int fill : {0x00, 0x55, 0xFF}) {
                SCOPED_TRACE(std::string(head) + ", " + std::to_string(size));
                bytes contents(size, static_cast<uint8_t>(fill));
                memcpy(contents.data(), head, std::min(size, strlen(head)));
                EXPECT_EQ(opened(save("noise", contents)).source, nullptr);
            }
        }
    }
}

const char *text(const void *field) {
    return static_cast<const char *>(field);
}

// As a source does, which takes a field over; the rest is the reader's to free.
void take(void **field) {
    free(*field);
    *field = nullptr;
}

TEST(TagRecord, IsFilledFromEveryFormat) {
    const auto expect = [](const auto &file, int32_t fields) {
        SCOPED_TRACE(file.path);
        ASSERT_NE(file.reader, nullptr);
        ASSERT_NE(file.info.tags, nullptr);
        const char *wanted[] = {"A Title", "An Artist", "An Album"};
        for (int32_t i = 0; i < fields; ++i) {
            EXPECT_STREQ(text(file.info.tags->text[i].data), wanted[i]);
        }
    };
    expect(direct_mp4(fixture("tagged.m4a")), 3);
    expect(direct_ogg(fixture("song.ogg")), 3);

    const direct_mpeg mpeg(fixture("tagged.mp3"));
    expect(mpeg, 3);
    EXPECT_STREQ(text(mpeg.info.tags->text[4].data), "1999");
    EXPECT_STREQ(text(mpeg.info.tags->text[5].data), "3/9");
    EXPECT_STREQ(text(mpeg.info.tags->text[7].data), "A comment");
    EXPECT_NE(mpeg.info.tags->last, nullptr);  // the encoder names itself
    take(&mpeg.info.tags->text[0].data);

    const direct_flac flac(fixture("no_table.flac"));
    expect(flac, 2);
    EXPECT_STREQ(text(flac.info.tags->entry[0].first), "KEY");
    EXPECT_STREQ(text(flac.info.tags->entry[0].second), "Am");
    EXPECT_NE(flac.info.tags->last, nullptr);
    take(&flac.info.tags->entry[0].first);
    static_cast<uint8_t *>(flac.reader)[kFlacReaderFlag] = 1;  // the source's privilege
}

// An ID3v2 tag with a title and nothing else, whose frame claims so many bytes more than there are.
bytes title_tag(uint8_t version, uint8_t flags, const bytes &title, uint8_t more = 0) {
    const auto size = static_cast<uint8_t>(title.size());
    bytes frame = {'T', 'I', 'T', '2', 0, 0, 0, static_cast<uint8_t>(size + more), 0, 0};
    if (version == 2) frame = {'T', 'T', '2', 0, 0, size};
    const auto all = static_cast<uint8_t>(frame.size() + title.size());
    return joined({{'I', 'D', '3', version, 0, flags, 0, 0, 0, all}, frame, title});
}

TEST(TagRecord, IsFilledFromEveryVersionAndEncoding) {
    // A byte of an unsynchronised tag's frame is not counted by the frame.
    bytes unsynchronised = title_tag(3, 0x80, {1, 0xFF, 0, 0xFE, 'B', 0});
    --unsynchronised[17];
    const struct {
        const char *name;
        bytes tag;
        const char *title;
    } tags[] = {
        {"2.2 latin", title_tag(2, 0, {0, 'A', 0xE9, 'b'}), "A\u00E9b"},
        {"2.3 utf-16", title_tag(3, 0, {1, 0xFF, 0xFE, 'A', 0, 0x3D, 0xD8, 0x00, 0xDE}),
         "A\U0001F600"},
        {"2.3 unsynchronised", unsynchronised, "B"},
        {"2.4 utf-8", title_tag(4, 0, {3, 0xC3, 0xA9, 'x'}), "\u00E9x"},
        {"size beyond the tag", title_tag(4, 0, {3, 'a', 'b', 'c'}, 36), nullptr},
    };
    const auto expect = [](const auto &file, const char *title) {
        ASSERT_NE(file.reader, nullptr);
        ASSERT_NE(file.info.tags, nullptr);
        EXPECT_STREQ(text(file.info.tags->text[0].data), title);
    };
    for (const auto &each : tags) {
        SCOPED_TRACE(each.name);
        expect(direct_mpeg(save("tags.mp3", joined({each.tag, load(fixture("cbr.mp3"))}))),
               each.title);
        const std::string aac = save("tags.aac", joined({each.tag, load(fixture("low.aac"))}));
        expect(direct_aac(aac), each.title);
        EXPECT_EQ(read_all(aac), read_all(fixture("low.aac")));
    }
}

struct decoder_functions {
    void *(*create)(const wexa_config *, void *);
    int32_t (*decode)(void *, const wexa_frame *, wexa_output *, wexa_status *);
    void (*remove)(void *);
};
constexpr decoder_functions kFlac = {xflacd_create, xflacd_decode, xflacd_delete};
constexpr decoder_functions kMpeg = {xmp123d_create, xmp123d_decode, xmp123d_delete};
constexpr decoder_functions kVorbis = {xvorbisd_create, xvorbisd_decode, xvorbisd_delete};

// A decoder that is handed a frame as it stands in the file, as a host without our reader would do.
TEST(Decoder, TakesABareFrame) {
    const auto decoded = [](const decoder_functions &codec, bytes data) {
        const wexa_config stereo = {1, 2, 2, 0};
        void *decoder = codec.create(&stereo, nullptr);
        wexa_frame frame = {};
        frame.data = data.data();
        frame.bytes = static_cast<int32_t>(data.size());
        bytes pcm(1 << 20);
        wexa_output output = {};
        output.data = pcm.data();
        wexa_status status = {};
        EXPECT_EQ(codec.decode(decoder, &frame, &output, &status), 0);
        EXPECT_NE(status.produced, 0);
        codec.remove(decoder);
        pcm.resize(static_cast<size_t>(output.bytes));
        return pcm;
    };
    // The first frame, of 4096 samples; the decoder takes what follows for padding.
    const bytes flac = load(fixture("long_blocks.flac"));
    const uint8_t sync[] = {0xFF, 0xF8};
    const auto first = std::search(flac.begin() + 42, flac.end(), sync, sync + 2);
    EXPECT_EQ(decoded(kFlac, {first, first + 20'000}),
              part(load(fixture("song.wav")), 44, 44 + 4096 * 4));
    EXPECT_EQ(decoded(kMpeg, part(load(fixture("cbr.mp3")), 0, 417)).size(), 1152U * 4);
}

TEST(Decoder, RefusesWhatItIsNotMadeFor) {
    const wexa_config right = {1, 1, 2, 0};
    for (const decoder_functions &each : {kFlac, kMpeg, kVorbis}) {
        EXPECT_EQ(each.create(nullptr, nullptr), nullptr);
        void *decoder = each.create(&right, nullptr);
        ASSERT_NE(decoder, nullptr);
        wexa_frame frame = {};
        wexa_output output = {};
        wexa_status status = {};
        EXPECT_NE(each.decode(decoder, &frame, &output, &status), 0);  // no bytes
        EXPECT_NE(each.decode(nullptr, &frame, &output, &status), 0);
        each.remove(decoder);
        each.remove(nullptr);
    }
    // Vorbis takes any configuration, and gives one channel or two.
    for (const wexa_config &wrong : {wexa_config{1, 2, 3, 0}, {1, 3, 2, 0}, {1, -1, 2, 0}}) {
        EXPECT_EQ(xflacd_create(&wrong, nullptr), nullptr);
        EXPECT_EQ(xmp123d_create(&wrong, nullptr), nullptr);
    }
}

}  // namespace
}  // namespace codec_test
