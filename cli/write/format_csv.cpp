#include <unistd.h>

#include <array>
#include <charconv>

#include "cli/write/file_names.h"
#include "cli/write/format.h"
#include "cli/write/json.h"

namespace {

// Keys of json_object, in the order of the columns.
constexpr const char *kColumns[] = {"file",      "mode",        "status",    "sample_rate",
                                    "channels",  "duration_ms", "offset_ms", "hl_pos_ms",
                                    "hl_end_ms", "hl_refined",  "bpm",       "beat_count",
                                    "beats_ms",  "cpu_ms",      "error"};

// Quotes the text if necessary. Names are written byte for byte, whatever their encoding, except to
// a terminal. The format is for programs, so a name that begins with = + - @ is not changed.
std::string quoted(const std::string &text) {
    const std::string value = isatty(STDOUT_FILENO) == 1 ? shown(text) : text;
    if (value.find_first_of(",\"\r\n") == std::string::npos) return value;
    std::string out = "\"";
    for (const char c : value) {
        if (c == '"') out += '"';
        out += c;
    }
    return out + "\"";
}

// Returns the shortest decimal that converts back to the same float.
std::string number_text(float value) {
    std::array<char, 64> text{};
    const auto end =
        std::to_chars(text.data(), text.data() + text.size(), value, std::chars_format::fixed);
    return std::string(text.data(), end.ptr);
}

std::string cell(const result_json &value) {
    if (value.is_string()) return quoted(value.get<std::string>());
    if (value.is_number_float()) return number_text(value.get<float>());
    if (!value.is_array()) return value.dump();
    std::string numbers;
    for (const result_json &item : value) numbers += (numbers.empty() ? "" : " ") + cell(item);
    return numbers;
}

}  // namespace

std::string csv_head() {
    std::string row;
    for (const char *name : kColumns) row += (row.empty() ? "" : ",") + std::string(name);
    return row + "\n";
}

std::string csv_record(const record &result) {
    result_json object = json_object(result);
    object["file"] = result.file;  // exact bytes
    std::string row;
    for (const char *name : kColumns) {
        if (name != kColumns[0]) row += ",";
        if (object.contains(name)) row += cell(object[name]);
    }
    return row + "\n";
}
