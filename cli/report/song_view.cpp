#include "cli/report/song_view.h"

#include <poll.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>
#include <numeric>

#include "cli/input/short_path.h"
#include "highlight/search.h"
#include "include/tavo.h"
#include "media_source/mtsrc.h"

namespace {

constexpr int32_t kBlockSamples = 4096;
constexpr size_t kMaxBins = 16384;  // several per column, so that edges stay sharp

// Extents of equally long spans. The span doubles when the bins run out, because the duration that
// a file states may be wrong.
struct bins {
    std::vector<extent> complete;
    int64_t samples_per_bin = 1;
    extent current;
    int64_t current_samples = 0;
};

struct loudness_curve {
    size_t hop = 0;            // samples
    size_t filled = 0;         // samples of the hop that is not complete
    double sum = 0.0;          // of their squares
    size_t complete_hops = 0;  // since the start
    std::array<double, TAVO_LOUDNESS_WINDOW_MS / TAVO_LOUDNESS_HOP_MS> hops{};  // the last sums
    std::vector<float> values;
};

extent merged(const extent &a, const extent &b) {
    return {std::min(a.low, b.low), std::max(a.high, b.high)};
}

void close_bin(bins &waveform) {
    waveform.complete.push_back(waveform.current);
    waveform.current_samples = 0;
    if (waveform.complete.size() < kMaxBins) return;
    for (size_t i = 0; i < kMaxBins / 2; ++i) {
        waveform.complete[i] = merged(waveform.complete[2 * i], waveform.complete[2 * i + 1]);
    }
    waveform.complete.resize(kMaxBins / 2);
    waveform.samples_per_bin *= 2;
}

void add_samples(bins &waveform, const int16_t *pcm, size_t count) {
    for (size_t i = 0; i < count; ++i) {
        const extent sample = {pcm[i], pcm[i]};
        waveform.current =
            waveform.current_samples == 0 ? sample : merged(waveform.current, sample);
        if (++waveform.current_samples == waveform.samples_per_bin) close_bin(waveform);
    }
}

// Appends a value for each window, by the formula of tavo_get_loudness. A window consists of whole
// hops; the sum of squares is kept for each hop.
void add_samples(loudness_curve &curve, const int16_t *pcm, size_t count) {
    for (size_t i = 0; i < count; ++i) {
        const double sample = pcm[i] / 32767.0;
        curve.sum += sample * sample;
        if (++curve.filled < curve.hop) continue;
        std::rotate(curve.hops.begin(), curve.hops.begin() + 1, curve.hops.end());
        curve.hops.back() = curve.sum;
        curve.sum = 0.0;
        curve.filled = 0;
        if (++curve.complete_hops < curve.hops.size()) continue;
        const double total = std::accumulate(curve.hops.begin(), curve.hops.end(), 0.0);
        const auto samples = static_cast<double>(curve.hop * curve.hops.size());
        curve.values.push_back(static_cast<float>(10.0 * std::log10(total / samples + 1.0)));
    }
}

bool stop_requested(int stop_fd) {
    pollfd watched = {stop_fd, POLLIN, 0};
    return poll(&watched, 1, 0) > 0;
}

struct sound {
    bins waveform;
    loudness_curve loudness;
    int64_t samples = 0;
};

outcome read_source(mtsrc_ctx *source, int32_t rate, int stop_fd, sound &song) {
    song.loudness.hop = static_cast<size_t>(rate) * TAVO_LOUDNESS_HOP_MS / 1000;
    std::array<int16_t, kBlockSamples> block{};
    for (int32_t code = 0; code == 0;) {
        if (stop_requested(stop_fd)) return outcome::stopped;
        mtsrc_frame frame = {block.data(), 0};
        code = mtsrc_getstream(source, static_cast<int32_t>(sizeof(block)), &frame);
        if (code < 0 || frame.size <= 0) break;
        const auto count = static_cast<size_t>(frame.size) / sizeof(int16_t);
        add_samples(song.waveform, block.data(), count);
        add_samples(song.loudness, block.data(), count);
        song.samples += static_cast<int64_t>(count);
    }
    if (song.waveform.current_samples > 0) {
        song.waveform.complete.push_back(song.waveform.current);
    }
    return outcome::ok;
}

outcome read_file(const std::string &path, int32_t rate, int stop_fd, sound &song) {
    const mtsrc_param param{path.c_str()};
    int32_t code = 0;
    const std::unique_ptr<mtsrc_ctx, decltype(&mtsrc_deinit)> source(mtsrc_init(&param, &code),
                                                                     mtsrc_deinit);
    return source == nullptr ? outcome::failed : read_source(source.get(), rate, stop_fd, song);
}

// A column covers every bin that it overlaps.
std::vector<extent> columns_of(const bins &waveform, double axis_samples, int columns) {
    const double bins_per_column =
        axis_samples / columns / static_cast<double>(waveform.samples_per_bin);
    std::vector<extent> out;
    for (int k = 0; k < columns; ++k) {
        const auto first = static_cast<size_t>(k * bins_per_column);
        if (first >= waveform.complete.size()) break;
        const auto end = static_cast<size_t>(std::ceil((k + 1) * bins_per_column));
        extent column = waveform.complete[first];
        for (size_t i = first + 1; i < std::min(end, waveform.complete.size()); ++i) {
            column = merged(column, waveform.complete[i]);
        }
        out.push_back(column);
    }
    return out;
}

void fill_view(const record &result, const sound &song, int columns, song_view &view) {
    const int32_t rate = result.sample_rate;
    view.read_ms = 1000.0 * static_cast<double>(song.samples) / rate;
    view.length_ms = std::max(view.read_ms, static_cast<double>(result.hl_pos_ms));
    for (const float beat : result.beats_ms) {
        view.length_ms = std::max(view.length_ms, static_cast<double>(beat));
    }
    view.waveform = columns_of(song.waveform, view.length_ms * rate / 1000.0, columns);
    for (const extent &column : view.waveform) {
        view.peak = std::max(
            {view.peak, -static_cast<int32_t>(column.low), static_cast<int32_t>(column.high)});
    }
    view.loudness = song.loudness.values;
    double sum = 0.0;
    for (const float value : view.loudness) sum += static_cast<double>(value);
    if (!view.loudness.empty()) view.mean = sum / static_cast<double>(view.loudness.size());
}

}  // namespace

outcome read_song_view(const record &result, int columns, int stop_fd, song_view &view,
                       std::string &error) {
    sound song;
    short_path opened =
        open_short_path(result.sound_path.empty() ? result.file : result.sound_path);
    const outcome status = read_file(opened.path, result.sample_rate, stop_fd, song);
    close_short_path(opened);
    if (status == outcome::stopped) {
        error = "The analysis was stopped.";
        return status;
    }
    if (song.samples == 0) {
        error = "The sound could not be read again for the page.";
        return outcome::failed;
    }
    fill_view(result, song, columns, view);
    return outcome::ok;
}

std::pair<double, double> searched_span(const record &result, const song_view &view) {
    constexpr auto kHopMs = static_cast<double>(TAVO_LOUDNESS_HOP_MS);
    constexpr auto kWindowMs = static_cast<double>(TAVO_LOUDNESS_WINDOW_MS);
    const bool is_short = result.duration_ms / 1000 < kShortSongSeconds;
    const double tail = is_short ? kShortSearchTail : kSearchTail;
    const double start = is_short ? 0.0 : kSearchSkip * kHopMs;
    // The last window that is searched may have its rise at its very end.
    const double last = static_cast<double>(view.loudness.size()) - tail;
    return {start, last < 0.0 ? start : std::max(start, last * kHopMs + kWindowMs)};
}
