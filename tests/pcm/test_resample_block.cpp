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

// Runs one part on a thread of its own; what it gives for the range [first, end).
std::vector<double> part_of(const std::vector<int16_t> &in, float ratio, int64_t first,
                            int64_t end) {
    pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
    pthread_cond_t cond = PTHREAD_COND_INITIALIZER;
    int32_t done[4] = {1, 1, 0, 1};
    std::vector<double> out(static_cast<size_t>(end) + 1, -1.0);
    RESAMPLE_PART part = {};
    part.index = 2;
    part.in = in.data();
    part.out = out.data();
    part.ratio = ratio;
    part.first = first;
    part.end = end;
    part.in_count = static_cast<int64_t>(in.size());
    part.out_count = end;
    part.done = done;
    part.count = 4;
    part.mutex = &mutex;
    part.cond = &cond;
    EXPECT_EQ(pthread_create(&part.thread, nullptr, _resampleMT, &part), 0);
    pthread_join(part.thread, nullptr);
    EXPECT_EQ(done[2], 1);
    EXPECT_EQ(out.back(), -1.0);
    if (first > 0) {
        EXPECT_EQ(out[static_cast<size_t>(first) - 1], -1.0);
    }
    return {out.begin() + first, out.end() - 1};
}

TEST(resample_block, part_by_part) {
    const std::vector<int16_t> in = {10, 20, 30, 40, 50};
    EXPECT_EQ(part_of(in, 2.0F, 1, 2), std::vector<double>{35});
    EXPECT_TRUE(part_of(in, 2.0F, 2, 2).empty());
    // [4, 6) is cut to the last sample; [6, 8) lies beyond the end and takes it too.
    EXPECT_EQ(part_of(in, 2.0F, 0, 4), (std::vector<double>{15, 35, 50, 50}));
    // Blocks [0, 0) [0, 1) [1, 1) [1, 2) [2, 2): an empty one is the sample that it names.
    EXPECT_EQ(part_of(in, 0.5F, 0, 5), (std::vector<double>{10, 10, 20, 20, 30}));
    EXPECT_EQ(part_of({}, 1.0F, 0, 1), std::vector<double>{-1});
}

TEST(resample_block, positions_beyond_single_precision) {
    // Indexes 2^24 + 0, 1, 2, 3, 4 are + 0, 0, 2, 4, 4 as floats (ties go to the even one).
    constexpr int64_t kExact = 16'777'216;
    std::vector<int16_t> in(kExact + 8);
    for (int16_t i = 0; i < 8; ++i) in[static_cast<size_t>(kExact + i)] = i;
    // [0, 0) empty, [0, 2), [2, 4), [4, 4) empty
    EXPECT_EQ(part_of(in, 1.0F, kExact, kExact + 4), (std::vector<double>{0, 0.5, 2.5, 4}));
}

TEST(resample_block, short_and_odd_inputs) {
    EXPECT_TRUE(converted({}, 44100).empty());
    EXPECT_TRUE(converted({1, 2, 3}, 44100).empty());
    // Fewer outputs than threads, and a caller who has made no lock.
    const int16_t in[] = {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11};
    std::vector<double> few(4, -1.0);
    resamplePcmMonoMT(in, 12, 44100, few.data(), 3, 11025);
    EXPECT_EQ(few, (std::vector<double>{1.5, 5.5, 9.5, -1.0}));

    int64_t n = -1;
    double *out = nullptr;
    ASSERT_EQ(dorn_resampler_run(in + 7, 5, 11025, 11025, &n, &out), 0);  // 5 bytes: 2 samples
    EXPECT_EQ(std::vector<double>(out, out + 3), (std::vector<double>{7, 8, 0}));
    EXPECT_EQ(n, 2);
    free(out);
}

}  // namespace
