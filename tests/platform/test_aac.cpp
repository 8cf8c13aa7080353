#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <random>

#include "media_source/wexaaudio.h"
#include "tests/platform/aac_streams.h"
#include "tests/platform/codec_test.h"

namespace {

using codec_test::adts_frames;
using codec_test::bytes;
using codec_test::expect_same;
using codec_test::fixture;
using codec_test::kUnits;
using codec_test::load;
using codec_test::read_all;
using codec_test::samples;
using codec_test::save;

constexpr size_t kFrame = 1024;
constexpr size_t kDelay = 1024;  // sample pairs of the encoder, not removed

using direct = codec_test::direct<xaac_info, int64_t, xaacfd_create, xaacfd_delete>;

// Mean square of the difference to a channel of a 16-bit WAV file, over a second in the middle.
double distance(const samples &got, const bytes &wav, size_t channels, size_t channel) {
    double sum = 0;
    for (size_t i = 120000; i < 164100; ++i) {
        int16_t wanted = 0;
        memcpy(&wanted, wav.data() + 44 + 2 * (i * channels + channel), 2);
        const double d = got[i + kDelay] - wanted;
        sum += d * d;
    }
    return sum / 44100;
}

TEST(Aac, CountsEveryFrame) {
    const std::vector<size_t> at = adts_frames(load(fixture("low.aac")));
    EXPECT_EQ(read_all(fixture("low.aac")).size(), (at.size() - 1) * kFrame);
}

// The song comes the encoder's delay late, from the right channel of the file.
TEST(Aac, DeliversTheFrontLeftChannel) {
    const struct {
        const char *name, *source;
        size_t channels;
    } files[] = {
        {"high.aac", "song48.wav", 2}, {"mono.aac", "mono.wav", 1}, {"six.aac", "six.wav", 6}};
    for (const auto &file : files) {
        SCOPED_TRACE(file.name);
        const bytes wav = load(fixture(file.source));
        const samples got = read_all(fixture(file.name));
        const double left = distance(got, wav, file.channels, 0);
        for (size_t c = 1; c < file.channels; ++c) {
            EXPECT_LT(10 * left, distance(got, wav, file.channels, c)) << c;
        }
        EXPECT_LT(left, 500.0 * 500.0);
    }
}

// Where a new decoder starts, every few seconds, nothing is to be heard. This file has no
// substituted noise, which differs from one decoder to the next.
TEST(Aac, ComesOutAsFromOneDecoder) {
    const std::string path = save("one.raw", {});
    const std::string command = "ffmpeg -nostdin -v error -y -i " + fixture("high.aac") +
                                " -af pan=mono\\|c0=c0 -f s16le " + path;
    ASSERT_EQ(std::system(command.c_str()), 0);
    const bytes raw = load(path);
    const samples got = read_all(fixture("high.aac"));
    ASSERT_GT(got.size(), 500 * kFrame);
    ASSERT_EQ(raw.size(), 2 * got.size());
    for (size_t i = 0; i < got.size(); ++i) {
        const int wanted = static_cast<int16_t>(raw[2 * i] | raw[2 * i + 1] << 8);
        ASSERT_LE(std::abs(got[i] - wanted), 1) << i;
    }
}

TEST(Aac, MonoComesOutAsTwoEqualChannels) {
    direct file(fixture("mono.aac"));
    ASSERT_NE(file.reader, nullptr);
    EXPECT_EQ(file.info.channels, 1);
    const xaac_config config = {{1, 2, 2, 0}, 3, 44100, 1, 0};
    void *decoder = xaacd_create(&config, nullptr);
    ASSERT_NE(decoder, nullptr);
    bytes buf(24576);
    samples pcm(8192);
    for (int i = 0; i < 100; ++i) {
        wexa_frame frame = {};
        frame.data = buf.data();
        frame.codec = 306;
        int64_t first = 0;
        int64_t second = 0;
        ASSERT_EQ(xaacfd_get_frm(file.reader, buf.data(), 24576, &frame.bytes, &first, &second), 0);
        wexa_output output = {};
        output.data = pcm.data();
        wexa_status status = {};
        ASSERT_EQ(xaacd_decode(decoder, &frame, &output, &status), 0);
        ASSERT_NE(status.produced, 0);
        ASSERT_EQ(output.bytes, 4096);
        for (size_t k = 0; k < kFrame; ++k) {
            ASSERT_EQ(pcm[2 * k], pcm[2 * k + 1]);
        }
    }
    xaacd_delete(decoder);
}

// The headers say 22,050 Hz and one channel; decoding says 44,100 Hz and, as for every stream that
// may have parametric stereo, two.
TEST(Aac, LearnsTheTruthAboutBandReplication) {
    const bytes core = load(fixture("core.aac"));
    const size_t frames = adts_frames(core).size() - 1;
    for (const size_t header_every : {1U, 8U}) {
        SCOPED_TRACE(header_every);
        const bytes file = codec_test::with_band_replication(core, header_every);
        direct reader(save("high_efficiency.aac", file));
        ASSERT_NE(reader.reader, nullptr);
        EXPECT_EQ(reader.info.sample_rate, 44100);
        EXPECT_EQ(reader.info.channels, 2);
        EXPECT_EQ(reader.info.duration * 44100 / kUnits, static_cast<int64_t>(frames * 2048));
        codec_test::expect_exact_seams(reader.path);
    }
    // A frame that lost its replication data keeps its length.
    bytes mixed = codec_test::with_band_replication(core, 1);
    const std::vector<size_t> at = adts_frames(mixed);
    const std::vector<size_t> core_at = adts_frames(core);
    bytes half(mixed.begin(), mixed.begin() + static_cast<ptrdiff_t>(at[100]));
    half.insert(half.end(), core.begin() + static_cast<ptrdiff_t>(core_at[100]), core.end());
    const std::string path = save("half.aac", half);
    EXPECT_EQ(read_all(path).size(), frames * 2048);
    codec_test::expect_exact_seams(path);
}

TEST(Aac, ReadsEveryFraming) {
    const bytes adts = load(fixture("low.aac"));
    const samples plain = read_all(fixture("low.aac"));
    const std::string adif = save("song.adif", codec_test::as_adif(adts));
    EXPECT_EQ(read_all(adif).size(), plain.size());
    codec_test::expect_exact_seams(adif);
    // The configurations have different lengths, so groups of frames might; this file's do not.
    EXPECT_EQ(read_all(adif), plain);
    const std::string program = save("program.aac", codec_test::with_program_configuration(adts));
    EXPECT_EQ(read_all(program), plain);
    // Mono has the shorter configuration too.
    const bytes mono = load(fixture("mono.aac"));
    EXPECT_EQ(read_all(save("mono.adif", codec_test::as_adif(mono))),
              read_all(fixture("mono.aac")));
}

TEST(Aac, ReadsTagsInFront) {
    const bytes file = load(fixture("low.aac"));
    bytes tagged = {'I', 'D', '3', 4, 0, 0, 0, 0, 0, 14,  'T', 'I',
                    'T', '2', 0,   0, 0, 4, 0, 0, 3, 'a', 'b', 'c'};
    tagged.insert(tagged.end(), file.begin(), file.end());
    direct reader(save("tagged.aac", tagged));
    ASSERT_NE(reader.reader, nullptr);
    ASSERT_NE(reader.info.tags, nullptr);
    EXPECT_STREQ(static_cast<char *>(reader.info.tags->text[0].data), "abc");
    EXPECT_EQ(read_all(reader.path), read_all(fixture("low.aac")));
}

// Noise in place of payloads: the frames keep their length, the rest comes out as before.
TEST(Aac, ConcealsDamagedFrames) {
    bytes file = load(fixture("low.aac"));
    const std::vector<size_t> at = adts_frames(file);
    const samples plain = read_all(fixture("low.aac"));
    std::mt19937 random(5);
    for (size_t i = 100; i < 150; ++i) {
        for (size_t k = at[i] + 7; k < at[i + 1]; ++k) {
            file[k] = static_cast<uint8_t>(random());
        }
    }
    const std::string path = save("damaged.aac", file);
    const samples got = read_all(path);
    ASSERT_EQ(got.size(), plain.size());
    expect_same(got, plain, 0, 99 * kFrame);
    expect_same(got, plain, 300 * kFrame, plain.size());
    codec_test::expect_exact_seams(path);
}

// A frame without a header cannot be told from what is no frame at all: it is passed over.
TEST(Aac, PassesOverWhatIsNoFrame) {
    const bytes file = load(fixture("low.aac"));
    const std::vector<size_t> at = adts_frames(file);
    const samples plain = read_all(fixture("low.aac"));
    bytes damaged = file;
    damaged[at[300]] = 0;
    EXPECT_EQ(read_all(save("damaged.aac", damaged)).size(), plain.size() - kFrame);
    damaged = file;
    damaged[at[300] + 4] ^= 0xFF;  // the length
    EXPECT_EQ(read_all(save("damaged.aac", damaged)).size(), plain.size());
    bytes between(file.begin(), file.begin() + static_cast<ptrdiff_t>(at[300]));
    between.insert(between.end(), 5000, 0xFF);
    between.insert(between.end(), file.begin() + static_cast<ptrdiff_t>(at[300]), file.end());
    EXPECT_EQ(read_all(save("damaged.aac", between)), plain);
}

TEST(Aac, CountsWhatACutFileHolds) {
    const bytes file = load(fixture("low.aac"));
    const std::vector<size_t> at = adts_frames(file);
    const samples plain = read_all(fixture("low.aac"));
    const bytes head(file.begin(), file.begin() + static_cast<ptrdiff_t>(at[300] + 100));
    const std::string path = save("cut.aac", head);
    const samples got = read_all(path);
    ASSERT_EQ(got.size(), 300 * kFrame);
    expect_same(got, plain, 0, 256 * kFrame);
    codec_test::opened cut(path);
    ASSERT_NE(cut.source, nullptr);
    EXPECT_EQ(cut.format.duration * 44100 / kUnits, static_cast<int64_t>(300 * kFrame));
}

TEST(Aac, TellsTheRateOfAFrame) {
    const bytes core = load(fixture("core.aac"));
    for (const bool replicated : {false, true}) {
        direct file(replicated ? save("rate.aac", codec_test::with_band_replication(core, 1))
                               : fixture("core.aac"));
        ASSERT_NE(file.reader, nullptr);
        const xaac_config config = {{1, 2, 2, 0}, 3, 22050, 1, 0};
        void *decoder = xaacd_create(&config, nullptr);
        bytes buf(24576);
        wexa_frame frame = {};
        frame.data = buf.data();
        int64_t first = 0;
        int64_t second = 0;
        ASSERT_EQ(xaacfd_get_frm(file.reader, buf.data(), 24576, &frame.bytes, &first, &second), 0);
        xaac_stream_info info = {};
        EXPECT_EQ(xaacd_info(decoder, &frame, &info), 0);
        EXPECT_EQ(info.sample_rate, replicated ? 44100 : 22050);
        frame.bytes = 3;
        EXPECT_NE(xaacd_info(decoder, &frame, &info), 0);
        xaacd_delete(decoder);
    }
}

TEST(Aac, RefusesCutAdif) {
    bytes adif = codec_test::as_adif(load(fixture("low.aac")));
    for (const size_t size : {4U, 10U, 20U}) {
        adif.resize(size);
        EXPECT_EQ(direct(save("none.adif", adif)).reader, nullptr);
        adif = codec_test::as_adif(load(fixture("low.aac")));
    }
}

}  // namespace
