// What every format's reader owes, on the files of the fixtures.
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

INSTANTIATE_TEST_SUITE_P(
    Files, Seams,
    testing::Values("cbr.mp3", "cbr48.mp3", "vbr.mp3", "vbr_no_table.mp3", "checked.mp3",
                    "mono.mp3", "lsf.mp3", "low.mp3", "tagged.mp3", "layer2.mp2",
                    "golden/layer1_44.mp1", "golden/layer1_48.mp1", "song.flac", "no_table.flac",
                    "short_blocks.flac", "huge_blocks.flac", "mono.flac", "six.flac", "wide.flac",
                    "noise.flac", "golden/variable.flac", "golden/late.flac", "low.aac",
                    "noisy.aac", "high.aac", "mono.aac", "six.aac", "core.aac", "golden/he.aac",
                    "golden/plain.adif", "last.m4a", "first.m4a", "fragmented.mp4", "video.mp4",
                    "tagged.m4a", "layer3.mp4", "stereo3.mp4", "golden/he.m4a", "song.ogg",
                    "other.ogg", "mono.ogg", "six.ogg", "video.ogv", "golden/late.ogg",
                    "golden/front.ogg", "golden/end.ogg"));

TEST(Files, HoldTheSameSamples) {
    const struct {
        const char *file, *like;
        size_t skip = 0;          // samples of the second that the first lacks at its start
        size_t count = SIZE_MAX;  // of the first at most
    } pairs[] = {
        // Without loss, whatever the blocks and with or without a table for seeking.
        {"song.flac", "song.wav"},
        {"no_table.flac", "song.wav"},
        {"short_blocks.flac", "song.wav"},
        {"huge_blocks.flac", "song.wav"},
        {"mono.flac", "mono.wav"},
        {"six.flac", "six.wav"},
        {"golden/late.flac", "golden/plain.flac"},
        {"golden/variable.flac", "golden/plain.flac", 0, 8192},
        // The frame with the encoder's table is no music.
        {"vbr.mp3", "vbr_no_table.mp3"},
        // The same frames, however they are packed and whatever is beside them.
        {"golden/plain.adif", "golden/plain.aac"},
        {"golden/program.aac", "golden/plain.aac"},
        {"golden/he.m4a", "golden/he_every.aac"},
        {"last.m4a", "low.aac"},
        {"first.m4a", "low.aac"},
        {"fragmented.mp4", "low.aac"},
        {"video.mp4", "low.aac"},
        {"tagged.m4a", "low.aac"},
        {"video.ogv", "song.ogg"},
        // Of a mono stream the bare source drops nothing and averages nothing.
        {"layer3.mp4", "mono.mp3"},
        // Vorbis is cut where its granule positions say.
        {"golden/late.ogg", "golden/plain.ogg"},
        {"golden/front.ogg", "golden/plain.ogg", 700},
    };
    for (const auto &pair : pairs) {
        SCOPED_TRACE(pair.file);
        const samples like = read_all(fixture(pair.like));
        const size_t end = std::min(like.size(), pair.count);
        expect_same(read_all(fixture(pair.file)), {like.begin() + static_cast<ptrdiff_t>(pair.skip),
                                                   like.begin() + static_cast<ptrdiff_t>(end)});
    }
    samples cut = read_all(fixture("golden/plain.ogg"));
    cut.resize(cut.size() - 700);
    expect_same(read_all(fixture("golden/end.ogg")), cut);
    // Of a stereo stream the bare source drops the start; of a first frame of 384 samples, that.
    EXPECT_EQ(read_all(fixture("stereo3.mp4")).size(), read_all(fixture("cbr.mp3")).size() + 529);
    EXPECT_EQ(read_all(fixture("golden/layer1_44.mp1")).size(), 19U * 384);
    EXPECT_EQ(read_all(fixture("golden/layer1_48.mp1")).size(), 20U * 384);
}

// The channels of a WAV file, rounded to 16 bits, and behind them their mean.
std::vector<samples> wav_channels(const std::string &path) {
    const bytes file = load(path);
    const uint8_t name[] = {'d', 'a', 't', 'a'};
    const auto width = static_cast<ptrdiff_t>(file[34] / 8);
    std::vector<samples> channels(file[22] + size_t{1});
    int sum = 0;
    size_t channel = 0;
    for (auto at = std::search(file.begin(), file.end(), name, name + 4) + 8;
         at + width <= file.end(); at += width) {
        const int low = width == 3 ? at[0] : 0;
        const int high = static_cast<int16_t>(at[width - 2] | at[width - 1] << 8);
        const int sample = std::min(high + (low >= 128 ? 1 : 0), 32767);
        channels[channel].push_back(static_cast<int16_t>(sample));
        sum += sample;
        if (++channel + 1 < channels.size()) continue;
        channels.back().push_back(static_cast<int16_t>(sum / static_cast<int>(channel)));
        sum = 0;
        channel = 0;
    }
    return channels;
}

// 24 bits at 96 kHz; and noise in blocks of 65,535 samples, which no buffer of the source can hold.
TEST(Flac, RoundsTwentyFourBits) {
    expect_same(read_all(fixture("wide.flac")), wav_channels(fixture("wide.wav"))[0]);
    expect_same(read_all(fixture("noise.flac")), wav_channels(fixture("noise.wav"))[0]);
    EXPECT_EQ(opened(fixture("wide.flac")).format.sample_rate, 96000);
}

// The headers say 22,050 Hz; decoding says 44,100 Hz, 2048 samples a frame.
TEST(Aac, LearnsTheTruthFromTheFrames) {
    for (const char *name : {"golden/he_every.aac", "golden/he.aac", "golden/he.m4a"}) {
        const opened file(fixture(name));
        ASSERT_NE(file.source, nullptr) << name;
        EXPECT_EQ(file.format.sample_rate, 44100);
        EXPECT_EQ(file.format.duration * 44100 / kUnits % 2048, 0);
    }
    // Frames that lost their replication data keep their length, also where a new decoder starts.
    const samples he = read_all(fixture("golden/he.aac"));
    for (size_t at = 256 * 2048; at < he.size(); at += 1024) {
        EXPECT_TRUE(std::any_of(&he[at], &he[at] + 1024, [](int16_t s) { return s != 0; })) << at;
    }
}

// Where a new decoder starts, every few seconds, nothing is to be heard. This file has no
// substituted noise, which differs from one decoder to the next.
TEST(Aac, ComesOutAsFromOneDecoder) {
    const std::string path = save("one.raw", {});
    const std::string command = "ffmpeg -nostdin -v error -y -i " + fixture("high.aac") +
                                " -af 'pan=mono|c0=c0' -f s16le " + path;
    ASSERT_EQ(std::system(command.c_str()), 0);
    const bytes raw = load(path);
    const samples got = read_all(fixture("high.aac"));
    ASSERT_GT(got.size(), 500U * 1024);
    ASSERT_EQ(raw.size(), 2 * got.size());
    for (size_t i = 0; i < got.size(); ++i) {
        const int wanted = static_cast<int16_t>(raw[2 * i] | raw[2 * i + 1] << 8);
        ASSERT_LE(std::abs(got[i] - wanted), 1) << i;
    }
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
    } files[] = {
        // The encoder delays by 576, the decoder by 529 of which the source drops as many.
        {"vbr.mp3", "song.wav", true, 576},    {"high.aac", "song48.wav", false, 1024},
        {"mono.aac", "mono.wav", false, 1024}, {"six.aac", "six.wav", false, 1024},
        {"song.ogg", "song.wav", true, 0},     {"six.ogg", "six.wav", true, 0},
    };
    for (const auto &each : files) {
        SCOPED_TRACE(each.file);
        const samples got = read_all(fixture(each.file));
        const std::vector<samples> channels = wav_channels(fixture(each.song));
        const samples &wanted = each.mean ? channels.back() : channels.front();
        const samples &wrong = each.mean ? channels.front() : channels.back();
        EXPECT_TRUE(each.late != 0 || got.size() == wanted.size());
        const double near = distance(got, wanted, each.late);
        EXPECT_GT(distance(wanted, samples(wanted.size()), 0), 20 * near);
        EXPECT_TRUE(channels.size() == 2 || distance(got, wrong, each.late) > 4 * near);
        for (size_t late = each.late < 16 ? 0 : each.late - 16; late < each.late + 16; ++late) {
            EXPECT_TRUE(late == each.late || near < distance(got, wanted, late)) << late;
        }
    }
}

// The readers get one byte at a time; recognition, which opens the file first, asks for whole
// heads.
TEST(Files, MayDeliverOneByteAtATime) {
    static mtsrc_file *recognised;
    for (const char *name :
         {"song.wav", "cbr.mp3", "song.flac", "low.aac", "last.m4a", "song.ogg"}) {
        SCOPED_TRACE(name);
        const std::string path = fixture(name);
        mtsrc_io io = io_for(path);
        io.path = strdup(path.c_str());  // the source's, once it is open
        io.read = [](mtsrc_file *file, void *buf, int32_t count) {
            return mtsrc_file_read(file, buf, file == recognised ? count : std::min(count, 1));
        };
        io.open = [](const mtsrc_io *of, int32_t mode) {
            mtsrc_file *opened = mtsrc_file_open(of, mode);
            if (recognised == nullptr) recognised = opened;
            return opened;
        };
        recognised = nullptr;
        int32_t err = 0;
        mtsrc_ctx *source = mtsrc_open_mfal(&io, 0, &err);
        ASSERT_NE(source, nullptr) << err;
        expect_same(read(source, SIZE_MAX), read_all(path));
        mtsrc_deinit(source);
    }
}

// Tags and garbage that bare streams are found in.
TEST(MpegAudio, PassesTagsAndGarbage) {
    bytes file = load(fixture("vbr.mp3"));
    const samples plain = read_all(fixture("vbr_no_table.mp3"));
    constexpr size_t kTable = 36;  // behind the side information of MPEG-1 stereo; VBRI's place too
    ASSERT_EQ(memcmp(file.data() + kTable, "Xing", 4), 0);
    for (const char *name : {"Info", "VBRI"}) {
        memcpy(file.data() + kTable, name, 4);
        expect_same(read_all(save("table.mp3", file)), plain);
    }
    // An ID3v2.3 tag of 600 bytes that look like frames of another stream.
    bytes id3v2 = {'I', 'D', '3', 3, 0, 0, 0, 0, 600 >> 7, 600 & 0x7F};
    while (id3v2.size() < 610) {
        const size_t i = id3v2.size() % 104;
        id3v2.push_back(i == 10 ? 0xFF : i == 11 ? 0xFB : 0x10);
    }
    bytes ape_end = {'A', 'P', 'E', 'T', 'A', 'G', 'E', 'X', 0xD0, 7, 0, 0, 64 + 32, 0, 0, 0, 1};
    ape_end.resize(32);
    bytes id3v1 = {'T', 'A', 'G'};
    id3v1.resize(128);
    const bytes behind = joined({bytes(64, 0x20), ape_end, id3v1});
    expect_same(read_all(save("tags.mp3", joined({id3v2, id3v2, file, behind}))), plain);
    const bytes aac = load(fixture("golden/plain.aac"));
    expect_same(read_all(save("tags.aac", joined({id3v2, aac}))),
                read_all(fixture("golden/plain.aac")));
    const bytes flac = load(fixture("song.flac"));
    expect_same(read_all(save("tags.flac", joined({id3v2, flac, id3v1}))),
                read_all(fixture("song.wav")));
    // A second Ogg stream chained behind is not read.
    const bytes ogg = load(fixture("golden/plain.ogg"));
    expect_same(read_all(save("chained.ogg", joined({ogg, ogg}))),
                read_all(fixture("golden/plain.ogg")));
}

// Other codecs, and files that have nothing of a format but its first bytes.
TEST(Files, ThatCannotBeReadAreRefused) {
    EXPECT_EQ(opened(fixture("alac.m4a")).error, -3);
    EXPECT_EQ(opened(fixture("silent.mp4")).error, -7);
    EXPECT_EQ(opened(fixture("opus.ogg")).error, -7);
    for (const char *head : {"", "RIFF....WAVEfmt ", "fLaC", "....ftyp", "OggS", "ADIF", "ID3"}) {
        for (const int fill : {0x00, 0x55, 0xFF}) {
            bytes contents(100'000, static_cast<uint8_t>(fill));
            memcpy(contents.data(), head, strlen(head));
            EXPECT_EQ(opened(save("noise", contents)).source, nullptr) << head;
        }
    }
}

}  // namespace
}  // namespace codec_test
