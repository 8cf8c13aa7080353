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

inline std::vector<double> noise(size_t n, double amplitude, uint32_t seed = 1) {
    std::mt19937 random(seed);
    std::vector<double> signal(n);
    for (double &x : signal) x = amplitude * (static_cast<double>(random()) / 2147483648.0 - 1.0);
    return signal;
}

// The samples at which the drum of drum_song is hit.
inline std::vector<size_t> drum_hits(double bpm, double seconds) {
    std::vector<size_t> hits;
    for (double t = 0.25; t + 0.2 < seconds; t += 60.0 / bpm) {
        hits.push_back(static_cast<size_t>(t * kAnalysisRate));
    }
    return hits;
}

// Struck bells, each heard until the next, no two equally loud. They fade ever more slowly and in
// all bands alike, so that the envelope has its peaks at the hits alone.
inline std::vector<double> drum_song(double bpm, double seconds) {
    std::vector<double> song(static_cast<size_t>(seconds * kAnalysisRate));
    std::vector<size_t> hits = drum_hits(bpm, seconds);
    hits.push_back(song.size());
    std::mt19937 random(4);
    for (size_t k = 0; k + 1 < hits.size(); ++k) {
        const double loudness = 1000.0 + 1000.0 * (static_cast<double>(random()) / 4294967296.0);
        for (size_t i = hits[k]; i < hits[k + 1]; ++i) {
            const double t = static_cast<double>(i - hits[k]) / kAnalysisRate;
            double bell = 0.0;
            for (double hz = 150.0; hz < 5500.0; hz += 250.0)
                bell += cos(6.283185307179586 * hz * t);
            song[i] = loudness * bell / (1.0 + t / 0.1);
        }
    }
    return song;
}

// Ten seconds of a quiet drum, then fourteen of a loud one with hiss.
inline std::vector<double> rising_song() {
    std::vector<double> song = drum_song(120, 24);
    const std::vector<double> hiss = noise(song.size(), 16000.0, 9);
    for (size_t i = 0; i < song.size(); ++i) {
        song[i] = i < 10 * 11025 ? 0.05 * song[i] : song[i] + hiss[i];
    }
    return song;
}

#endif
