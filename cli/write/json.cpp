#include "cli/write/json.h"

#include <cmath>
#include <nlohmann/json.hpp>

#include "cli/write/value_text.h"

constexpr const char *kStatusWords[] = {"ok", "failed", "stopped"};  // indexed by outcome

result_json json_object(const record &result) {
    result_json object;
    object["file"] = as_utf8(result.file);
    if (object["file"] != result.file) object["file_bytes"] = percent_encoded(result.file);
    object["mode"] = mode_word(result.mode);
    object["status"] = kStatusWords[static_cast<int>(result.status)];
    if (result.sample_rate > 0) {
        object["sample_rate"] = result.sample_rate;
        object["channels"] = result.channels;
        object["duration_ms"] = result.duration_ms;
        object["offset_ms"] = result.offset_ms;
    }
    if (!result.decoder.empty()) object["decoder"] = result.decoder;
    if (result.has_highlight) {
        object["hl_pos_ms"] = result.hl_pos_ms;
        if (result.length_s > 0) {
            object["hl_end_ms"] = std::llround(highlight_end_ms(result, result.length_s));
        }
        if (has_refinement(result)) object["hl_refined"] = is_refined(result);
        if (result.raised) object["hl_normalized"] = true;
    }
    if (result.has_beats) {
        object["bpm"] = result.bpm;
        object["beat_count"] = result.beats_ms.size();
        object["beats_ms"] = result.beats_ms;
    }
    if (result.cpu_ms >= 0) object["cpu_ms"] = result.cpu_ms;
    if (!result.error.empty()) object["error"] = as_utf8(result.error);
    return object;
}

std::string json_record(const record &result) {
    return json_text(json_object(result).dump()) + "\n";
}

record record_from_json(const std::string &text) {
    const result_json object = result_json::parse(text);
    record out;
    out.mode = mode_of(object.at("mode").get<std::string>());
    out.error = object.value("error", "");
    if (object.at("status") == kStatusWords[0]) out.status = outcome::ok;
    out.sample_rate = object.value("sample_rate", 0);
    out.channels = object.value("channels", 0);
    out.duration_ms = object.value("duration_ms", int64_t{0});
    out.offset_ms = object.value("offset_ms", 0.0);
    out.decoder = object.value("decoder", "");
    out.has_highlight = object.contains("hl_pos_ms");
    out.hl_pos_ms = object.value("hl_pos_ms", 0);
    out.raised = object.value("hl_normalized", false);
    out.has_beats = object.contains("bpm");
    out.bpm = object.value("bpm", 0);
    if (out.has_beats) out.beats_ms = object.at("beats_ms").get<std::vector<float>>();
    out.cpu_ms = object.value("cpu_ms", int64_t{-1});
    return out;
}
