#include "cli/report/song_json.h"

#include <algorithm>
#include <cmath>

#include "cli/write/file_names.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"

namespace {

// Samples on a scale of -127 to 127 of the song's own peak, lowest and highest in turn.
result_json wave_of(const song_view &view) {
    result_json out = result_json::array();
    const double scale = 127.0 / std::max(view.peak, 1);
    for (const extent &column : view.waveform) {
        out.push_back(std::lround(column.low * scale));
        out.push_back(std::lround(column.high * scale));
    }
    return out;
}

}  // namespace

result_json song_json(const record &result, const song_view &view) {
    result_json song = {{"name", as_utf8(base_name(result.file))},
                        {"mode", mode_word(result.mode)},
                        {"sample_rate", result.sample_rate},
                        {"channels", result.channels},
                        {"duration_ms", result.duration_ms},
                        {"length_ms", player_ms(result, view.length_ms)},
                        {"sound_ms", -result.offset_ms},
                        {"read_ms", view.read_ms},
                        {"wave", wave_of(view)},
                        {"loudness", view.loudness},
                        {"mean", view.mean}};
    if (result.has_highlight) {
        song["hl_pos_ms"] = player_ms(result, result.hl_pos_ms);
        if (!view.loudness.empty()) {
            const auto [from, to] = searched_span(result, view);
            song["searched_ms"] = {player_ms(result, from), player_ms(result, to)};
        }
        song["region_end_ms"] = player_ms(result, region_end_ms(result));
        if (result.length_s > 0) song["hl_end_ms"] = song["region_end_ms"];
        if (has_refinement(result)) song["hl_refined"] = is_refined(result);
    }
    if (result.has_beats) {
        song["bpm"] = result.bpm;
        song["beats_ms"] = result_json::array();
        for (const float beat : result.beats_ms) {
            song["beats_ms"].push_back(player_ms(result, static_cast<double>(beat)));
        }
    }
    return song;
}
