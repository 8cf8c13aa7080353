// Sets up a beat analysis of a given signal and generates test signals.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <tuple>
#include <vector>

#include "beat/beat_ctx.h"
#include "beat/beats.h"
#include "common/tavo_ctx.h"
#include "tests/support/bytes.h"

using support::uniform;

constexpr double kHop = 256.0 / 11025.0;  // seconds

// An instance in the state of a running job, with an analysis signal and without a click track.
struct analysis {
    TAVO_CTX ctx = {};
    std::vector<double> ana;

    explicit analysis(std::vector<double> samples, int32_t size = 512, int32_t hop = 256)
        : ana(std::move(samples)) {
        fnamedec = "";
        ctx.ana = ana.data();
        ctx.ana_len = static_cast<int64_t>(ana.size());
        ctx.ana_rate = kAnalysisRate;
        ctx.state = kStateRunning;
        ctx.onset = static_cast<TAVO_ONSET_CTX *>(calloc(1, sizeof(TAVO_ONSET_CTX)));
        ctx.onset->frame_size = size;
        ctx.onset->hop_size = hop;
        ctx.onset->bpm = -7;  // must be overwritten
    }
    analysis(const analysis &) = delete;
    ~analysis() { clearOnsetCtx(ctx.onset); }
};

// An initialised beat context for a silent signal of `frames` analysis frames.
struct working_context {
    analysis signal;
    TAVO_BEAT_CTX beat = {};

    explicit working_context(int64_t frames, int32_t size = 512, int32_t hop = 256)
        : signal(std::vector<double>(static_cast<size_t>(hop * (frames - 1) + size)), size, hop) {
        __beat_init(&signal.ctx, &beat);
    }
    ~working_context() { __tavo_deinit(&beat); }
    void set_rises(const std::vector<int32_t> &frames) {
        beat.rise_count = static_cast<int32_t>(frames.size());
        beat.rise_frames = zeroed_items<int32_t>(beat.rise_count);
        std::copy(frames.begin(), frames.end(), beat.rise_frames);
    }
};

// Returns random samples, all of one kind: values from -1 to 1, values of any magnitude below
// 2^highest, mostly zeros, denormal numbers, or zeros of both signs.
inline std::vector<double> extreme_samples(size_t n, int highest, std::mt19937 *random) {
    std::vector<double> samples(n);
    const auto kind = (*random)() % 5;
    for (double &x : samples) {
        x = uniform(random);
        if (kind == 1) x = std::ldexp(x, static_cast<int>((*random)() % 200) - 200 + highest);
        if (kind == 2) x = (*random)() % 3 == 0 ? x : 0.0;
        if (kind == 3) x = std::ldexp(x, -1074 + static_cast<int>((*random)() % 60));
        if (kind == 4) x = (*random)() % 2 == 0 ? 0.0 : -0.0;
    }
    return samples;
}
