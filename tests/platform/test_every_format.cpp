// What every format's reader owes, on every file of the fixtures.
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
