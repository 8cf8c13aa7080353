#include "tests/support/song.h"

#include <algorithm>
#include <cmath>

#include "tests/support/bytes.h"

namespace support {
namespace {

constexpr double kTwoPi = 6.283185307179586;
constexpr double kHitSeconds = 0.25;   // length of a hit: a burst of noise and a low tone
constexpr double kNoiseDecay = 0.008;  // seconds
constexpr double kKickDecay = 0.06;    // seconds
constexpr double kKickHz = 62.0;
constexpr double kFirstHit = 0.5;   // seconds
constexpr double kQuietGain = 0.2;  // outside the loud section
constexpr double kChordBeats = 16.0;
constexpr double kOtherChannels = 0.8;  // level of the bed relative to the first channel
constexpr double kFloor = 0.0008;       // level of the noise floor, which avoids digital silence
// The loud section starts with an accent of the bed and then swells. Otherwise a loudness curve of
// overlapping windows would have several equally steep steps near its start.
constexpr double kAccentSeconds = 0.3;
constexpr double kAccent = 1.35;
constexpr double kSwellSeconds = 4.0;
constexpr double kSwell = 0.15;
// Each chord consists of the second, third and fourth harmonics of its root, so the bed's spectrum
// keeps its shape.
constexpr double kRootHz[4] = {110.0, 123.47, 98.0, 130.81};

// Returns the random numbers for one part of the song.
std::mt19937 numbers_for(const song_spec &plan, uint32_t part) {
    return std::mt19937(1000 * plan.seed + part);
}

double gain_at(const song_spec &plan, double t) {
    if (t < plan.loud_at || t >= plan.tail_at) return kQuietGain;
    const double rest = plan.loud_at > 0.0 ? 1.0 - (t - plan.loud_at) / kSwellSeconds : 0.0;
    return 1.0 - kSwell * std::fmax(rest, 0.0);
}

double bed_gain_at(const song_spec &plan, double t) {
    const bool accent =
        plan.loud_at > 0.0 && t >= plan.loud_at && t < plan.loud_at + kAccentSeconds;
    return gain_at(plan, t) * (accent ? kAccent : 1.0);
}

// Adds the bed. Saturation gives the bed the loudness-to-peak ratio of recorded music.
void add_bed(const song_spec &plan, int32_t channel, std::vector<double> &out) {
    std::mt19937 random = numbers_for(plan, 100);
    double phase = uniform(&random) * kTwoPi;
    const double offset[2] = {uniform(&random) * kTwoPi, uniform(&random) * kTwoPi};
    std::mt19937 floor = numbers_for(plan, 200 + static_cast<uint32_t>(channel));
    const double level = plan.bed_level * (channel == 0 ? 1.0 : kOtherChannels);
    const double chord_seconds = kChordBeats * 60.0 / plan.bpm;
    for (size_t i = 0; i < out.size(); ++i) {
        const double t = static_cast<double>(i) / plan.rate;
        // Chords change on a hit. Adding a cycle of four chords keeps the index positive.
        const double chord = (t - kFirstHit) / chord_seconds + 4.0;
        phase += kTwoPi * kRootHz[static_cast<size_t>(std::fmax(chord, 0.0)) % 4] / plan.rate;
        const double sum = std::sin(2.0 * phase) + std::sin(3.0 * phase + offset[0]) +
                           std::sin(4.0 * phase + offset[1]);
        out[i] += level * bed_gain_at(plan, t) * std::tanh(sum) + kFloor * uniform(&floor);
    }
}

// Adds a hit that starts at the sample nearest to `t` seconds. Its strength is near 1.
void add_hit(const song_spec &plan, double t, double strength, std::mt19937 *random,
             std::vector<double> &out) {
    const size_t first = static_cast<size_t>(std::llround(t * plan.rate));
    const size_t length = static_cast<size_t>(kHitSeconds * plan.rate);
    const double level = plan.drum_level * strength * gain_at(plan, t);
    for (size_t i = 0; i < length; ++i) {
        const double dt = static_cast<double>(i) / plan.rate;
        const double burst = uniform(random) * std::exp(-dt / kNoiseDecay);
        const double kick = std::sin(kTwoPi * kKickHz * dt) * std::exp(-dt / kKickDecay);
        if (first + i < out.size()) out[first + i] += level * (0.8 * burst + 0.7 * kick);
    }
}

int16_t to_sample(double value) {
    return static_cast<int16_t>(std::clamp(std::floor(value * 32767.0 + 0.5), -32768.0, 32767.0));
}

}  // namespace

song make_song(const song_spec &plan) {
    song result;
    result.plan = plan;
    const size_t frames = static_cast<size_t>(std::llround(plan.seconds * plan.rate));
    const size_t channels = static_cast<size_t>(plan.channels);
    for (double t = kFirstHit; t < plan.seconds;) {
        result.hits.push_back(t);
        t = kFirstHit + static_cast<double>(result.hits.size()) * 60.0 / plan.bpm;
    }

    std::vector<double> drums(frames, 0.0);
    std::mt19937 strengths = numbers_for(plan, 1), bursts = numbers_for(plan, 2);
    for (double t : result.hits) add_hit(plan, t, 1.0 + 0.15 * uniform(&strengths), &bursts, drums);

    result.pcm.resize(frames * channels);
    for (size_t c = 0; c < channels; ++c) {
        std::vector<double> mix = drums;
        add_bed(plan, static_cast<int32_t>(c), mix);
        for (size_t i = 0; i < frames; ++i) result.pcm[i * channels + c] = to_sample(mix[i]);
    }
    return result;
}

std::string wav_bytes(const std::vector<int16_t> &pcm, int32_t rate, int32_t channels) {
    std::string out;
    const auto put = [&out](const char *name, std::initializer_list<size_t> numbers) {
        out += name;
        for (const size_t number : numbers) {  // 32 bits, little-endian
            for (int i = 0; i < 4; ++i) out += static_cast<char>(number >> 8 * i);
        }
    };
    const size_t bytes = 2 * pcm.size();
    const auto hz = static_cast<size_t>(rate), count = static_cast<size_t>(channels);
    put("RIFF", {bytes + 36});
    put("WAVEfmt ", {16, 1 | count << 16, hz, hz * 2 * count, 2 * count | 16 << 16});
    put("data", {bytes});
    return out.append(reinterpret_cast<const char *>(pcm.data()), bytes);
}

bool write_wav(const std::string &path, const song &source) {
    std::ofstream file(path, std::ios::binary);
    file << wav_bytes(source.pcm, source.plan.rate, source.plan.channels) << std::flush;
    return file.good();
}

}  // namespace support
