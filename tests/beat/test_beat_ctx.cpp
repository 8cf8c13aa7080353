#include <gtest/gtest.h>

#include "tests/beat/beat_fixture.h"

TEST(BeatCtx, FrameCount) {
    const struct {
        size_t samples;
        int64_t frames;
    } cases[] = {{0, -1},  {255, 0}, {256, 0}, {257, 1},    {511, 1},
                 {512, 1}, {767, 1}, {768, 2}, {11025, 42}, {1984500, 7750}};
    for (const auto &c : cases) {
        const working_context work(std::vector<double>(c.samples, 1.0));
        EXPECT_EQ(work.beat.frame_count, c.frames) << c.samples;
    }
}

TEST(BeatCtx, OneSecond) {
    std::vector<double> samples(11025);
    samples[3] = -32768.0;
    samples[11024] = 16383.5;
    working_context work(samples);
    const TAVO_BEAT_CTX &beat = work.beat;
    ASSERT_TRUE(feat_mutex_mt != nullptr && feat_cond_mt != nullptr);
    EXPECT_EQ(beat.frame_times[0], 0.02321995465f);
    EXPECT_EQ(beat.frame_times[41], 0.02321995465f * 42.0f);
    EXPECT_EQ(beat.signal[3], -32768.0 / 32767.0);
    EXPECT_EQ(beat.signal[11024], 0.5);
    for (int k = 0; k < 42; ++k) EXPECT_EQ(beat.onset_env[k], 0.0);
    for (int i = 0; i < 11025; ++i) ASSERT_EQ(beat.rise_flags[i], 0);
    EXPECT_EQ(beat.rise_frames, nullptr);

    __tavo_deinit(&work.beat);
    EXPECT_TRUE(feat_mutex_mt == nullptr && feat_cond_mt == nullptr);
    EXPECT_TRUE(beat.mel_matrix == nullptr && beat.onset_env == nullptr && beat.signal == nullptr);
    EXPECT_TRUE(beat.frame_times == nullptr && beat.threshold == nullptr);
    EXPECT_EQ(beat.rise_flags, nullptr);
}

class MelMatrix : public testing::Test {
 protected:
    std::vector<std::vector<float>> weight{256, std::vector<float>(36, 99.0f)};
    void SetUp() override {
        std::vector<float *> rows;
        for (auto &row : weight) rows.push_back(row.data());
        fft2melmtx(11025, 512, 5512, 36, rows.data());
    }
};

// 39.817379 mel in 37 steps of 71.743 Hz below 1 kHz; bins 21.533 Hz apart; a top of 2 / 143.486.
TEST_F(MelMatrix, LowestTriangle) {
    const float expected[] = {0.0f,       0.0041836f, 0.0083671f, 0.0125507f,
                              0.0111427f, 0.0069591f, 0.0027756f, 0.0f};
    for (size_t bin = 0; bin < 8; ++bin) EXPECT_NEAR(weight[bin][0], expected[bin], 1e-6) << bin;
    for (size_t bin = 8; bin < 256; ++bin) EXPECT_EQ(weight[bin][0], 0.0f);
}

TEST_F(MelMatrix, UnitAreaAndAtMostTwoBandsABin) {
    for (size_t band = 0; band < 36; ++band) {
        double area = 0.0;
        for (const auto &row : weight) area += row[band] * 11025.0 / 512.0;
        EXPECT_NEAR(area, 1.0, 0.03) << band;
    }
    for (const auto &row : weight) {
        int used = 0;
        for (const float w : row) used += w > 0.0f ? 1 : 0;
        EXPECT_LE(used, 2);
    }
}
