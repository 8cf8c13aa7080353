// Fuzzes the stages of the analysis: checks properties of the results and compares some of them
// with plain implementations. No thread can be started, so the calling thread does all the work.
#include <pthread.h>

#include <cerrno>
#include <cmath>
#include <memory>
#include <numeric>

#include "beat/candidates.h"
#include "beat/gap_fill.h"
#include "beat/tempo.h"
#include "fuzz/fuzz.h"
#include "highlight/region.h"
#include "highlight/search.h"
#include "pcm/resample.h"
#include "tests/beat/beat_fixture.h"

extern "C" int __wrap_pthread_create(pthread_t *, const pthread_attr_t *, void *(*)(void *),
                                     void *);
extern "C" int __wrap_pthread_create(pthread_t * /*thread*/, const pthread_attr_t * /*attr*/,
                                     void *(* /*entry*/)(void *), void * /*argument*/) {
    return EAGAIN;
}

namespace {

using fuzz::must;

constexpr size_t kMaxPoints = 400;

std::vector<int16_t> read_pcm(fuzz::input *in, size_t max_samples) {
    std::vector<int16_t> pcm(std::min(in->remaining_bytes() / 2, max_samples));
    if (!pcm.empty()) in->ConsumeData(pcm.data(), 2 * pcm.size());
    return pcm;
}

// --- Stage 3: conversion

int32_t choose_rate(fuzz::input *in) {
    return in->ConsumeBool() ? in->ConsumeIntegralInRange(1, 192'000)
                             : in->PickValueInArray({8000, 11025, 12000, 16000, 22050, 24000, 32000,
                                                     33075, 44100, 44099, 48000, 88200, 96000});
}

// A plain implementation of the windowed-sinc converter. Returns the number of samples appended to
// `out`, or -1 if a phase is out of range.
int64_t convert_by_definition(const dorn_resampler_state &s, const std::vector<int16_t> &in,
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

// Compares interpolations (up to three channels) and complete mono conversions with plain versions.
// A complete conversion outputs interpolated samples or block means, followed by zeros.
void convert(fuzz::input *in) {
    const auto state = std::make_unique<dorn_resampler_state>();
    const int32_t target = in->ConsumeBool() ? kAnalysisRate : choose_rate(in);
    const bool whole = in->ConsumeBool();
    const int32_t source = whole ? target * in->ConsumeIntegralInRange(1, 8) : choose_rate(in);
    const int32_t channels = in->ConsumeIntegralInRange(1, 3);
    const bool odd = in->ConsumeBool();  // the input has an extra byte
    const std::vector<int16_t> pcm = read_pcm(in, 2000);
    const auto count = static_cast<int64_t>(pcm.size());
    if (pcm.empty() || count * target / source > 8000) return;
    must(dorn_resampler_prepare(state.get(), source, target, channels) == 0, "rates are prepared");
    std::vector<int16_t> samples;
    const int64_t code = convert_by_definition(*state, pcm, &samples);
    std::vector<int16_t> out(std::max<size_t>(samples.size(), 1));
    // Samples outside the input must not affect the output.
    std::vector<int16_t> loud(pcm.size() + 200, INT16_MAX);
    std::copy(pcm.begin(), pcm.end(), loud.begin() + 100);
    must(dorn_resampler_convert(state.get(), &loud[100], static_cast<int32_t>(count), out.data()) ==
             code,
         "a conversion has its length or its error");
    must(std::equal(samples.begin(), samples.end(), out.begin()), "a conversion is its sums");
    if (channels > 1) return;

    const auto length = static_cast<size_t>(count * target / source);
    std::vector<double> wanted(samples.begin(), samples.end());
    wanted.resize(length);
    const auto block = static_cast<size_t>(source % target == 0 ? source / target : 0);
    for (size_t i = 0; block >= 1 && block <= 4 && i < length; ++i) {
        const float sum = std::accumulate(&pcm[i * block], &pcm[i * block] + block, 0.0f);
        wanted[i] = static_cast<double>(sum / static_cast<float>(block));
    }
    wanted.resize(length + 8);
    int64_t found = -1;
    double *output = nullptr;
    must(dorn_resampler_run(pcm.data(), 2 * count + odd, source, target, &found, &output) == 0 &&
             found == static_cast<int64_t>(length),
         "a conversion has its length");
    must(std::equal(wanted.begin(), wanted.end(), output), "a conversion is its samples and zeros");
    free(output);
}

// --- Stage 7: the highlight

// Returns `count` ascending positions below `n`, in a list of at least `capacity` entries.
std::vector<int32_t> choose_positions(fuzz::input *in, size_t count, size_t capacity, int32_t n) {
    std::vector<int32_t> list(count);
    for (int32_t &at : list) at = in->ConsumeIntegralInRange(0, n - 1);
    std::sort(list.begin(), list.end());
    list.resize(std::max(capacity, count));
    return list;
}

void select_region(fuzz::input *in) {
    const auto nv = in->ConsumeIntegralInRange(0, 15);
    const auto nseg = in->ConsumeIntegralInRange(0, 30);
    const int32_t length = in->ConsumeBool() ? in->ConsumeIntegral<uint8_t>()
                                             : in->ConsumeIntegralInRange(0, INT32_MAX / 2);
    const int32_t n = in->ConsumeIntegralInRange(1, static_cast<int32_t>(kMaxPoints));
    const int32_t chosen = in->ConsumeIntegralInRange(-1, n);
    const auto valleys = choose_positions(in, static_cast<size_t>(nv), 15, n);
    const auto pairs = choose_positions(in, static_cast<size_t>(2 * nseg), 0, n);
    const auto mean = in->ConsumeProbability<float>();
    const auto deviation = in->ConsumeProbability<float>();
    const auto curve = fuzz::padded_values<float>(in, static_cast<size_t>(n));
    const uint32_t start = tavo_select_highlight_region(
        curve.data(), n, length, chosen, nv, valleys.data(), pairs.data(), nseg, mean, deviation);
    must(start < static_cast<uint32_t>(n), "a region starts in the song");
    must(start == 0 || static_cast<int64_t>(start) + length <= n, "a region fits the song");
}

void search_curve(fuzz::input *in) {
    TAVO_HL_CTX hl = {};
    hl.hl_param =
        in->ConsumeBool() ? in->ConsumeIntegral<int8_t>() : in->ConsumeIntegral<int32_t>();
    const bool free_length = in->ConsumeBool();
    auto curve = fuzz::values<float>(in, kMaxPoints);
    const auto n = static_cast<int32_t>(curve.size());
    const int32_t duration = free_length ? in->ConsumeIntegral<int32_t>() : 2 * n + 4;
    hl.power = curve.data();
    hl.power_count = n;
    const uint32_t start = _get_HL_simple(&hl, duration);
    must(start % 2000 == 0 && start < 2000u * static_cast<uint32_t>(std::max(n, 1)),
         "a start is one of the points");
    const bool plain = std::all_of(curve.begin(), curve.end(),
                                   [](float x) { return x == 0.0f || (x > 1e-30f && x < 1e30f); });
    for (float &value : curve) value *= 0.25f;
    must(!plain || _get_HL_simple(&hl, duration) == start, "a start does not depend on the volume");
}

// --- Stages 4 to 6: beats

// Runs the tempo estimate, the threshold and the beat selection on an envelope that repeats `part`.
void find_beats(fuzz::input *in) {
    const int32_t limit = in->ConsumeIntegralInRange(-2, 40);
    const int32_t free_tempo = in->ConsumeBool() ? in->ConsumeIntegralInRange(30, 200) : 0;
    const auto repeats = in->ConsumeIntegralInRange<size_t>(1, 16);
    std::vector<int32_t> rises(in->ConsumeIntegralInRange<size_t>(0, 20));
    for (int32_t &rise : rises) rise = in->ConsumeIntegralInRange(0, 1200);
    const auto part = fuzz::values<double>(in, 1200);
    const size_t frames = 1 + std::min<size_t>(part.size() * repeats, 1200);

    working_context work(static_cast<int64_t>(frames));
    TAVO_BEAT_CTX *beat = &work.beat;
    TAVO_ONSET_CTX *onset = work.signal.ctx.onset;
    must(beat->signal != nullptr && beat->frame_count == static_cast<int64_t>(frames),
         "a context is complete");
    std::vector<double> env(frames);
    for (size_t k = 0; k + 1 < frames; ++k)
        env[k] = std::isfinite(part[k % part.size()]) ? part[k % part.size()] : 0.0;
    std::copy(env.begin(), env.end(), beat->onset_env);
    for (int32_t &rise : rises) rise %= static_cast<int32_t>(frames);
    std::sort(rises.begin(), rises.end());
    work.set_rises(rises);

    const int32_t bpm = estimate_tempo(beat);
    must(bpm >= 30 && bpm <= 200, "a tempo is 30 to 200");
    onset->max_beats = limit;
    onset->bpm = free_tempo != 0 ? free_tempo : bpm;
    std::vector<float> out(static_cast<size_t>(candidate_capacity(beat)));
    const int32_t count = getBeatCandi_MT(beat, onset, out.data());
    must(count >= 0 && (limit < 1 || count <= limit + kMaxAddedBeats), "beats are limited");
    must(std::is_sorted(out.begin(), out.begin() + count), "beats ascend");
    const float last = 1000.0f * beat->frame_times[0] * static_cast<float>(frames + 1);
    must(count == 0 || (out[0] > 0.0f && out[static_cast<size_t>(count) - 1] <= last),
         "beats are in the song");
    const auto four_beats = static_cast<float>(static_cast<int>(4.0 * 60.0 / onset->bpm));
    auto window = static_cast<size_t>(four_beats / beat->frame_times[0]);
    window += window % 2;
    for (size_t i = window / 2; i + window / 2 + 1 < frames; ++i) {
        std::vector<double> sorted(&env[i - window / 2], &env[i - window / 2] + window);
        std::sort(sorted.begin(), sorted.end());
        must(beat->threshold[i] == sorted[window * 97 / 100], "a threshold is a percentile");
    }
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    fuzz::run_one({convert, select_region, search_curve, find_beats}, data, size);
    return 0;
}
