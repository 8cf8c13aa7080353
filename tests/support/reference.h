// Plain forms of what the library evaluates in a faster way: written from the definition, in its
// precisions and orders.
#ifndef TAVO_TESTS_SUPPORT_REFERENCE_H
#define TAVO_TESTS_SUPPORT_REFERENCE_H

#include <algorithm>
#include <cmath>
#include <vector>

#include "pcm/resample.h"

namespace reference {

// The windowed-sinc converter. Returns the samples written to out, -1 for a phase out of range.
inline int64_t convert(const dorn_resampler_state &s, const std::vector<int16_t> &in,
                       std::vector<int16_t> *out) {
    const auto len = static_cast<int64_t>(in.size());
    const float h = static_cast<float>(s.taps) / 2;
    for (int64_t j = 0;; ++j) {
        const float pos = s.ratio * static_cast<float>(j);
        const auto i0 = static_cast<int64_t>(std::floor(pos));
        if (static_cast<int64_t>((h + static_cast<float>(i0)) * static_cast<float>(s.channels)) >=
            len) {
            return j * s.channels;
        }
        const double centre = static_cast<double>(i0) + (s.taps % 2 == 1 ? 0.5 : 0.0);
        const auto frac = static_cast<float>(static_cast<double>(pos) - centre);
        if (std::fabs(frac) > 0.500001) return -1;
        const auto p =
            static_cast<int64_t>(std::floor(960.0 * static_cast<double>(frac) + 480.0 + 0.5));
        for (int64_t c = 0; c < s.channels; ++c) {
            float acc = 0.0f;
            for (int64_t k = 0; k <= s.taps; ++k) {
                const int64_t at = (i0 - static_cast<int64_t>(h) + k) * s.channels + c;
                const int16_t x = at < 0 || at >= len ? int16_t{0} : in[static_cast<size_t>(at)];
                acc += s.coef[p][k] * static_cast<float>(x);
            }
            const auto value = static_cast<int64_t>(std::floor(static_cast<double>(acc) + 0.5));
            out->push_back(static_cast<int16_t>(static_cast<uint16_t>(value & 0xFFFF)));
        }
    }
}

// 10 log10(mean square + 1) of the window samples at pcm, full scale 1.
inline float power(const int16_t *pcm, int64_t window) {
    double sum = 0.0;
    for (int64_t i = 0; i < window; ++i) sum += (pcm[i] / 32767.0) * (pcm[i] / 32767.0);
    return 10.0f * std::log10(static_cast<float>(sum / static_cast<double>(window)) + 1.0f);
}

// The 97th percentile of count values from start on.
inline double percentile(const std::vector<double> &env, int64_t start, int64_t count) {
    std::vector<double> window(env.begin() + start, env.begin() + start + count);
    std::sort(window.begin(), window.end());
    return window[static_cast<size_t>(count * 97 / 100)];
}

// The threshold curve of an envelope, each place by itself.
inline std::vector<double> threshold(const std::vector<double> &env, int64_t window) {
    const auto frames = static_cast<int64_t>(env.size());
    const int64_t count = frames - 1;
    const int64_t half = window / 2;
    std::vector<double> thr(static_cast<size_t>(count));
    if (count < 1) return thr;
    const auto at = [&](int64_t i) -> double & { return thr[static_cast<size_t>(i)]; };
    double top = 0.0;
    for (int64_t i = half; i <= std::max(half, count - half) && count - window >= -3; ++i) {
        at(i) = percentile(env, i - half, std::min(window, frames - (i - half)));
        top = std::max(top, at(i));
    }
    const int64_t tail = std::max<int64_t>(count - half, 1);
    const double slope = (top - at(tail - 1)) / (static_cast<double>(window) * 0.5);
    for (int64_t i = tail; i < count; ++i) at(i) = top - slope * static_cast<double>(count - i);
    for (int64_t i = 21; i < std::min(half, count); ++i) {
        at(i) = percentile(env, i - 21, std::min<int64_t>(43, frames - (i - 21)));
    }
    return thr;
}

// The loudest level of each half second, dB, and in *db that of every sample.
inline std::vector<double> block_levels(const std::vector<double> &signal,
                                        std::vector<double> *db) {
    constexpr int64_t kBlock = 5512;
    const auto n = static_cast<int64_t>(signal.size());
    std::vector<double> block(static_cast<size_t>(n / kBlock + 1), -150.0);
    db->assign(signal.size(), -150.0);
    int32_t held = 0;
    double loudest = -150.0;
    for (int64_t i = 5; i <= n - 5; ++i) {
        double sum = 0.0;
        for (int64_t k = i - 5; k < i + 5; ++k)
            sum += signal[static_cast<size_t>(k)] * signal[static_cast<size_t>(k)];
        const double mean = sum / 10.0 * 32767.0;
        const int32_t value = mean > 0.0 ? static_cast<int32_t>(std::min(mean, 32767.0)) : 0;
        const int32_t level = std::max(value, held);
        held = level - level / 1000;
        double &here = (*db)[static_cast<size_t>(i)];
        here = 20.0 * std::log10(std::max(level, 1000) / 32767.0);
        loudest = std::max(loudest, here);
        if (i % kBlock != 0) continue;
        here = block[static_cast<size_t>(i / kBlock)] = loudest;
        loudest = -150.0;
    }
    return block;
}

// The samples at which a power rise starts, with the level of every sample at hand.
inline std::vector<int32_t> rises(const std::vector<double> &signal) {
    constexpr int64_t kBlock = 5512;
    std::vector<int32_t> flags(signal.size());
    std::vector<double> db;
    std::vector<double> block = block_levels(signal, &db);
    const auto count = static_cast<int64_t>(block.size());
    if (count < 3) return flags;
    block.resize(block.size() + 8, -150.0);
    std::vector<double> sorted(block.begin(), block.end() - 8);
    std::sort(sorted.begin(), sorted.end());
    const double p60 = sorted[static_cast<size_t>(static_cast<double>(count) * 0.6)];
    const double p40 = sorted[static_cast<size_t>(static_cast<double>(count) * 0.4)];
    for (int64_t b = 2; b < count; ++b) {
        const double *at = &block[static_cast<size_t>(b)];
        double mean = 0.0;
        for (int k = 0; k < 8; ++k) mean += at[k];
        mean *= 0.125;
        const double limit = std::min((p60 + p40) * 0.5, mean - 4.0);
        if (!(at[-2] < limit && at[-1] < limit && mean >= p60 - 3.0 && at[0] > p60 - 3.0)) continue;
        const auto begin = db.begin() + kBlock * (b - 1);
        const auto found = std::find_if(begin, begin + kBlock + 1, [&](double level) {
            return level >= (mean + 3.0 * p60) * 0.5;
        });
        if (found == begin + kBlock + 1) continue;
        flags[static_cast<size_t>(found - db.begin())] = 1;
        b += 6;  // and the loop's own step
    }
    return flags;
}

}  // namespace reference

#endif
