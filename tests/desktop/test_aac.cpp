// AAC, bare and in MP4, of encoders and of streams that none at hand writes, made out of one that
// it does.
#include <algorithm>
#include <cstdlib>
#include <initializer_list>

#include "tests/desktop/codec_test.h"

namespace codec_test {
namespace {

constexpr size_t kFrame = 1024;      // samples
constexpr size_t kHeader = 7;        // bytes of an ADTS frame's
constexpr int32_t kBuffer = 24'576;  // bytes of a frame at most

// Offsets of the ADTS frames; the file's end is the last one.
std::vector<size_t> adts_frames(const bytes &file) {
    std::vector<size_t> at;
    size_t i = 0;
    while (i + kHeader <= file.size()) {
        EXPECT_EQ(file[i], 0xFF);
        at.push_back(i);
        const size_t size = (file[i + 3] & 3U) << 11 | file[i + 4] * 8U | file[i + 5] >> 5;
        i += std::max(size, kHeader);
    }
    EXPECT_EQ(i, file.size());
    at.push_back(i);
    return at;
}

struct field {
    uint32_t value;
    int width;
};

struct bits {
    bytes data;
    size_t count = 0;

    void put(std::initializer_list<field> fields) {
        for (const auto &[value, width] : fields) {
            for (int i = width - 1; i >= 0; --i, ++count) {
                if (count % 8 == 0) data.push_back(0);
                data.back() |= static_cast<uint8_t>((value >> i & 1) << (7 - count % 8));
            }
        }
    }
    void align() { count = data.size() * 8; }
    void append(const bytes &other, size_t bit_count) {
        for (size_t i = 0; i < bit_count; ++i) put({{other[i / 8] >> (7 - i % 8) & 1U, 1}});
    }
};

// A fill element with one frame of replication data for a single channel: one envelope over the
// whole frame, the one band between 9 and 10 kHz.
void put_replication(bits *out, size_t frame, bool header) {
    const auto number = static_cast<uint32_t>(frame);
    bits sbr;
    sbr.put({{13, 4}, {header ? 1U : 0U, 1}});  // plain replication data
    if (header) {
        // Resolution, start, stop an octave above, crossover at the last of eight bands.
        sbr.put({{0, 1}, {5, 4}, {14, 4}, {7, 3}, {0, 2}});
        // More follows, of which eight bands an octave.
        sbr.put({{1, 1}, {0, 1}, {3, 2}, {0, 1}, {2, 2}});
    }
    // No extra data, fixed borders, one envelope, coarse, coded along frequency.
    sbr.put({{0, 1}, {0, 2}, {0, 2}, {0, 1}, {0, 2}});
    // Inverse filtering, the envelope, the noise.
    sbr.put({{number / 3 % 4, 2}, {20 + number * 7 % 11, 7}, {3 + number % 4, 5}, {0, 2}});
    sbr.align();
    out->put({{6, 3}, {static_cast<uint32_t>(sbr.data.size()), 4}});
    out->append(sbr.data, sbr.count);
}

std::vector<bytes> raw_blocks(const bytes &adts) {
    const std::vector<size_t> at = adts_frames(adts);
    std::vector<bytes> blocks;
    for (size_t i = 0; i + 1 < at.size(); ++i) {
        blocks.push_back(part(adts, at[i] + kHeader, at[i + 1]));
    }
    return blocks;
}

// Bits of a raw block before its end mark, which is the last three bits that are set.
size_t bits_before_end(const bytes &block) {
    size_t at = block.size() * 8;
    while (at > 3 && (block[(at - 1) / 8] >> (7 - (at - 1) % 8) & 1) == 0) {
        --at;
    }
    return at - 3;
}

// The block behind a header like that of the stream's first frame, which leaves the channels to the
// blocks if told so.
bytes frame_of(const bytes &block, const bytes &adts, bool no_channels = false) {
    const size_t size = kHeader + block.size();
    bytes head = part(adts, 0, kHeader);
    if (no_channels) head[2] &= 0xFE;
    head[3] = static_cast<uint8_t>((head[3] & (no_channels ? 0x3C : 0xFC)) | size >> 11);
    head[4] = static_cast<uint8_t>(size >> 3);
    head[5] = static_cast<uint8_t>((head[5] & 0x1F) | size << 5);
    return joined({head, block});
}

// Low complexity, the rate of the stream, one front element of its channels, no mixdowns, a
// comment.
void put_program(bits *out, const bytes &adts) {
    const bool pair = (adts[3] >> 6) == 2;
    out->put({{0, 4}, {1, 2}, {adts[2] >> 2 & 15U, 4}});
    out->put({{1, 4}, {0, 4}, {0, 4}, {0, 2}, {0, 3}, {0, 4}, {0, 3}});
    out->put({{pair ? 1U : 0U, 1}, {0, 4}});
    out->align();
    out->put({{2, 8}, {'h', 8}, {'i', 8}});
}

// Gives every frame of a one-channel stream at 22,050 Hz spectral band replication: one band, a
// noise floor, an envelope that changes with every frame, and the header in every header_every-th
// frame. The headers go on stating half the rate and one channel.
bytes with_band_replication(const bytes &adts, size_t header_every) {
    bytes out;
    size_t frame = 0;
    for (const bytes &block : raw_blocks(adts)) {
        bits changed;
        changed.append(block, bits_before_end(block));
        put_replication(&changed, frame, frame % header_every == 0);
        changed.put({{7, 3}});
        out = joined({out, frame_of(changed.data, adts)});
        ++frame;
    }
    return out;
}

// The same raw blocks behind an ADIF header.
bytes as_adif(const bytes &adts) {
    bits head;
    head.put({{'A', 8}, {'D', 8}, {'I', 8}, {'F', 8}});
    // No copyright, copied, home-made; variable rate, one program.
    head.put({{0, 3}, {1, 1}, {128'000, 23}, {0, 4}});
    put_program(&head, adts);
    return joined({head.data, joined(raw_blocks(adts))});
}

// The same raw blocks with ADTS headers that leave the channels to a program configuration in the
// first block.
bytes with_program_configuration(const bytes &adts) {
    std::vector<bytes> blocks = raw_blocks(adts);
    bits first;
    first.put({{5, 3}});
    put_program(&first, adts);
    first.append(blocks[0], blocks[0].size() * 8);
    blocks[0] = first.data;
    for (bytes &block : blocks) block = frame_of(block, adts, true);
    return joined(blocks);
}

void ffmpeg(const std::string &options) {
    ASSERT_EQ(std::system(("ffmpeg -nostdin -v error -y " + options).c_str()), 0);
}

// Where a new decoder starts, every few seconds, nothing is to be heard. This file has no
// substituted noise, which differs from one decoder to the next.
TEST(Aac, ComesOutAsFromOneDecoder) {
    const std::string path = save("one.raw", {});
    ffmpeg("-i " + fixture("high.aac") + " -af pan=mono\\|c0=c0 -f s16le " + path);
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

// Offset of the samples' frames, which follow each other.
size_t data_of(const bytes &file) {
    const char name[] = {'m', 'd', 'a', 't'};
    const auto at = std::search(file.begin(), file.end(), name, name + 4);
    EXPECT_NE(at, file.end());
    return static_cast<size_t>(at - file.begin()) + 4;
}

// The container's configuration says neither that the band is replicated nor the true rate.
TEST(Mp4, LearnsTheTruthAboutBandReplication) {
    const std::string adts = save("he.aac", with_band_replication(load(fixture("core.aac")), 1));
    const std::string path = save("he.m4a", {});
    ffmpeg("-i " + adts + " -c copy -bsf:a aac_adtstoasc -f mp4 " + path);
    const direct_mp4 file(path);
    ASSERT_NE(file.reader, nullptr);
    void *stream = xmp4fds_open(file.reader, 0, nullptr);
    xmp4_track track = {};
    ASSERT_EQ(xmp4fds_get_info_aud(stream, &track), 0);
    EXPECT_EQ(track.format_tag, kWexaTagAac);
    EXPECT_EQ(track.sample_rate, 44100);
    EXPECT_EQ(track.channels, 2);
    EXPECT_EQ(read_all(path), read_all(adts));
    expect_exact_seams(path);
}

// Zeros become silence. Frames that the table lists and the file is too short for do not count.
TEST(Mp4, ReadsDamagedAndCutFiles) {
    const bytes file = load(fixture("first.m4a"));
    const samples plain = read_all(fixture("first.m4a"));
    // The frames are those of the bare stream without their headers of 7 bytes.
    const size_t data = data_of(file);
    const std::vector<size_t> adts = adts_frames(load(fixture("low.aac")));
    const auto frame = [&](size_t i) { return data + adts[i] - 7 * i; };
    ASSERT_EQ(frame(adts.size() - 1), file.size());
    bytes zeros = file;
    std::fill(&zeros[frame(160)], &zeros[frame(215)], uint8_t{0});
    expect_changed(
        plain,
        {{"zeros", zeros, plain.size(), 160 * kFrame, 256 * kFrame, 162 * kFrame, 215 * kFrame},
         {"cut in a frame", part(file, 0, frame(300) + 9), 300 * kFrame, 256 * kFrame}});
    const bytes no_table = part(load(fixture("last.m4a")), 0, file.size() * 2 / 3);
    EXPECT_EQ(opened(save("cut.m4a", no_table)).error, -7);
}

}  // namespace
}  // namespace codec_test
