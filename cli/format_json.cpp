#include <nlohmann/json.hpp>

#include "cli/format.h"
#include "cli/names.h"

namespace {

// Keys in the order they are set; beat times as the single-precision values they are.
using json = nlohmann::basic_json<nlohmann::ordered_map, std::vector, std::string, bool, int64_t,
                                  uint64_t, float>;

}  // namespace

// A name that is not UTF-8 cannot stand in JSON: file then has U+FFFD in place of the bytes in
// question, and file_bytes holds the exact name, percent-encoded.
std::string json_record(const record &what) {
    json object;
    object["file"] = as_utf8(what.file);
    if (!is_utf8(what.file)) object["file_bytes"] = percent_encoded(what.file);
    object["mode"] = mode_word(what.mode);
    object["status"] = status_word(what.status);
    if (what.has_stream) {
        object["sample_rate"] = what.sample_rate;
        object["channels"] = what.channels;
        object["duration_ms"] = what.duration_ms;
    }
    if (what.has_highlight) object["hl_pos_ms"] = what.hl_pos_ms;
    if (what.has_beats) {
        object["bpm"] = what.bpm;
        object["beat_count"] = what.beats_ms.size();
        object["beats_ms"] = what.beats_ms;
    }
    if (!what.error.empty()) object["error"] = as_utf8(what.error);
    return object.dump() + "\n";
}
