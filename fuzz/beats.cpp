// Stages 4 to 6: power rises, onset envelope, tempo, threshold, beats, gaps, click track.
//
// Input: a choice and limits, then an envelope or loudness values that are stretched to a signal.
// Guaranteed by the callers: a context as __beat_init makes it, frames of 512 samples every 256 at
// 11025 Hz, a tempo of 30 to 200, samples of 16 bits; an envelope may hold anything but infinities
// (silence makes it of values that are no numbers).
#include "beat/beats.h"

#include <algorithm>
#include <cmath>
#include <vector>

#include "beat/candidates.h"
#include "beat/click_track.h"
#include "beat/onset_envelope.h"
#include "beat/power_rise.h"
#include "beat/tempo.h"
#include "fuzz/fuzz.h"

namespace {

constexpr int64_t kMostFrames = 1200;
constexpr int64_t kMostSamples = 40'000;

struct analysis {
    TAVO_CTX ctx;
    TAVO_ONSET_CTX onset;
    TAVO_BEAT_CTX beat;
};

void start_analysis(analysis *run, std::vector<double> *signal) {
    run->onset.frame_size = kFrameSize;
    run->onset.hop_size = kHopSize;
    run->ctx.onset = &run->onset;
    run->ctx.ana = signal->data();
    run->ctx.ana_len = static_cast<int64_t>(signal->size());
    run->ctx.ana_rate = kAnalysisRate;
}

// The context of a song of so many frames, without its signal.
void start_frames(analysis *run, int64_t frames) {
    std::vector<double> none;
    start_analysis(run, &none);
    run->onset.frame_size = 2;  // no time is spent on bands
    __beat_init(&run->ctx, &run->beat);
    TAVO_BEAT_CTX *beat = &run->beat;
    fuzz::must(beat_ctx_ready(beat), "a context is made");
    beat->frame_count = frames;
    for (void *shorter :
         {static_cast<void *>(beat->frame_times), static_cast<void *>(beat->onset_env),
          static_cast<void *>(beat->threshold)}) {
        free(shorter);
    }
    beat->frame_times = zeroed_items<float>(frames);
    beat->onset_env = zeroed_items<double>(frames);
    beat->threshold = zeroed_items<double>(frames);
    const auto hop = static_cast<float>(beat->hop_seconds);
    for (int64_t k = 0; k < frames; ++k) beat->frame_times[k] = hop * static_cast<float>(k + 1);
}

void check_beats(const float *beats, int32_t count, int64_t frames) {
    const auto last = static_cast<float>(frames + 1) * (1000.0f * kHopSize / kAnalysisRate);
    for (int32_t k = 0; k < count; ++k) {
        fuzz::must(beats[k] > 0.0f && beats[k] <= last, "a beat lies in the song");
        fuzz::must(k == 0 || beats[k - 1] <= beats[k], "beats ascend");
    }
}

// From an envelope on: tempo, threshold, candidates, gaps.
void place_beats(fuzz::input *in) {
    analysis run = {};
    run.onset.max_beats = (in->take<uint8_t>() & 3) != 0 ? 0 : in->take_from(-2, 40);
    const bool free_tempo = (in->take<uint8_t>() & 1) != 0;
    const int32_t tempo = in->take_from(30, 200);
    const int32_t rises = in->take<uint8_t>() % 20;
    const int64_t repeats = 1 + in->take<uint8_t>() % 16;
    std::vector<int32_t> places(static_cast<size_t>(rises));
    for (int32_t &place : places) place = in->take<uint16_t>();
    std::vector<double> part(std::max<size_t>(1, in->left / 2));
    in->take_values(part.data(), part.size());
    const int64_t frames = 1 + std::min(static_cast<int64_t>(part.size()) * repeats, kMostFrames);

    start_frames(&run, frames);
    for (int64_t k = 0; k + 1 < frames; ++k) {
        const double value = part[static_cast<size_t>(k) % part.size()];
        run.beat.onset_env[k] = std::isinf(value) ? 0.0 : value;
    }
    for (int32_t &place : places) place = static_cast<int32_t>(place % frames);
    std::sort(places.begin(), places.end());
    run.beat.rise_frames = rises > 0 ? zeroed_items<int32_t>(rises) : nullptr;
    std::copy(places.begin(), places.end(), run.beat.rise_frames);
    run.beat.rise_count = rises;

    const int32_t bpm = estimate_tempo(&run.beat);
    fuzz::must(bpm >= 30 && bpm <= 200, "a tempo is 30 to 200");
    run.onset.bpm = free_tempo ? tempo : bpm;
    std::vector<float> out(static_cast<size_t>(candidate_room(&run.beat)));
    const int32_t count = getBeatCandi_MT(&run.beat, &run.onset, out.data());
    const int32_t limit = run.onset.max_beats;
    fuzz::must(count >= 0 && (limit < 1 || count <= limit + kMaxAddedBeats), "beats are limited");
    check_beats(out.data(), count, frames);
    __tavo_deinit(&run.beat);
}

// Loudness values, stretched; the frequency changes with them.
std::vector<double> take_signal(fuzz::input *in) {
    const int64_t stretch = 1 + in->take<uint16_t>() % 4000;
    const int64_t count = std::min<int64_t>(static_cast<int64_t>(in->left) * stretch, kMostSamples);
    std::vector<double> signal(static_cast<size_t>(count));
    uint8_t level = 0;
    uint32_t noise = 1;
    for (int64_t i = 0; i < count; ++i) {
        if (i % stretch == 0) level = in->take<uint8_t>();
        noise = noise * 1664525u + 1013904223u;
        const int32_t wave = level % 2 == 0 ? static_cast<int32_t>(noise >> 16) - 32768
                                            : (i % (2 + level % 32) < 1 ? 32767 : -32768);
        signal[static_cast<size_t>(i)] = wave / 256 * level;
    }
    return signal;
}

void find_rises(fuzz::input *in) {
    analysis run = {};
    std::vector<double> signal = take_signal(in);
    start_analysis(&run, &signal);
    __beat_init(&run.ctx, &run.beat);
    const int64_t n = run.ctx.ana_len;
    const int32_t rises = detectPowerVariation(run.beat.signal, run.beat.rise_flags, n);
    const auto flagged = std::count(run.beat.rise_flags, run.beat.rise_flags + n, 1);
    fuzz::must(rises >= 0 && rises == flagged, "each rise has its flag");
    fuzz::must(collect_rise_frames(&run.beat, n, kHopSize, rises) == 0, "rises are collected");
    fuzz::must(run.beat.rise_count == rises, "every rise is collected");
    __tavo_deinit(&run.beat);
}

void whole_analysis(fuzz::input *in) {
    analysis run = {};
    run.onset.max_beats = in->take<int8_t>();
    std::vector<double> signal = take_signal(in);
    start_analysis(&run, &signal);
    fnamedec = "";
    const int32_t count = getBeatPosition(&run.ctx);
    fuzz::must(count == run.onset.beat_count && run.ctx.state == kStateFinished,
               "it runs to its end");
    fuzz::must(run.onset.bpm >= 30 && run.onset.bpm <= 200, "a tempo is 30 to 200");
    check_beats(run.onset.beat_times, count, static_cast<int64_t>(signal.size()) / kHopSize);
    std::vector<float> track(signal.size());
    makeBlipTrack(run.onset.beat_times, count, kAnalysisRate, run.ctx.ana_len, track.data());
    free(run.onset.beat_times);
}

// Whatever beats there are, blips stay in the track.
void lay_blips(fuzz::input *in) {
    const int32_t rate = in->take_from(1, 192'000);
    std::vector<float> track(in->take<uint16_t>() % 30'000);
    std::vector<float> beats(std::min<size_t>(in->left / 4, 64));
    in->take_values(beats.data(), beats.size());
    makeBlipTrack(beats.data(), static_cast<int32_t>(beats.size()), rate,
                  static_cast<int64_t>(track.size()), track.data());
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    fuzz::input in = {data, size};
    const uint8_t which = in.take<uint8_t>();
    if (which >= 252) {
        whole_analysis(&in);
    } else if (which >= 248) {
        find_rises(&in);
    } else if (which >= 240) {
        lay_blips(&in);
    } else {
        place_beats(&in);
    }
    return 0;
}
