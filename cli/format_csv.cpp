#include "cli/format.h"

namespace {

// Quoted where the cell needs it. Names go out byte for byte, whatever their encoding.
std::string cell(const std::string &value) {
    if (value.find_first_of(",\"\r\n") == std::string::npos) return value;
    std::string out = "\"";
    for (const char c : value) {
        if (c == '"') out += '"';
        out += c;
    }
    return out + "\"";
}

std::string spaced(const std::vector<float> &times) {
    std::string out;
    for (const float time : times) out += (out.empty() ? "" : " ") + number(time);
    return out;
}

}  // namespace

std::string csv_head() {
    return "file,mode,status,sample_rate,channels,duration_ms,hl_pos_ms,bpm,beat_count,beats_ms,"
           "error\n";
}

std::string csv_record(const record &what) {
    const auto when = [](bool known, int64_t value) {
        return known ? std::to_string(value) : std::string();
    };
    std::string row = cell(what.file);
    row += std::string(",") + mode_word(what.mode) + "," + status_word(what.status);
    row += "," + when(what.has_stream, what.sample_rate);
    row += "," + when(what.has_stream, what.channels);
    row += "," + when(what.has_stream, what.duration_ms);
    row += "," + when(what.has_highlight, what.hl_pos_ms);
    row += "," + when(what.has_beats, what.bpm);
    row += "," + when(what.has_beats, static_cast<int64_t>(what.beats_ms.size()));
    row += "," + spaced(what.beats_ms);
    row += "," + cell(what.error);
    return row + "\n";
}
