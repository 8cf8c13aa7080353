#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "media_source/wexaaudio.h"
#include "tests/platform/aac_streams.h"
#include "tests/platform/codec_test.h"

namespace {

using codec_test::bytes;
using codec_test::fixture;
using codec_test::kUnits;
using codec_test::load;
using codec_test::read_all;
using codec_test::samples;
using codec_test::save;

constexpr size_t kFrame = 1024;

using direct = codec_test::direct<xmp4_info, int32_t, xmp4fd_create, xmp4fd_delete>;

int32_t error_of(const std::string &path) {
    return codec_test::opened(path).error;
}

size_t find(const bytes &file, const char *name) {
    const auto at = std::search(file.begin(), file.end(), name, name + 4);
    EXPECT_NE(at, file.end()) << name;
    return static_cast<size_t>(at - file.begin());
}

// The same frames, however they are packed, give the same samples as their bare stream.
class Mp4Containers : public testing::TestWithParam<const char *> {};

TEST_P(Mp4Containers, GiveTheBareStream) {
    const std::string path = fixture(GetParam());
    EXPECT_EQ(read_all(path), read_all(fixture("low.aac")));
    codec_test::expect_exact_seams(path);
}

INSTANTIATE_TEST_SUITE_P(Files, Mp4Containers,
                         testing::Values("last.m4a", "first.m4a", "fragmented.mp4", "video.mp4",
                                         "tagged.m4a"));

TEST(Mp4, LayoutOfTheFixturesIsAsMeant) {
    const bytes last = load(fixture("last.m4a"));
    const bytes first = load(fixture("first.m4a"));
    EXPECT_GT(find(last, "moov"), find(last, "mdat"));
    EXPECT_LT(find(first, "moov"), find(first, "mdat"));
    find(load(fixture("fragmented.mp4")), "moof");
    direct video(fixture("video.mp4"));
    ASSERT_NE(video.reader, nullptr);
    ASSERT_EQ(video.info.track_count, 2);
    EXPECT_NE(video.info.kind[0], kWexaKindAudio);
    EXPECT_EQ(video.info.kind[1], kWexaKindAudio);
    EXPECT_EQ(xmp4fds_open(video.reader, 0, nullptr), nullptr);
    EXPECT_EQ(xmp4fds_open(video.reader, 2, nullptr), nullptr);
    EXPECT_EQ(xmp4fds_open(video.reader, -1, nullptr), nullptr);
}

// The container's configuration says neither that the band is replicated nor the true rate.
TEST(Mp4, LearnsTheTruthAboutBandReplication) {
    const std::string adts =
        save("he.aac", codec_test::with_band_replication(load(fixture("core.aac")), 1));
    const std::string path = adts + ".m4a";
    const std::string command =
        "ffmpeg -nostdin -v error -y -i " + adts + " -c copy -bsf:a aac_adtstoasc -f mp4 " + path;
    ASSERT_EQ(std::system(command.c_str()), 0);
    direct file(path);
    ASSERT_NE(file.reader, nullptr);
    void *stream = xmp4fds_open(file.reader, 0, nullptr);
    xmp4_track track = {};
    ASSERT_EQ(xmp4fds_get_info_aud(stream, &track), 0);
    EXPECT_EQ(track.format_tag, kWexaTagAac);
    EXPECT_EQ(track.sample_rate, 44100);
    EXPECT_EQ(track.channels, 2);
    EXPECT_EQ(read_all(path), read_all(adts));
    codec_test::expect_exact_seams(path);
    std::remove(path.c_str());
}

TEST(Mp4, CarriesLayerThree) {
    // Of a mono stream the bare source drops nothing and averages nothing.
    EXPECT_EQ(read_all(fixture("layer3.mp4")), read_all(fixture("mono.mp3")));
    codec_test::expect_exact_seams(fixture("layer3.mp4"));
    // Nothing is dropped at the start of a stereo track either.
    EXPECT_EQ(read_all(fixture("stereo3.mp4")).size(), read_all(fixture("cbr.mp3")).size() + 529);
    codec_test::expect_exact_seams(fixture("stereo3.mp4"));
}

// The table lists frames that the file is too short for: they do not count.
TEST(Mp4, CountsWhatACutFileHolds) {
    const samples plain = read_all(fixture("first.m4a"));
    bytes file = load(fixture("first.m4a"));
    file.resize(file.size() * 2 / 3);
    const std::string path = save("cut.m4a", file);
    const samples got = read_all(path);
    ASSERT_GT(got.size(), plain.size() / 2);
    ASSERT_LT(got.size(), plain.size() * 3 / 4);
    EXPECT_EQ(got.size() % kFrame, 0U);
    EXPECT_TRUE(std::equal(got.begin(), got.begin() + 256 * kFrame, plain.begin()));
    codec_test::expect_exact_seams(path);
    // The table itself is lost.
    bytes last = load(fixture("last.m4a"));
    last.resize(last.size() * 2 / 3);
    EXPECT_EQ(error_of(save("cut.m4a", last)), -7);
}

TEST(Mp4, ConcealsDamagedFrames) {
    const samples plain = read_all(fixture("first.m4a"));
    bytes file = load(fixture("first.m4a"));
    const size_t from = find(file, "mdat") + 60000;
    std::fill_n(file.begin() + static_cast<ptrdiff_t>(from), 20000, uint8_t{0});
    const std::string path = save("damaged.m4a", file);
    const samples got = read_all(path);
    ASSERT_EQ(got.size(), plain.size());
    EXPECT_TRUE(std::equal(got.begin(), got.begin() + 150 * kFrame, plain.begin()));
    EXPECT_TRUE(std::equal(got.begin() + 300 * kFrame, got.end(), plain.begin() + 300 * kFrame));
    EXPECT_TRUE(std::any_of(got.begin() + 180 * kFrame, got.begin() + 190 * kFrame,
                            [](int16_t s) { return s == 0; }));
    codec_test::expect_exact_seams(path);
}

TEST(Mp4, RefusesOtherCodecsAndSilentFiles) {
    EXPECT_EQ(error_of(fixture("alac.m4a")), -3);
    EXPECT_EQ(error_of(fixture("silent.mp4")), -7);
}

TEST(Mp4, DurationIsTheTracks) {
    direct file(fixture("video.mp4"));
    ASSERT_NE(file.reader, nullptr);
    EXPECT_EQ(file.info.duration * 44100 / kUnits,
              static_cast<int64_t>(read_all(fixture("low.aac")).size()));
}

}  // namespace
