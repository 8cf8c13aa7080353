#include "cli/report/song_view.h"

#include <algorithm>
#include <array>
#include <climits>
#include <cmath>
#include <memory>
#include <nlohmann/json.hpp>
#include <numeric>

#include "cli/system.h"
#include "cli/write/file_names.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr int32_t kBlockSamples = 4096;
constexpr size_t kColumns = 4000;    // columns of the time axis: sharp when zoomed, about 30 KB
constexpr size_t kMostBins = 16384;  // several per column, for sharp edges
constexpr double kHopMs = int{TAVO_LOUDNESS_HOP_MS};
constexpr double kWindowMs = int{TAVO_LOUDNESS_WINDOW_MS};
constexpr size_t kWindowHops = TAVO_LOUDNESS_WINDOW_MS / TAVO_LOUDNESS_HOP_MS;

// The lowest and the highest sample of a span.
struct extent {
    int16_t low = INT16_MAX;
    int16_t high = INT16_MIN;
};

struct sound {
    int64_t samples_per_hop = 0;
    int64_t samples = 0;
    std::vector<extent> bins;  // equally long
    int64_t samples_per_bin = 1;
    int64_t bin_rest = 0;      // samples that the last bin still lacks
    std::vector<double> hops;  // sums of the squares of the samples
    int64_t hop_rest = 0;      // samples that the last hop still lacks
};

extent merged(const extent &a, const extent &b) {
    return {std::min(a.low, b.low), std::max(a.high, b.high)};
}

// Merges pairs of bins once there are too many. The length of a bin cannot be chosen in advance,
// because a file may state a wrong duration.
void halve_bins(sound &song) {
    for (size_t i = 0; i < kMostBins / 2; ++i) {
        song.bins[i] = merged(song.bins[2 * i], song.bins[2 * i + 1]);
    }
    song.bins.resize(kMostBins / 2);
    song.samples_per_bin *= 2;
}

void add_sample(sound &song, int16_t sample) {
    if (song.bin_rest == 0) {
        song.bins.emplace_back();
        song.bin_rest = song.samples_per_bin;
    }
    if (song.hop_rest == 0) {
        song.hops.push_back(0.0);
        song.hop_rest = song.samples_per_hop;
    }
    const double level = sample / 32767.0;
    song.bins.back() = merged(song.bins.back(), {sample, sample});
    song.hops.back() += level * level;
    ++song.samples;
    --song.hop_rest;
    if (--song.bin_rest == 0 && song.bins.size() == kMostBins) halve_bins(song);
}

failure read_samples(const std::string &path, int stop_fd, sound &song) {
    const mtsrc_param param{path.c_str()};
    int32_t code = 0;
    const std::unique_ptr<mtsrc_ctx, decltype(&mtsrc_deinit)> source(mtsrc_init(&param, &code),
                                                                     mtsrc_deinit);
    std::array<int16_t, kBlockSamples> block{};
    while (source != nullptr && code == TAVO_OK) {
        if (is_readable(stop_fd)) return {"The analysis was stopped."};
        mtsrc_frame frame = {block.data(), 0};
        code = mtsrc_getstream(source.get(), static_cast<int32_t>(sizeof block), &frame);
        if (code < 0) break;
        for (size_t i = 0; i < static_cast<size_t>(frame.size) / sizeof block[0]; ++i) {
            add_sample(song, block[i]);
        }
    }
    if (song.samples == 0) return {"The sound could not be read again for the page."};
    if (song.hop_rest > 0) song.hops.pop_back();  // incomplete
    return {};
}

// Returns the lowest and the highest sample of each column of a time axis, scaled to a peak of 127.
// A column covers every bin that it overlaps. The last column contains the last sample.
result_json wave_of(const sound &song, double axis_samples) {
    int peak = 1;
    for (const extent &bin : song.bins) peak = std::max({peak, -bin.low, +bin.high});
    const double bins_per_column =
        axis_samples / kColumns / static_cast<double>(song.samples_per_bin);
    result_json wave = result_json::array();
    for (size_t k = 0; k < kColumns; ++k) {
        const auto first = static_cast<size_t>(static_cast<double>(k) * bins_per_column);
        const auto end =
            static_cast<size_t>(std::ceil(static_cast<double>(k + 1) * bins_per_column));
        if (first >= song.bins.size()) break;
        extent column = song.bins[first];
        for (size_t i = first + 1; i < std::min(end, song.bins.size()); ++i) {
            column = merged(column, song.bins[i]);
        }
        wave.push_back(std::lround(column.low * (127.0 / peak)));
        wave.push_back(std::lround(column.high * (127.0 / peak)));
    }
    return wave;
}

// Returns the loudness curve, computed with the formula of tavo_get_loudness. A window consists of
// whole hops.
std::vector<float> loudness_of(const sound &song) {
    std::vector<float> values;
    const double samples = static_cast<double>(song.samples_per_hop) * kWindowHops;
    for (size_t i = 0; i + kWindowHops <= song.hops.size(); ++i) {
        const auto *first = song.hops.data() + i;
        const double sum = std::accumulate(first, first + kWindowHops, 0.0);
        values.push_back(static_cast<float>(10.0 * std::log10(sum / samples + 1.0)));
    }
    return values;
}

// Returns the start and the end, in ms, of the part of the song that is searched for a highlight.
// `count` is the number of loudness values.
result_json searched_span(const record &result, size_t count) {
    const bool is_short = result.duration_ms / 1000 < TAVO_SHORT_SONG_S;
    const int skip = is_short ? 0 : TAVO_SEARCH_SKIP;
    const int tail = is_short ? TAVO_SHORT_SEARCH_TAIL : TAVO_SEARCH_TAIL;
    const double start = skip * kHopMs;
    // The highlight may start late in the last window searched, so the span includes that window.
    const double last = static_cast<double>(count) - tail;
    const double end = last < 0.0 ? start : last * kHopMs + kWindowMs;
    return {player_ms(result, start), player_ms(result, std::max(start, end))};
}

void add_result(const record &result, result_json &view) {
    if (result.has_highlight) {
        view["hl_pos_ms"] = player_ms(result, result.hl_pos_ms);
        if (!view["loudness"].empty()) {
            view["searched_ms"] = searched_span(result, view["loudness"].size());
        }
        view["region_end_ms"] = player_ms(result, region_end_ms(result));
        if (result.length_s > 0) view["hl_end_ms"] = view["region_end_ms"];
        if (has_refinement(result)) view["hl_refined"] = is_refined(result);
    }
    if (!result.has_beats) return;
    view["bpm"] = result.bpm;
    view["beats_ms"] = result_json::array();
    for (const float beat : result.beats_ms) {
        view["beats_ms"].push_back(player_ms(result, static_cast<double>(beat)));
    }
}

}  // namespace

failure read_song_view(const record &result, int stop_fd, result_json &view) {
    const int32_t rate = result.sample_rate;
    sound song;
    song.samples_per_hop = int64_t{rate} * TAVO_LOUDNESS_HOP_MS / 1000;
    if (failure failed = read_samples(result.sound_path, stop_fd, song)) return failed;

    const double read_ms = 1000.0 * static_cast<double>(song.samples) / rate;
    double length_ms = std::max(read_ms, static_cast<double>(result.hl_pos_ms));
    for (const float beat : result.beats_ms) {
        length_ms = std::max(length_ms, static_cast<double>(beat));
    }
    const std::vector<float> loudness = loudness_of(song);
    const double sum = std::accumulate(loudness.begin(), loudness.end(), 0.0);
    view = {{"name", as_utf8(base_name(result.file))},
            {"mode", mode_word(result.mode)},
            {"sample_rate", rate},
            {"channels", result.channels},
            {"duration_ms", result.duration_ms},
            {"length_ms", player_ms(result, length_ms)},
            {"sound_ms", -result.offset_ms},
            {"read_ms", read_ms},
            {"wave", wave_of(song, length_ms * rate / 1000.0)},
            {"loudness", loudness},
            {"mean", loudness.empty() ? 0.0 : sum / static_cast<double>(loudness.size())}};
    add_result(result, view);
    return {};
}
