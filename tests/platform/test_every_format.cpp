// What every format's reader owes, on every file of the fixtures.
#include <algorithm>
#include <cstring>

#include "media_source/wexaaudio.h"
#include "tests/platform/codec_test.h"

namespace {

using codec_test::bytes;
using codec_test::direct;
using codec_test::fixture;
using codec_test::save;

class Seams : public testing::TestWithParam<const char *> {};

TEST_P(Seams, AreExact) {
    codec_test::expect_exact_seams(fixture(GetParam()));
}

INSTANTIATE_TEST_SUITE_P(Files, Seams,
                         testing::Values("cbr.mp3", "cbr48.mp3", "vbr.mp3", "vbr_no_table.mp3",
                                         "checked.mp3", "mono.mp3", "lsf.mp3", "low.mp3",
                                         "tagged.mp3", "layer2.mp2", "song.flac", "no_table.flac",
                                         "short_blocks.flac", "huge_blocks.flac", "mono.flac",
                                         "six.flac", "wide.flac", "noise.flac", "low.aac",
                                         "noisy.aac", "high.aac", "mono.aac", "six.aac", "core.aac",
                                         "song.ogg", "other.ogg", "mono.ogg", "six.ogg",
                                         "video.ogv"));

TEST(TagRecord, HoldsTitleArtistAndAlbum) {
    using mpeg = direct<xmp123_info, int64_t, xmp123fd_create, xmp123fd_delete>;
    using flac = direct<xflac_info, int64_t, xflacfd_create, xflacfd_delete>;
    using mp4 = direct<xmp4_info, int32_t, xmp4fd_create, xmp4fd_delete>;
    using ogg = direct<xogg_info, int64_t, xoggd_create, xoggd_delete>;
    const auto expect = [](const auto &file) {
        SCOPED_TRACE(file.path);
        ASSERT_NE(file.reader, nullptr);
        ASSERT_NE(file.info.tags, nullptr);
        const char *wanted[] = {"A Title", "An Artist", "An Album"};
        for (size_t i = 0; i < (file.path.find(".flac") == std::string::npos ? 3 : 2); ++i) {
            EXPECT_STREQ(static_cast<char *>(file.info.tags->text[i].data), wanted[i]);
        }
    };
    expect(mpeg(fixture("tagged.mp3")));
    expect(flac(fixture("no_table.flac")));
    expect(mp4(fixture("tagged.m4a")));
    expect(ogg(fixture("song.ogg")));
}

// A decoder that is handed a frame as it stands in the file, as a host without our reader would do.
// The FLAC frame is the first of 4096 samples; the decoder takes what follows for padding.
TEST(BareFrame, IsDecoded) {
    const wexa_config stereo = {1, 2, 2, 0};
    bytes pcm(1 << 20);
    wexa_output output = {};
    output.data = pcm.data();
    wexa_status status = {};
    wexa_frame frame = {};

    bytes flac = codec_test::load(fixture("long_blocks.flac"));
    const uint8_t sync[] = {0xFF, 0xF8};
    const auto first = std::search(flac.begin() + 42, flac.end(), sync, sync + 2);
    frame.data = &*first;
    frame.bytes = 20'000;
    void *decoder = xflacd_create(&stereo, nullptr);
    ASSERT_NE(decoder, nullptr);
    EXPECT_EQ(xflacd_decode(decoder, &frame, &output, &status), 0);
    EXPECT_NE(status.produced, 0);
    ASSERT_EQ(output.bytes, 4096 * 4);
    const bytes wav = codec_test::load(fixture("song.wav"));
    EXPECT_TRUE(std::equal(pcm.begin(), pcm.begin() + output.bytes, wav.begin() + 44));
    xflacd_delete(decoder);

    bytes mpeg = codec_test::load(fixture("cbr.mp3"));
    frame.data = mpeg.data();
    frame.bytes = 417;
    decoder = xmp123d_create(&stereo, nullptr);
    ASSERT_NE(decoder, nullptr);
    EXPECT_EQ(xmp123d_decode(decoder, &frame, &output, &status), 0);
    EXPECT_EQ(output.bytes, 1152 * 4);
    xmp123d_delete(decoder);
}

TEST(Decoder, RefusesWhatItIsNotMadeFor) {
    const wexa_config wrong[] = {{1, 2, 3, 0}, {1, 3, 2, 0}, {1, -1, 2, 0}};
    const wexa_config right = {1, 1, 2, 0};
    const struct {
        void *(*create)(const wexa_config *, void *);
        int32_t (*decode)(void *, const wexa_frame *, wexa_output *, wexa_status *);
        void (*remove)(void *);
    } decoders[] = {{xflacd_create, xflacd_decode, xflacd_delete},
                    {xmp123d_create, xmp123d_decode, xmp123d_delete},
                    {xvorbisd_create, xvorbisd_decode, xvorbisd_delete}};
    for (const auto &each : decoders) {
        EXPECT_EQ(each.create(nullptr, nullptr), nullptr);
        for (const wexa_config &config : wrong) {
            if (each.create == xvorbisd_create)
                break;  // it takes any, and gives one channel or two
            EXPECT_EQ(each.create(&config, nullptr), nullptr);
        }
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
                EXPECT_EQ(codec_test::opened(save("noise", contents)).source, nullptr);
            }
        }
    }
}

}  // namespace
