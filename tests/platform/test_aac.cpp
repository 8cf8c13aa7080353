#include <algorithm>
#include <cstdlib>

#include "tests/platform/aac_streams.h"

namespace codec_test {
namespace {

constexpr size_t kFrame = 1024;
constexpr int32_t kBuffer = 24'576;  // bytes of a frame at most

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

// The reader's next frame, kept in buf.
wexa_frame next_frame(const direct_aac &file, bytes *buf) {
    buf->resize(kBuffer);
    wexa_frame frame = {};
    frame.data = buf->data();
    int64_t unused = 0;
    EXPECT_EQ(xaacfd_get_frm(file.reader, buf->data(), kBuffer, &frame.bytes, &unused, &unused), 0);
    return frame;
}

TEST(Aac, MonoComesOutAsTwoEqualChannels) {
    const direct_aac file(fixture("mono.aac"));
    ASSERT_NE(file.reader, nullptr);
    EXPECT_EQ(file.info.channels, 1);
    const xaac_config config = {{1, 2, 2, 0}, 3, 44100, 1, 0};
    void *decoder = xaacd_create(&config, nullptr);
    ASSERT_NE(decoder, nullptr);
    bytes buf;
    samples pcm(4 * kFrame);
    for (int i = 0; i < 100; ++i) {
        const wexa_frame frame = next_frame(file, &buf);
        wexa_output output = {};
        output.data = pcm.data();
        wexa_status status = {};
        ASSERT_EQ(xaacd_decode(decoder, &frame, &output, &status), 0);
        ASSERT_NE(status.produced, 0);
        ASSERT_EQ(output.bytes, 4096);
        for (size_t k = 0; k < kFrame; ++k) ASSERT_EQ(pcm[2 * k], pcm[2 * k + 1]);
    }
    xaacd_delete(decoder);
}

// The rate that the decoder finds in the stream's first frame, or in a few bytes of it.
int32_t rate_of(const direct_aac &file, int32_t most_bytes = kBuffer) {
    const xaac_config config = {{1, 2, 2, 0}, 3, 22050, 1, 0};
    void *decoder = xaacd_create(&config, nullptr);
    bytes buf;
    wexa_frame frame = next_frame(file, &buf);
    frame.bytes = std::min(frame.bytes, most_bytes);
    xaac_stream_info info = {};
    const int32_t code = xaacd_info(decoder, &frame, &info);
    xaacd_delete(decoder);
    return code == 0 ? info.sample_rate : -1;
}

// The headers say 22,050 Hz and one channel; decoding says 44,100 Hz and, as for every stream that
// may have parametric stereo, two.
TEST(Aac, LearnsTheTruthAboutBandReplication) {
    const bytes core = load(fixture("core.aac"));
    const std::vector<size_t> core_at = adts_frames(core);
    const bytes every = with_band_replication(core, 1);
    // A frame that lost its replication data keeps its length.
    const bytes half = joined({part(every, 0, adts_frames(every)[100]), part(core, core_at[100])});
    for (const bytes &file : {every, with_band_replication(core, 8), half}) {
        const direct_aac reader(save("high_efficiency.aac", file));
        ASSERT_NE(reader.reader, nullptr);
        EXPECT_EQ(reader.info.sample_rate, 44100);
        EXPECT_EQ(reader.info.channels, 2);
        EXPECT_EQ(reader.info.duration * 44100 / kUnits,
                  static_cast<int64_t>((core_at.size() - 1) * 2 * kFrame));
        EXPECT_EQ(rate_of(reader), 44100);
        expect_exact_seams(reader.path);
    }
    EXPECT_EQ(rate_of(direct_aac(fixture("core.aac"))), 22050);
    EXPECT_EQ(rate_of(direct_aac(fixture("core.aac")), 3), -1);
}

TEST(Aac, ReadsEveryFraming) {
    const bytes adts = load(fixture("low.aac"));
    const samples plain = read_all(fixture("low.aac"));
    EXPECT_EQ(plain.size(), (adts_frames(adts).size() - 1) * kFrame);
    // The configurations have different lengths, so groups of frames might; this file's do not.
    const bytes adif = as_adif(adts);
    expect_changed(plain, {{"adif", adif, plain.size(), plain.size()},
                           {"program configuration", with_program_configuration(adts), plain.size(),
                            plain.size()}});
    // Mono has the shorter configuration too.
    EXPECT_EQ(read_all(save("mono.adif", as_adif(load(fixture("mono.aac"))))),
              read_all(fixture("mono.aac")));
    for (const size_t size : {4U, 10U, 20U}) {
        EXPECT_EQ(direct_aac(save("none.adif", part(adif, 0, size))).reader, nullptr) << size;
    }
}

// A frame with noise in place of its payload keeps its length, the rest comes out as before. One
// without a header cannot be told from what is no frame at all: it is passed over.
TEST(Aac, ReadsDamagedAndCutFiles) {
    const bytes file = load(fixture("low.aac"));
    const std::vector<size_t> at = adts_frames(file);
    const samples plain = read_all(fixture("low.aac"));
    const bytes junk = noise(file.size());
    bytes noisy = file;
    for (size_t i = 100; i < 150; ++i) {
        std::copy(&junk[at[i] + 7], &junk[at[i + 1]], &noisy[at[i] + 7]);
    }
    bytes headless = file;
    headless[at[300]] = 0;
    bytes long_frame = file;
    long_frame[at[300] + 4] ^= 0xFF;  // the length
    const bytes junk_between =
        joined({part(file, 0, at[300]), bytes(5000, 0xFF), part(file, at[300])});
    const size_t all = plain.size();
    const size_t group = 256 * kFrame;  // what a decoder decodes in a row
    expect_changed(plain, {{"noise", noisy, all, 99 * kFrame, 300 * kFrame},
                           {"no header", headless, all - kFrame, group},
                           {"wrong length", long_frame, all, group},
                           {"junk between frames", junk_between, all, all},
                           {"cut", part(file, 0, at[300] + 100), 300 * kFrame, group}});
}

}  // namespace
}  // namespace codec_test
