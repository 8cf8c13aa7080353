#include <gtest/gtest.h>

#include <algorithm>

#include "beat/click_track.h"
#include "tests/beat/beat_fixture.h"

namespace {

constexpr size_t kBlip = 1102;  // samples, 100 ms

std::vector<float> track_of(const std::vector<float> &beats, int64_t n) {
    std::vector<float> track(static_cast<size_t>(n));
    makeBlipTrack(beats.data(), static_cast<int32_t>(beats.size()), 11025, n, track.data());
    return track;
}

}  // namespace

// i e^(-i/110) cos(2 pi 4000 i / 11025) / 160, at the sample nearest to 11025.44.
TEST(ClickTrack, Blip) {
    const std::vector<float> track = track_of({1000.04f}, 20000);
    EXPECT_EQ(track[11025], 0.0f);
    EXPECT_NEAR(track[11026], -0.0040316, 1e-6);
    EXPECT_NEAR(track[11027], -0.0018710, 2e-6);
    EXPECT_NEAR(*std::max_element(track.begin(), track.end()), 0.253, 0.002);
    EXPECT_NE(track[11024 + kBlip], 0.0f);
    EXPECT_EQ(std::count(track.begin() + 11025 + kBlip, track.end(), 0.0f), 20000 - 11025 - 1102);
}

// 100 ms are 1102.5 samples, which round to 1103. A blip cut short ends one sample before the end;
// beats at the end or past it add nothing. 150 ms are 1653.75: a second blip ends the first. A
// tenth of a millisecond before the start is 1.1 samples, with the half that rounds 0.6 of one,
// which truncation takes to 0; two tenths lie a whole sample before it.
TEST(ClickTrack, Places) {
    struct piece {
        size_t at, length;  // of the blip, from its start on
    };
    const struct {
        std::vector<float> beats;
        int64_t n;
        std::vector<piece> pieces;
    } cases[] = {{{100}, 1103 + kBlip, {{1103, kBlip}}},
                 {{100}, 1102 + kBlip, {{1103, kBlip - 2}}},
                 {{100}, 1105, {{1103, 1}}},
                 {{100, 200, 1e9f}, 1104, {}},
                 {{100}, 1103, {}},
                 {{100}, 1000, {}},
                 {{100}, 0, {}},
                 {{100, 150}, 5000, {{1103, 551}, {1654, kBlip}}},
                 {{-0.1f}, 5000, {{0, kBlip}}},
                 {{-0.2f}, 5000, {}}};
    const std::vector<float> blip = track_of({0.0f}, 2000);
    for (const auto &c : cases) {
        std::vector<float> expected(static_cast<size_t>(c.n));
        for (const piece &p : c.pieces) {
            std::copy_n(blip.begin(), p.length, expected.begin() + static_cast<long>(p.at));
        }
        EXPECT_EQ(track_of(c.beats, c.n), expected) << c.beats[0] << " ms in " << c.n;
    }
}
