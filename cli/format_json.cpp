#include <cmath>
#include <nlohmann/json.hpp>

#include "cli/format.h"
#include "cli/names.h"
#include "cli/words.h"

namespace {

// Keys in the order they are set; beat times as the single-precision values they are.
using json = nlohmann::basic_json<nlohmann::ordered_map, std::vector, std::string, bool, int64_t,
                                  uint64_t, float>;

}  // namespace

// A name that is not UTF-8 cannot stand in JSON: file then has U+FFFD in place of the bytes in
// question, and file_bytes holds the exact name, percent-encoded.
std::string json_record(const record &result) {
    json object;
    object["file"] = as_utf8(result.file);
    if (!is_utf8(result.file)) object["file_bytes"] = percent_encoded(result.file);
    object["mode"] = mode_word(result.mode);
    object["status"] = status_word(result.status);
    if (result.has_stream) {
        object["sample_rate"] = result.sample_rate;
        object["channels"] = result.channels;
        object["duration_ms"] = result.duration_ms;
    }
    if (result.has_highlight) {
        object["hl_pos_ms"] = result.hl_pos_ms;
        if (result.length_s > 0) {
            object["hl_end_ms"] = std::llround(highlight_end_ms(result, result.length_s));
        }
        if (has_refinement(result)) object["hl_refined"] = is_refined(result);
    }
    if (result.has_beats) {
        object["bpm"] = result.bpm;
        object["beat_count"] = result.beats_ms.size();
        object["beats_ms"] = result.beats_ms;
    }
    if (result.cpu_ms >= 0) object["cpu_ms"] = result.cpu_ms;
    if (!result.error.empty()) object["error"] = as_utf8(result.error);
    return object.dump() + "\n";
}
