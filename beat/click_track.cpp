#include "beat/click_track.h"

#include <cmath>

#include "beat/beat_ctx.h"
#include "dsp/fft.h"

extern "C" {
const char *fnamedec = "d:\\beattest\\__blips_0.wav";
}

namespace {

constexpr size_t kHeaderBytes = 44;
constexpr uint32_t kFileRate = kAnalysisRate;  // Hz
constexpr uint32_t kFileSampleBytes = 2;
constexpr double kBlipHz = 4000.0;
constexpr double kBlipScale = 160.0;  // scales the peak of the blip to about 0.25
constexpr float kBlipSeconds = 0.1f;
constexpr double kBlipGain = 2.5;
constexpr int32_t kChunk = 2048;  // samples per write

void put_u16(uint8_t *dst, uint32_t value) {
    dst[0] = static_cast<uint8_t>(value & 0xFF);
    dst[1] = static_cast<uint8_t>(value >> 8 & 0xFF);
}

void put_u32(uint8_t *dst, uint32_t value) {
    put_u16(dst, value & 0xFFFF);
    put_u16(dst + 2, value >> 16);
}

void put_tag(uint8_t *dst, const char *tag) {
    for (int32_t i = 0; i < 4; ++i) dst[i] = static_cast<uint8_t>(tag[i]);
}

int32_t blip_length(int32_t sr) {
    return sr > 0 ? static_cast<int32_t>(static_cast<float>(sr) * kBlipSeconds) : 0;
}

// Generates a 4 kHz tone that swells for a tenth of its length and then fades.
void make_blip(int32_t sr, int32_t length, float *blip) {
    const int32_t tenth = length / 10;
    const auto tau = static_cast<float>(tenth);
    for (int32_t i = 0; i < length; ++i) {
        const float decay = -static_cast<float>(i) / tau;  // single precision on purpose
        const double envelope = exp(static_cast<double>(decay)) * i;
        blip[i] = static_cast<float>(envelope * cos(i * kTwoPi / sr * kBlipHz) / kBlipScale);
    }
}

// Returns the index of the sample nearest to a beat (ms). Returns `n` if the beat is past the end
// of the track, or -1 if it is before the start.
int64_t beat_sample(float beat, int32_t sr, int64_t n) {
    const float samples = beat * static_cast<float>(sr) / 1000.0f;
    const double nearest = static_cast<double>(samples) + 0.5;
    if (!(nearest > -1.0)) return -1;
    return nearest < static_cast<double>(n) ? static_cast<int64_t>(nearest) : n;
}

// Copies the blip to each beat. A blip that would extend past the end of the track stops one sample
// short of the end, and later blips keep the shortened length.
void copy_blips(const float *blip, int64_t length, const float *beats, int32_t count, int32_t sr,
                int64_t n, float *track) {
    for (int32_t b = 0; b < count; ++b) {
        const int64_t start = beat_sample(beats[b], sr, n);
        if (start < 0) continue;
        if (n - start < length) length = n - start > 0 ? n - start - 1 : 0;
        for (int64_t i = 0; i < length; ++i) track[start + i] = blip[i];
    }
}

// Mixes a sample of the signal with a sample of the blip track. Returns the low 16 bits.
uint32_t mix_sample(double signal, float blip) {
    const double mixed = (signal * kFullScale + blip * kBlipGain * kFullScale) * 0.5;
    if (!(fabs(mixed) < INT32_MAX)) return 0;
    return static_cast<uint32_t>(static_cast<int32_t>(mixed)) & 0xFFFF;
}

void write_samples(const double *ana, const float *track, int64_t n, FILE *stream) {
    uint8_t bytes[kChunk * kFileSampleBytes];
    for (int64_t done = 0; done < n; done += kChunk) {
        const int64_t count = n - done < kChunk ? n - done : kChunk;
        for (int64_t i = 0; i < count; ++i) {
            put_u16(bytes + i * kFileSampleBytes,
                    mix_sample(ana[done + i] / kFullScale, track[done + i]));
        }
        fwrite(bytes, kFileSampleBytes, static_cast<size_t>(count), stream);
    }
}

}  // namespace

int32_t makeWaveHeader(uint32_t n, FILE *stream) {
    uint8_t header[kHeaderBytes];
    put_tag(header, "RIFF");
    put_u32(header + 4, kFileSampleBytes * n + 36);
    put_tag(header + 8, "WAVE");
    put_tag(header + 12, "fmt ");
    put_u32(header + 16, 16);  // size of the format chunk
    put_u16(header + 20, 1);   // integer PCM
    put_u16(header + 22, 1);   // channels
    put_u32(header + 24, kFileRate);
    put_u32(header + 28, kFileRate * kFileSampleBytes);
    put_u16(header + 32, kFileSampleBytes);
    put_u16(header + 34, 8 * kFileSampleBytes);
    put_tag(header + 36, "data");
    put_u32(header + 40, kFileSampleBytes * n);
    return static_cast<int32_t>(fwrite(header, kHeaderBytes, 1, stream));
}

void makeBlipTrack(const float *beats, int32_t count, int32_t sr, int64_t n, float *track) {
    const int32_t length = blip_length(sr);
    auto *blip = zeroed_items<float>(length);
    if (blip == nullptr) return;
    make_blip(sr, length, blip);
    copy_blips(blip, length, beats, count, sr, n, track);
    free(blip);
}

// Memory is allocated before the file is created so that running out of memory leaves no unfinished
// file. The blips are generated afterwards so that no time is wasted if the file cannot be created.
void write_click_track(const TAVO_CTX *ctx) {
    if (fnamedec == nullptr || fnamedec[0] == '\0') return;
    const int64_t n = analysis_length(ctx);
    const int32_t sr = ctx->ana_rate;
    const int32_t length = blip_length(sr);
    auto *blip = zeroed_items<float>(length);
    auto *track = zeroed_items<float>(n);
    FILE *stream = blip != nullptr && track != nullptr ? fopen(fnamedec, "wb") : nullptr;
    if (stream != nullptr) {
        make_blip(sr, length, blip);
        copy_blips(blip, length, ctx->onset->beat_times, ctx->onset->beat_count, sr, n, track);
        makeWaveHeader(static_cast<uint32_t>(n), stream);
        write_samples(ctx->ana, track, n, stream);
        fclose(stream);
    }
    free(blip);
    free(track);
}
