#include <algorithm>
#include <cstdlib>

#include "tests/platform/aac_streams.h"

namespace codec_test {
namespace {

constexpr size_t kFrame = 1024;

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
    const std::string command =
        "ffmpeg -nostdin -v error -y -i " + adts + " -c copy -bsf:a aac_adtstoasc -f mp4 " + path;
    ASSERT_EQ(std::system(command.c_str()), 0);
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

// Where the bare source drops the start of a stereo stream.
TEST(Mp4, DropsNothingOfLayerThree) {
    EXPECT_EQ(read_all(fixture("stereo3.mp4")).size(), read_all(fixture("cbr.mp3")).size() + 529);
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
