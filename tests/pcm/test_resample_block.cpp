#include "tests/pcm/signals.h"

namespace {

TEST(resample_block, means_of_whole_blocks) {
    const std::vector<int16_t> samples = samples_of(noise(2006, 1));
    for (const int32_t ratio : {1, 2, 3, 4}) {
        SCOPED_TRACE(ratio);
        const std::vector<double> out = converted(samples, ratio * 11025);
        ASSERT_EQ(out.size(), samples.size() / static_cast<size_t>(ratio));
        for (size_t i = 0; i < out.size(); ++i) {
            int32_t sum = 0;  // at most 4 samples: exact in single precision
            for (int32_t k = 0; k < ratio; ++k) sum += samples[i * size_t(ratio) + size_t(k)];
            ASSERT_EQ(out[i], double(float(sum) / float(ratio))) << i;
        }
    }
}

TEST(resample_block, sums_and_quotients_are_single_precision) {
    // 32766.666015625: the spacing is 1/512 here
    EXPECT_EQ(converted({1, 0, 0, 32767, 32767, 32766}, 33075),
              (std::vector<double>{0.3333333432674407958984375, 32766.666015625}));
}

// The first n outputs at the ratio of two rates, of whatever input there is, by a caller who has
// made no lock.
std::vector<double> averaged(const std::vector<int16_t> &in, int32_t source, int32_t target,
                             size_t n) {
    std::vector<double> out(n + 1, -1.0);
    resamplePcmMonoMT(in.data(), static_cast<int64_t>(in.size()), source, out.data(),
                      static_cast<int64_t>(n), target);
    EXPECT_EQ(out.back(), -1.0);
    out.pop_back();
    return out;
}

TEST(resample_block, blocks_at_and_beyond_the_end) {
    const std::vector<int16_t> in = {10, 20, 30, 40, 50};
    // [4, 6) is cut to the last sample; [6, 8) lies beyond the end and takes it too.
    EXPECT_EQ(averaged(in, 2, 1, 4), (std::vector<double>{15, 35, 50, 50}));
    // Blocks [0, 0) [0, 1) [1, 1) [1, 2) [2, 2): an empty one is the sample that it names.
    EXPECT_EQ(averaged(in, 1, 2, 5), (std::vector<double>{10, 10, 20, 20, 30}));
    EXPECT_EQ(averaged(in, 2, 1, 2), (std::vector<double>{15, 35}));  // fewer than threads
    EXPECT_EQ(averaged({}, 1, 1, 1), std::vector<double>{-1});
}

TEST(resample_block, positions_beyond_single_precision) {
    // Indexes 2^24 + 0, 1, 2, 3, 4 are + 0, 0, 2, 4, 4 as floats (ties go to the even one).
    constexpr size_t kExact = 16'777'216;
    std::vector<int16_t> in(kExact + 8);
    for (int16_t i = 0; i < 8; ++i) in[kExact + static_cast<size_t>(i)] = i;
    const std::vector<double> out = averaged(in, 1, 1, kExact + 4);
    // [0, 0) empty, [0, 2), [2, 4), [4, 4) empty
    EXPECT_EQ(std::vector<double>(out.end() - 4, out.end()), (std::vector<double>{0, 0.5, 2.5, 4}));
}

TEST(resample_block, short_and_odd_inputs) {
    EXPECT_TRUE(converted({}, 44100).empty());
    EXPECT_TRUE(converted({1, 2, 3}, 44100).empty());
    const int16_t in[] = {7, 8, 9};
    int64_t n = -1;
    double *out = nullptr;
    ASSERT_EQ(dorn_resampler_run(in, 5, 11025, 11025, &n, &out), 0);  // 5 bytes: 2 samples
    EXPECT_EQ(std::vector<double>(out, out + 3), (std::vector<double>{7, 8, 0}));
    EXPECT_EQ(n, 2);
    free(out);
}

}  // namespace
