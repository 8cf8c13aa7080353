// Tests the readers of every format with real files.
#include <cstdlib>
#include <cstring>

#include "pcm/decode.h"
#include "tests/desktop/codec_test.h"

namespace {

using namespace std::string_literals;

class Stream : public testing::TestWithParam<const char *> {};

// A seek reaches the first sample at or after the requested position. The samples that follow are
// the same as in a read from the start.
TEST_P(Stream, SeekReachesTheRequestedSample) {
    constexpr ptrdiff_t kComparedSamples = 30'000;  // samples compared after each seek
    SCOPED_TRACE(GetParam());
    const samples linear = read_all(fixture(GetParam()));
    const open_source file(fixture(GetParam()));
    ASSERT_NE(file.source, nullptr) << file.error;
    ASSERT_GT(linear.size(), 0U);
    const int64_t rate = file.format.sample_rate;
    const int64_t duration = file.format.duration;
    EXPECT_EQ(duration * rate / kUnits, static_cast<int64_t>(linear.size()));
    std::vector<int64_t> positions = {0,           1,       227,         100'000,      133'000,
                                      200'000,     300'000, kUnits / 50, duration - 1, duration,
                                      2 * duration};
    std::mt19937_64 random(7);
    while (positions.size() < 40) {
        positions.push_back(static_cast<int64_t>(random() % static_cast<uint64_t>(duration)));
    }
    for (const int64_t position : positions) {
        SCOPED_TRACE("seek to " + std::to_string(position));
        int64_t reached = -1, again = -1;
        ASSERT_EQ(mtsrc_seekstream(file.source, position, &reached), 0);
        const int64_t sample = reached * rate / kUnits;
        const int64_t left = static_cast<int64_t>(linear.size()) - sample;
        ASSERT_GE(left, 0);
        // `reached` is at most one sample after `position`, or it is the end of the stream.
        ASSERT_TRUE(reached >= position || left == 0) << reached;
        ASSERT_LT(std::max<int64_t>(reached - position - 1, 0) * rate, kUnits) << reached;
        ASSERT_EQ(mtsrc_seekstream(file.source, reached, &again), 0);
        ASSERT_EQ(again, reached);
        const auto start = linear.begin() + sample;
        const samples expected(start, start + std::min<ptrdiff_t>(left, kComparedSamples));
        ASSERT_NO_FATAL_FAILURE(expect_equal(read(file.source, kComparedSamples), expected));
    }
}

// A job decodes a stream in segments, each from its own seek position, and joins them.
TEST_P(Stream, SegmentsJoinToTheWholeStream) {
    const std::string path = fixture(GetParam());
    const samples linear = read_all(path);
    const TAVO_PARAM param = {path.c_str(), TAVO_MODE_HIGHLIGHT};
    TAVO_CTX *ctx = tavo_init(&param, nullptr);
    ASSERT_EQ(ctx == nullptr, open_source(path).format.duration <= kUnits);
    if (ctx == nullptr) return;  // too short for a job
    EXPECT_EQ(ctx->seg_count, ctx->duration > 5 * kUnits ? 4 : 1);
    DecodePcmMT(ctx, ctx->pcm, ctx->pcm_bytes);
    expect_equal({ctx->pcm, ctx->pcm + ctx->pcm_bytes / 2}, linear);
    EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
}

INSTANTIATE_TEST_SUITE_P(
    Files, Stream,
    testing::Values("cbr.mp3", "cbr48.mp3", "vbr.mp3", "vbr_no_table.mp3", "checked.mp3",
                    "mono.mp3", "lsf.mp3", "low.mp3", "layer2.mp2", "golden/layer1_44.mp1",
                    "golden/layer1_48.mp1", "song.flac", "no_table.flac", "mono.flac", "six.flac",
                    "wide.flac", "noise.flac", "golden/variable.flac", "golden/late.flac",
                    "low.aac", "high.aac", "mono.aac", "six.aac", "core.aac", "golden/he.aac",
                    "last.m4a", "first.m4a", "fragmented.mp4", "fragments.mp4", "video.mp4",
                    "layer3.mp4", "stereo3.mp4", "golden/he.m4a", "song.ogg", "mono.ogg", "six.ogg",
                    "video.ogv", "golden/late.ogg", "golden/front.ogg", "golden/end.ogg"));

TEST(Reader, DecodesTheSameSamplesFromEveryContainer) {
    const struct {
        const char *file, *reference;
        size_t front = 0, end = 0;  // samples of the reference that the file lacks
    } pairs[] = {
        // FLAC is lossless with blocks of any size, and with or without a seek table.
        {"song.flac", "song.wav"},
        {"no_table.flac", "song.wav"},
        {"mono.flac", "mono.wav"},
        {"six.flac", "six.wav"},
        {"golden/late.flac", "golden/plain.flac"},
        {"golden/variable.flac", "golden/plain.flac", 0, 1408},
        // The first frame, which contains the encoder's Xing table, is skipped.
        {"vbr.mp3", "vbr_no_table.mp3"},
        // The container and its other streams do not change the samples.
        {"golden/program.aac", "golden/plain.aac"},
        {"golden/he.m4a", "golden/he_every.aac"},
        {"last.m4a", "low.aac"},
        {"first.m4a", "low.aac"},
        {"fragmented.mp4", "low.aac"},
        {"fragments.mp4", "low.aac"},
        {"video.mp4", "low.aac"},
        {"video.ogv", "song.ogg"},
        {"layer3.mp4", "mono.mp3"},
        // A Vorbis stream is trimmed at the start and the end as its granule positions state.
        {"golden/late.ogg", "golden/plain.ogg"},
        {"golden/front.ogg", "golden/plain.ogg", 700},
        {"golden/end.ogg", "golden/plain.ogg", 0, 700},
    };
    for (const auto &pair : pairs) {
        SCOPED_TRACE(pair.file);
        const samples reference = read_all(fixture(pair.reference));
        expect_equal(read_all(fixture(pair.file)),
                     {reference.begin() + static_cast<ptrdiff_t>(pair.front),
                      reference.end() - static_cast<ptrdiff_t>(pair.end)});
    }
}

// Returns ffmpeg's downmix of a song, rounded to 16 bits.
samples mix_with_ffmpeg(const std::string &song, const std::string &channels) {
    const std::string path = save("mixed.raw", "");
    const std::string command = "ffmpeg -nostdin -v error -y -i " + fixture(song) +
                                " -af 'pan=mono|c0" + channels + "' -f s32le " + path;
    EXPECT_EQ(std::system(command.c_str()), 0);
    const std::string raw = load(path);
    std::vector<int32_t> wide(raw.size() / 4);
    memcpy(wide.data(), raw.data(), 4 * wide.size());
    samples out;
    for (const int64_t x : wide)
        out.push_back(static_cast<int16_t>(std::min<int64_t>((x + 0x8000) >> 16, 32767)));
    return out;
}

// The songs are long enough for the reader to replace its decoder several times. None uses noise
// substitution. One song exceeds full scale. Another has blocks larger than the source's buffers.
TEST(Reader, AgreesWithFfmpeg) {
    const struct {
        const char *file, *reference, *channels;
        int tolerance = 1;   // largest difference
        size_t dropped = 0;  // samples that the source drops at the start
    } files[] = {
        {"wide.flac", "wide.wav", "=c0", 0},
        {"noise.flac", "noise.wav", "=c0", 0},
        {"high.aac", "high.aac", "=c0"},
        {"loud.aac", "loud.aac", "=c0"},
        {"golden/he.aac", "golden/he.aac", "=c0"},
        {"golden/he_every.aac", "golden/he_every.aac", "=c0"},
        {"six.aac", "six.aac", "=c0"},
        {"cbr.mp3", "cbr.mp3", "<c0+c1", 1, 529},
        {"cbr48.mp3", "cbr48.mp3", "<c0+c1"},
        {"low.mp3", "low.mp3", "=c0"},
        {"layer2.mp2", "layer2.mp2", "<c0+c1", 2, 529},
        {"golden/layer1_44.mp1", "golden/layer1_44.mp1", "<c0+c1", 2, 384},  // one frame
        {"golden/layer1_48.mp1", "golden/layer1_48.mp1", "<c0+c1", 2},
        {"song.ogg", "song.ogg", "<c0+c1"},
        {"six.ogg", "six.ogg", "<c0+c1+c2+c3+c4+c5"},
    };
    for (const auto &each : files) {
        SCOPED_TRACE(each.file);
        const samples got = read_all(fixture(each.file)),
                      expected = mix_with_ffmpeg(each.reference, each.channels);
        ASSERT_EQ(got.size() + each.dropped, expected.size());
        int largest = 0;  // difference
        for (size_t i = 0; i < got.size(); ++i)
            largest = std::max(largest, std::abs(got[i] - expected[i + each.dropped]));
        EXPECT_LE(largest, each.tolerance);
    }
}

// The source only delivers the first channel, so the test calls the reader directly.
TEST(Flac, DeliversBothChannels) {
    const std::string path = fixture("song.flac");
    const mtsrc_io io = io_for(path);
    xflac_info info = {};
    int64_t first = 0, second = 0;
    void *reader = xflacfd_create(&io, &first, &info, nullptr);
    ASSERT_NE(reader, nullptr);
    samples pairs(2 * 65'536), right;
    int32_t bytes = 0;
    while (xflacfd_get_frm(reader, pairs.data(), 4 * 65'536, &bytes, &first, &second) == 0) {
        for (size_t i = 1; i < static_cast<size_t>(bytes / 2); i += 2) right.push_back(pairs[i]);
    }
    xflacfd_delete(reader);
    expect_equal(right, mix_with_ffmpeg("song.wav", "=c1"));
}

// The readers accept a callback that delivers only part of a large read.
TEST(Reader, AcceptsShortReads) {
    for (const char *name :
         {"song.wav", "cbr.mp3", "song.flac", "low.aac", "last.m4a", "song.ogg"}) {
        SCOPED_TRACE(name);
        const std::string path = fixture(name);
        mtsrc_io io = io_for(path);
        io.path = strdup(path.c_str());  // the source releases it
        io.read = [](mtsrc_file *file, void *buf, int32_t count) {
            return mtsrc_file_read(file, buf, count > 40'000 ? 100 : count);
        };
        int32_t err = 0;
        mtsrc_ctx *source = mtsrc_open_mfal(&io, 0, &err);
        ASSERT_NE(source, nullptr) << err;
        expect_equal(read(source), read_all(path));
        mtsrc_deinit(source);
    }
}

TEST(Reader, SkipsTagsAndGarbage) {
    std::string file = load(fixture("vbr.mp3"));
    const samples plain = read_all(fixture("vbr_no_table.mp3"));
    constexpr size_t kTable = 36;  // offset of the table in an MPEG-1 stereo frame
    ASSERT_EQ(file.substr(kTable, 4), "Xing");
    for (const char *name : {"Info", "VBRI"})
        expect_equal(read_all(save("table.mp3", file.replace(kTable, 4, name))), plain);
    const std::string ogg = load(fixture("golden/plain.ogg"));
    // The bytes of this ID3v2.3 tag resemble frames of another stream.
    std::string id3v2 = "ID3\3\0\0\0\0\4\x58"s;
    while (id3v2.size() < 610) id3v2 += "\xFF\xFB" + std::string(102, '\x10');
    id3v2.resize(610);
    // The bytes of this APE tag are frames of this stream.
    const std::string ape =
        file.substr(20'000, 4000) + "APETAGEX\xD0\7\0\0\xC0\x0F\0\0"s + support::zeros(16);
    const std::string id3v1 = "TAG" + support::zeros(125);
    const struct {
        std::string contents;
        samples expected;
    } tagged[] = {
        {id3v2 + id3v2 + file.substr(0, 30) + file + ape + id3v1, plain},  // part of a frame first
        {id3v2 + load(fixture("golden/plain.aac")), read_all(fixture("golden/plain.aac"))},
        {id3v2 + load(fixture("song.flac")) + id3v1, read_all(fixture("song.wav"))},
        {ogg + ogg, read_all(fixture("golden/plain.ogg"))},  // only the first stream
    };
    for (const auto &each : tagged) {
        SCOPED_TRACE(&each - tagged);
        expect_equal(read_all(save("tagged", each.contents)), each.expected);
    }
}

}  // namespace
