// Measures the time of each stage of a job, for a 3-minute stereo song at 120 BPM. The benchmarks
// whose names start with "mode 1" add up to a complete mode-1 job on a 44.1-kHz file.
#include <benchmark/benchmark.h>

#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "beat/beat_ctx.h"
#include "beat/beats.h"
#include "beat/candidates.h"
#include "beat/click_track.h"
#include "beat/onset_envelope.h"
#include "beat/power_rise.h"
#include "beat/tempo.h"
#include "highlight/position.h"
#include "pcm/decode.h"
#include "pcm/resample.h"
#include "tests/support/song.h"

namespace {

constexpr int32_t kMinuteFrames = 2584;  // hops in the one-minute excerpt that gives the tempo
constexpr int32_t kSecondMinute = 2583;  // first hop of the excerpt, if the song has two minutes
constexpr int32_t kTempoTransform = 4096;
constexpr int32_t kTempoLags = 86;

std::vector<int16_t> mono_song(int32_t rate) {
    support::song_spec plan;
    plan.seconds = 180.0;
    plan.channels = 1;
    plan.rate = rate;
    plan.loud_at = 60.0;
    plan.tail_at = 150.0;
    return support::make_song(plan).pcm;
}

const std::string &song_file() {
    static const std::string path = [] {
        support::song_spec plan;
        plan.seconds = 180.0;
        plan.loud_at = 60.0;
        plan.tail_at = 150.0;
        const std::string name = std::filesystem::temp_directory_path() / "tavo_bench.wav";
        if (!support::write_wav(name, support::make_song(plan))) std::abort();
        return name;
    }();
    return path;
}

void open_and_decode(benchmark::State &state) {
    const TAVO_PARAM param = {song_file().c_str(), TAVO_MODE_BEATS};
    for (auto _ : state) {
        int32_t err = 0;
        TAVO_CTX *ctx = tavo_init(&param, &err);
        if (ctx == nullptr) std::abort();
        benchmark::DoNotOptimize(DecodePcmMT(ctx, ctx->pcm, ctx->pcm_bytes));
        tavo_deinit(ctx);
    }
}

void convert(benchmark::State &state) {
    const auto rate = static_cast<int32_t>(state.range(0));
    const std::vector<int16_t> pcm = mono_song(rate);
    for (auto _ : state) {
        int64_t length = 0;
        double *out = nullptr;
        const auto bytes = static_cast<int64_t>(pcm.size() * sizeof(int16_t));
        if (dorn_resampler_run(pcm.data(), bytes, rate, kAnalysisRate, &length, &out) != 0) {
            std::abort();
        }
        free(out);
    }
}

void highlight(benchmark::State &state) {
    std::vector<int16_t> pcm = mono_song(44100);
    for (auto _ : state) {
        TAVO_HL_CTX *hl = static_cast<TAVO_HL_CTX *>(calloc(1, sizeof(TAVO_HL_CTX)));
        TAVO_CTX ctx{};
        ctx.pcm = pcm.data();
        ctx.pcm_bytes = static_cast<int64_t>(pcm.size() * sizeof(int16_t));
        ctx.fmt.sample_rate = 44100;
        ctx.duration = 180 * kUnitsPerSecond;
        ctx.hl = hl;
        benchmark::DoNotOptimize(getHLPosition(&ctx));
        clearHighlgihtCtx(hl);
    }
}

// The state of a beat analysis before the measured stage.
struct analysis {
    std::vector<double> ana;
    TAVO_ONSET_CTX onset{};
    TAVO_CTX ctx{};
    TAVO_BEAT_CTX beat{};
};

void open_analysis(analysis *a) {
    if (a->ana.empty()) {
        const std::vector<int16_t> pcm = mono_song(kAnalysisRate);
        a->ana.assign(pcm.begin(), pcm.end());
    }
    a->onset.frame_size = kFrameSize;
    a->onset.hop_size = kHopSize;
    a->onset.bpm = 120;
    a->ctx.ana = a->ana.data();
    a->ctx.ana_len = static_cast<int64_t>(a->ana.size());
    a->ctx.ana_rate = kAnalysisRate;
    a->ctx.onset = &a->onset;
    __beat_init(&a->ctx, &a->beat);
}

void close_analysis(analysis *a) {
    __tavo_deinit(&a->beat);
    a->beat = TAVO_BEAT_CTX{};
}

void beats(benchmark::State &state) {
    analysis a;
    open_analysis(&a);
    close_analysis(&a);
    for (auto _ : state) benchmark::DoNotOptimize(getBeatPosition(&a.ctx));
    free(a.onset.beat_times);
}

void power_rises(benchmark::State &state) {
    analysis a;
    open_analysis(&a);
    for (auto _ : state) {
        benchmark::DoNotOptimize(
            detectPowerVariation(a.beat.signal, a.beat.rise_flags, a.ctx.ana_len));
    }
    close_analysis(&a);
}

void onset_envelope(benchmark::State &state) {
    analysis a;
    open_analysis(&a);
    for (auto _ : state) _getOnsetEnvelope(&a.beat, kFrameSize, kHopSize);
    close_analysis(&a);
}

void tempo(benchmark::State &state) {
    analysis a;
    open_analysis(&a);
    _getOnsetEnvelope(&a.beat, kFrameSize, kHopSize);
    for (auto _ : state) {
        benchmark::DoNotOptimize(calc_bpm_acf(a.beat.onset_env + kSecondMinute, kTempoTransform,
                                              kTempoLags, kMinuteFrames, a.beat.hop_seconds));
    }
    close_analysis(&a);
}

void placement(benchmark::State &state) {
    analysis a;
    open_analysis(&a);
    _getOnsetEnvelope(&a.beat, kFrameSize, kHopSize);
    // Large enough for any result: one beat per analysis frame, plus every added beat.
    std::vector<float> beats(static_cast<size_t>(a.beat.frame_count) + 50);
    for (auto _ : state) {
        benchmark::DoNotOptimize(getBeatCandi_MT(&a.beat, &a.onset, beats.data()));
    }
    close_analysis(&a);
}

void click_track(benchmark::State &state) {
    const int64_t n = 180 * kAnalysisRate;
    std::vector<float> beats;
    for (int i = 0; i < 180; ++i) beats.push_back(1000.0F * static_cast<float>(i));
    for (auto _ : state) {
        std::vector<float> track(static_cast<size_t>(n));
        makeBlipTrack(beats.data(), static_cast<int32_t>(beats.size()), kAnalysisRate, n,
                      track.data());
        benchmark::DoNotOptimize(track.data());
    }
}

void add(const char *name, void (*stage)(benchmark::State &), int64_t arg = -1) {
    auto *entry = benchmark::RegisterBenchmark(name, stage);
    entry->Unit(benchmark::kMillisecond)->UseRealTime();
    if (arg >= 0) entry->Arg(arg);
}

}  // namespace

int main(int argc, char **argv) {
    fnamedec = "";
    add("mode 1: open and decode WAV", open_and_decode);
    add("mode 1: convert, block average from", convert, 44100);
    add("mode 1: beat analysis", beats);
    add("beats: power rises", power_rises);
    add("beats: onset envelope", onset_envelope);
    add("beats: tempo", tempo);
    add("beats: placement", placement);
    add("beats: blips of a click track", click_track);
    add("convert, windowed sinc from", convert, 48000);
    add("mode 0: highlight", highlight);
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    std::filesystem::remove(song_file());
    return 0;
}
