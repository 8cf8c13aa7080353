#include "cli/report/song_view.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>
#include <nlohmann/json.hpp>
#include <numeric>

#include "cli/system.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr int32_t kBlockSamples = 4096;
constexpr size_t kColumns = 4000;  // of the waveform: sharp when zoomed, about 30 KB

failure read_samples(const std::string &path, int stop_fd, std::vector<int16_t> &samples) {
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
        const size_t count = static_cast<size_t>(frame.size) / sizeof block[0];
        samples.insert(samples.end(), block.data(), block.data() + count);
    }
    return {samples.empty() ? "The sound could not be read again for the page." : ""};
}

// Returns the lowest and the highest sample of each column, scaled to a peak of 127.
result_json wave_of(const std::vector<int16_t> &samples) {
    const auto whole = std::minmax_element(samples.begin(), samples.end());
    const double scale = 127.0 / std::max({1, -*whole.first, +*whole.second});
    result_json wave = result_json::array();
    for (size_t k = 0; k < kColumns; ++k) {
        const size_t start = k * samples.size() / kColumns;
        const size_t end = std::max(start + 1, (k + 1) * samples.size() / kColumns);
        const auto [low, high] = std::minmax_element(samples.data() + start, samples.data() + end);
        wave.push_back(std::lround(*low * scale));
        wave.push_back(std::lround(*high * scale));
    }
    return wave;
}

// Returns the loudness curve, computed with the formula of tavo_get_loudness.
std::vector<float> loudness_of(const std::vector<int16_t> &samples, int32_t rate) {
    const size_t hop = static_cast<size_t>(rate) * TAVO_LOUDNESS_HOP_MS / 1000;
    const size_t window = hop * (TAVO_LOUDNESS_WINDOW_MS / TAVO_LOUDNESS_HOP_MS);
    const double full_scale = 32767.0 * 32767.0 * static_cast<double>(window);
    std::vector<float> values;
    for (size_t start = 0; start + window <= samples.size(); start += hop) {
        const int16_t *first = samples.data() + start;
        const double sum = std::inner_product(first, first + window, first, 0.0);
        values.push_back(static_cast<float>(10.0 * std::log10(sum / full_scale + 1.0)));
    }
    return values;
}

// Returns the start and the end, in ms, of the part of the song that is searched for a highlight.
// `count` is the number of loudness values.
result_json searched_span(const record &result, size_t count) {
    const bool is_short = result.duration_ms / 1000 < TAVO_SHORT_SONG_S;
    const int start = is_short ? 0 : TAVO_SEARCH_SKIP * TAVO_LOUDNESS_HOP_MS;
    const int tail = is_short ? TAVO_SHORT_SEARCH_TAIL : TAVO_SEARCH_TAIL;
    // The highlight may start late in the last window searched, so the span includes that window.
    const int last = static_cast<int>(count) - tail;
    const int end = last < 0 ? 0 : last * TAVO_LOUDNESS_HOP_MS + TAVO_LOUDNESS_WINDOW_MS;
    return {start, std::max(start, end)};
}

}  // namespace

failure read_song_view(const record &result, int stop_fd, result_json &view) {
    const int32_t rate = result.sample_rate;
    std::vector<int16_t> samples;
    samples.reserve(static_cast<size_t>(result.duration_ms * rate / 1000));
    if (failure failed = read_samples(result.sound_path, stop_fd, samples)) return failed;
    const std::vector<float> loudness = loudness_of(samples, rate);
    record named = result;
    named.file = base_name(result.file);
    view = json_object(named);
    view["read_ms"] = 1000.0 * static_cast<double>(samples.size()) / rate;
    view["wave"] = wave_of(samples);
    view["loudness"] = loudness;
    if (!result.has_highlight) return {};
    view["region_end_ms"] = region_end_ms(result);
    if (!loudness.empty()) view["searched_ms"] = searched_span(result, loudness.size());
    return {};
}
