#include <poll.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <memory>

#include "cli/input/short_path.h"
#include "cli/report/plot.h"
#include "common/tavo_ctx.h"
#include "highlight/power_envelope.h"
#include "highlight/search.h"
#include "media_source/mtsrc.h"

namespace {

constexpr int32_t kBlockSamples = 4096;  // 8192 bytes: the media source's custom
constexpr size_t kMostBins = 16384;      // many times the columns: their edges stay sharp

// Extents of stretches of equal length, which doubles whenever there get to be too many: what the
// file says of its length need not be true.
struct bins {
    std::vector<extent> full;
    int64_t samples_each = 1;
    extent open;  // of the stretch under way
    int64_t open_samples = 0;
};

struct loudness_curve {
    std::vector<int16_t> window;
    size_t filled = 0;
    size_t hop = 0;  // samples
    std::vector<float> values;
};

extent joined(const extent &a, const extent &b) {
    return {std::min(a.low, b.low), std::max(a.high, b.high)};
}

void close_bin(bins &to) {
    to.full.push_back(to.open);
    to.open_samples = 0;
    if (to.full.size() < kMostBins) return;
    for (size_t i = 0; i < kMostBins / 2; ++i) {
        to.full[i] = joined(to.full[2 * i], to.full[2 * i + 1]);
    }
    to.full.resize(kMostBins / 2);
    to.samples_each *= 2;
}

void add_samples(bins &to, const int16_t *pcm, size_t count) {
    for (size_t i = 0; i < count; ++i) {
        const extent one = {pcm[i], pcm[i]};
        to.open = to.open_samples == 0 ? one : joined(to.open, one);
        if (++to.open_samples == to.samples_each) close_bin(to);
    }
}

// The library's own curve, window by window: the values are those of the sound taken whole.
void add_samples(loudness_curve &to, const int16_t *pcm, size_t count, int32_t rate) {
    while (count > 0) {
        const size_t taken = std::min(count, to.window.size() - to.filled);
        std::copy(pcm, pcm + taken, to.window.data() + to.filled);
        to.filled += taken;
        pcm += taken;
        count -= taken;
        if (to.filled < to.window.size()) return;
        TAVO_HL_CTX curve{};
        const auto size = static_cast<int64_t>(to.window.size());
        const int32_t made = _calc_power_level(to.window.data(), size, rate, &curve);
        const std::unique_ptr<float, decltype(&free)> owner(curve.power, free);
        if (made != 1) throw std::bad_alloc();
        to.values.push_back(curve.power[0]);
        std::copy(to.window.begin() + static_cast<ptrdiff_t>(to.hop), to.window.end(),
                  to.window.begin());
        to.filled -= to.hop;
    }
}

bool stop_asked(int stop_fd) {
    pollfd watched = {stop_fd, POLLIN, 0};
    return poll(&watched, 1, 0) > 0;
}

struct reading {
    bins waveform;
    loudness_curve loudness;
    int64_t samples = 0;
};

outcome read_source(mtsrc_ctx *source, int32_t rate, int stop_fd, reading &to) {
    to.loudness.window.resize(static_cast<size_t>(kPowerWindowSeconds * rate));
    to.loudness.hop = static_cast<size_t>(kPowerHopSeconds * rate);
    std::array<int16_t, kBlockSamples> block{};
    for (int32_t code = 0; code == 0;) {
        if (stop_asked(stop_fd)) return outcome::stopped;
        mtsrc_frame frame = {block.data(), 0};
        code = mtsrc_getstream(source, static_cast<int32_t>(sizeof(block)), &frame);
        if (code < 0 || frame.size <= 0) break;
        const auto count = static_cast<size_t>(frame.size) / sizeof(int16_t);
        add_samples(to.waveform, block.data(), count);
        add_samples(to.loudness, block.data(), count, rate);
        to.samples += static_cast<int64_t>(count);
    }
    if (to.waveform.open_samples > 0) to.waveform.full.push_back(to.waveform.open);
    return outcome::ok;
}

outcome read_sound(const std::string &path, int32_t rate, int stop_fd, reading &to) {
    const mtsrc_param param{path.c_str()};
    int32_t code = 0;
    const std::unique_ptr<mtsrc_ctx, decltype(&mtsrc_deinit)> source(mtsrc_init(&param, &code),
                                                                     mtsrc_deinit);
    return source == nullptr ? outcome::failed : read_source(source.get(), rate, stop_fd, to);
}

// Each column takes every bin that it touches.
std::vector<extent> columns_of(const bins &from, double axis_samples, int columns) {
    std::vector<extent> out;
    const double bins_each = axis_samples / columns / static_cast<double>(from.samples_each);
    for (int k = 0; k < columns; ++k) {
        const auto first = static_cast<size_t>(k * bins_each);
        if (first >= from.full.size()) break;
        const auto end = static_cast<size_t>(std::ceil((k + 1) * bins_each));
        extent column = from.full[first];
        for (size_t i = first + 1; i < std::min(end, from.full.size()); ++i) {
            column = joined(column, from.full[i]);
        }
        out.push_back(column);
    }
    return out;
}

void fill_plot(const record &result, const reading &from, int columns, plot_data &out) {
    const int32_t rate = result.sample_rate;
    out.read_ms = 1000.0 * static_cast<double>(from.samples) / rate;
    out.length_ms = std::max(out.read_ms, static_cast<double>(result.hl_pos_ms));
    for (const float beat : result.beats_ms) {
        out.length_ms = std::max(out.length_ms, static_cast<double>(beat));
    }
    out.waveform = columns_of(from.waveform, out.length_ms * rate / 1000.0, columns);
    for (const extent &column : out.waveform) {
        out.peak = std::max(
            {out.peak, -static_cast<int32_t>(column.low), static_cast<int32_t>(column.high)});
    }
    out.loudness = from.loudness.values;
    double sum = 0.0;
    for (const float value : out.loudness) sum += static_cast<double>(value);
    if (!out.loudness.empty()) out.mean = sum / static_cast<double>(out.loudness.size());
}

}  // namespace

outcome gather_plot(const record &result, int columns, int stop_fd, plot_data &out,
                    std::string &error) {
    reading from;
    short_path opened = open_short_path(result.file);
    const outcome end = read_sound(opened.path, result.sample_rate, stop_fd, from);
    close_short_path(opened);
    if (end == outcome::stopped) {
        error = "The analysis was stopped.";
        return end;
    }
    if (from.samples == 0) {
        error = "The sound could not be read again for the picture.";
        return outcome::failed;
    }
    fill_plot(result, from, columns, out);
    return outcome::ok;
}

std::pair<double, double> searched_span(const record &result, const plot_data &data) {
    const bool is_short = result.duration_ms / 1000 < kShortSongSeconds;
    const double tail = is_short ? kShortSearchTail : kSearchTail;
    const double from = is_short ? 0.0 : kSearchSkip * kPointMs;
    const double last = static_cast<double>(data.loudness.size()) - tail;
    return {from, last < 0.0 ? from : std::max(from, last * kPointMs + kWindowMs)};
}
