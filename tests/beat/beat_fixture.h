// A beat analysis set up by hand, and signals for it.
#ifndef TAVO_TESTS_BEAT_BEAT_FIXTURE_H
#define TAVO_TESTS_BEAT_BEAT_FIXTURE_H

#include <cmath>
#include <cstdlib>
#include <cstring>
#include <random>
#include <vector>

#include "beat/beat_ctx.h"
#include "beat/beats.h"
#include "common/tavo_ctx.h"

constexpr double kHop = 256.0 / 11025.0;  // seconds

// An instance whose analysis signal is filled, in state 2 as inside a job. No click track.
struct analysis {
    TAVO_CTX ctx = {};
    std::vector<double> ana;

    explicit analysis(std::vector<double> samples) : ana(std::move(samples)) {
        fnamedec = "";
        ctx.ana = ana.data();
        ctx.ana_len = static_cast<int64_t>(ana.size());
        ctx.ana_rate = kAnalysisRate;
        ctx.state = kStateRunning;
        ctx.onset = static_cast<TAVO_ONSET_CTX *>(calloc(1, sizeof(TAVO_ONSET_CTX)));
        ctx.onset->frame_size = kFrameSize;
        ctx.onset->hop_size = kHopSize;
        ctx.onset->bpm = -7;  // not touched yet
    }
    analysis(const analysis &) = delete;
    ~analysis() { clearOnsetCtx(ctx.onset); }

    std::vector<float> beats() const {
        return {ctx.onset->beat_times, ctx.onset->beat_times + ctx.onset->beat_count};
    }
};

// The working context of a signal, with the lock and condition.
struct working_context {
    analysis of;
    TAVO_BEAT_CTX beat = {};

    explicit working_context(std::vector<double> samples) : of(std::move(samples)) {
        __beat_init(&of.ctx, &beat);
    }
    // A silent signal of exactly that many frames, to be given an envelope by hand.
    explicit working_context(int64_t frames)
        : working_context(std::vector<double>(static_cast<size_t>(256 * (frames - 1) + 512))) {}
    ~working_context() { __tavo_deinit(&beat); }
};

inline double uniform(std::mt19937 *random) {
    return static_cast<double>((*random)()) / 2147483648.0 - 1.0;
}

// Between -1 and 1; or of any size up to 2^highest; or mostly, or but for its signs, nothing; or
// too small to have its full precision.
inline std::vector<double> wild_samples(size_t n, int highest, std::mt19937 *random) {
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

inline bool same_bits(const std::vector<double> &a, const std::vector<double> &b) {
    return a.size() == b.size() && memcmp(a.data(), b.data(), a.size() * sizeof(double)) == 0;
}

#endif
