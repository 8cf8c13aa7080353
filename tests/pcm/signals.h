// Bytes and samples to decode and to convert, and what the converter makes of them.
#ifndef TAVO_TESTS_PCM_SIGNALS_H
#define TAVO_TESTS_PCM_SIGNALS_H

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <random>
#include <vector>

#include "pcm/resample.h"

using byte_run = std::vector<uint8_t>;

// Bytes among which no 200 in a row occur twice.
inline byte_run noise(int64_t bytes, uint32_t seed) {
    byte_run run(static_cast<size_t>(bytes));
    std::mt19937 random(seed);
    for (auto &value : run) value = static_cast<uint8_t>(random() >> 11);
    return run;
}

inline byte_run slice(const byte_run &run, int64_t first, int64_t end) {
    return {run.begin() + first, run.begin() + end};
}

inline byte_run operator+(byte_run left, const byte_run &right) {
    left.insert(left.end(), right.begin(), right.end());
    return left;
}

inline std::vector<int16_t> samples_of(const byte_run &bytes) {
    std::vector<int16_t> samples(bytes.size() / 2);
    if (!samples.empty()) memcpy(samples.data(), bytes.data(), samples.size() * 2);
    return samples;
}

// The analysis signal of samples at a rate, with the 64 cleared bytes behind it checked.
inline std::vector<double> converted(const std::vector<int16_t> &samples, int32_t rate) {
    int64_t n = -1;
    double *out = nullptr;
    const auto bytes = static_cast<int64_t>(samples.size() * 2);
    EXPECT_EQ(dorn_resampler_run(samples.data(), bytes, rate, 11025, &n, &out), 0);
    for (int64_t i = n; i < n + 8; ++i) EXPECT_EQ(out[i], 0.0);
    EXPECT_TRUE(ext_mutex_resample == nullptr && ext_cond_resample == nullptr);
    const std::vector<double> result(out, out + n);
    free(out);
    return result;
}

#endif
