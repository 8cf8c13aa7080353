#include <unistd.h>

#include <array>
#include <charconv>
#include <cmath>

#include "cli/write/file_names.h"
#include "cli/write/format.h"
#include "cli/write/value_text.h"

namespace {

// Quoted where the cell needs it. Names go out byte for byte, whatever their encoding, except to a
// terminal. Programs read this format: a name that begins with = + - @ stays as it is.
std::string cell(const std::string &text) {
    const std::string value = isatty(STDOUT_FILENO) == 1 ? shown(text) : text;
    if (value.find_first_of(",\"\r\n") == std::string::npos) return value;
    std::string out = "\"";
    for (const char c : value) {
        if (c == '"') out += '"';
        out += c;
    }
    return out + "\"";
}

// The shortest decimal that gives the same float again.
std::string number_text(float value) {
    std::array<char, 64> text{};
    const auto end =
        std::to_chars(text.data(), text.data() + text.size(), value, std::chars_format::fixed);
    return std::string(text.data(), end.ptr);
}

std::string spaced(const std::vector<float> &times) {
    std::string out;
    for (const float time : times) out += (out.empty() ? "" : " ") + number_text(time);
    return out;
}

}  // namespace

std::string csv_head() {
    return "file,mode,status,sample_rate,channels,duration_ms,offset_ms,hl_pos_ms,hl_end_ms,hl_"
           "refined,bpm,"
           "beat_count,beats_ms,cpu_ms,error\n";
}

std::string csv_record(const record &result) {
    const auto when = [](bool known, int64_t value) {
        return known ? std::to_string(value) : std::string();
    };
    std::string row = cell(result.file);
    row += std::string(",") + mode_word(result.mode) + "," + status_word(result.status);
    row += "," + when(result.has_stream, result.sample_rate);
    row += "," + when(result.has_stream, result.channels);
    row += "," + when(result.has_stream, result.duration_ms);
    row += "," + (result.has_stream ? number_text(static_cast<float>(result.offset_ms)) : "");
    row += "," + when(result.has_highlight, result.hl_pos_ms);
    row += "," + when(result.has_highlight && result.length_s > 0,
                      std::llround(highlight_end_ms(result, result.length_s)));
    row += ",";
    if (has_refinement(result)) row += is_refined(result) ? "true" : "false";
    row += "," + when(result.has_beats, result.bpm);
    row += "," + when(result.has_beats, static_cast<int64_t>(result.beats_ms.size()));
    row += "," + spaced(result.beats_ms);
    row += "," + when(result.cpu_ms >= 0, result.cpu_ms);
    row += "," + cell(result.error);
    return row + "\n";
}
