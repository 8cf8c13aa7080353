#include "cli/write/format.h"

#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>
#include <utility>

#include "cli/write/markers.h"
#include "cli/write/value_text.h"

namespace {

constexpr const char *kStatusWords[] = {"ok", "failed", "stopped"};  // indexed by outcome

// Mean square at -10 dBFS, full scale 1. If a song has louder passages, the library refines the
// highlight.
constexpr double kRefinedPower = 0.1;

// Keys of json_object, in the order of the CSV columns.
constexpr const char *kColumns[] = {"file",      "mode",        "status",    "sample_rate",
                                    "channels",  "duration_ms", "offset_ms", "hl_pos_ms",
                                    "hl_end_ms", "hl_refined",  "bpm",       "beat_count",
                                    "beats_ms",  "cpu_ms",      "error"};

// ---- Human-readable text.

std::string highlight_lines(const record &result) {
    const bool is_coarse = has_refinement(result) && !is_refined(result);
    const auto clock = is_coarse ? whole_clock_text : clock_text;
    std::string line = "  highlight  ";
    line += (is_coarse ? "about " : "") + clock(result.hl_pos_ms);
    if (result.length_s > 0) line += " to " + clock(highlight_end_ms(result, result.length_s));
    const bool is_quiet = result.loudest > 0.0 && result.loudest < kRefinedPower;
    return line + (is_coarse && is_quiet && !result.raised ? " (--normalize refines)\n" : "\n");
}

std::string beats_lines(const record &result) {
    std::string lines = "  tempo      " + std::to_string(result.bpm) + " BPM";
    if (result.mode == TAVO_MODE_BOTH) lines += " from the highlight on";
    lines += "\n  beats      " + std::to_string(result.beats_ms.size());
    if (!result.beats_ms.empty()) {
        lines += ", from " + clock_text(static_cast<double>(result.beats_ms.front())) + " to " +
                 clock_text(static_cast<double>(result.beats_ms.back()));
    }
    return lines + "\n";
}

std::string text_record(const record &result) {
    if (result.status != outcome::ok) return "";  // standard error has the message
    std::string text = shown(result.file) + "\n  stream     " +
                       clock_text(static_cast<double>(result.duration_ms)) + ", " +
                       std::to_string(result.sample_rate) + " Hz, " +
                       count_text(static_cast<size_t>(result.channels), "channel") + "\n";
    if (result.has_highlight) text += highlight_lines(result);
    if (result.has_beats) text += beats_lines(result);
    return text;
}

// ---- CSV.

// Returns the exact bytes of the name, or readable text if standard output is a terminal.
std::string name_text(const std::string &name) {
    return isatty(STDOUT_FILENO) == 1 ? shown(name) : name;
}

// Quotes the text if necessary. The format is for programs, so text that begins with = + - or @ is
// not changed.
std::string quoted(const std::string &text) {
    const std::string value = name_text(text);
    if (value.find_first_of(",\"\r\n") == std::string::npos) return value;
    return "\"" + replaced(value, {{'"', "\"\""}}) + "\"";
}

std::string cell(const result_json &value) {
    if (value.is_string()) return quoted(value.get<std::string>());
    if (value.is_number_float()) {  // the digits of JSON, without an exponent
        const std::string digits = nlohmann::json(std::stod(value.dump())).dump();
        return digits.substr(0, digits.find(".0", digits.size() - 2));
    }
    if (!value.is_array()) return value.dump();
    std::string numbers;
    for (const result_json &item : value) numbers += (numbers.empty() ? "" : " ") + cell(item);
    return numbers;
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

// ---- Templates of --print.

std::string seconds(double ms) {
    return formatted("%.3f", ms / 1000.0);
}

// Returns the fields' names and their values for a song. A value that the song lacks is empty.
std::vector<std::pair<std::string, std::string>> fields_of(const record &result) {
    const double start = player_ms(result, result.hl_pos_ms);
    const double end = player_ms(result, region_end_ms(result));
    const bool has_highlight = result.has_highlight;
    std::string beats;
    for (const float beat : result.beats_ms) {
        beats += (beats.empty() ? "" : " ") + seconds(player_ms(result, static_cast<double>(beat)));
    }
    return {{"file", name_text(result.file)},
            {"stem", name_text(stem(base_name(result.file)))},
            {"hl_s", has_highlight ? seconds(start) : ""},
            {"hl_ms", has_highlight ? std::to_string(std::llround(start)) : ""},
            {"end_s", has_highlight ? seconds(end) : ""},
            {"bpm", result.has_beats ? std::to_string(result.bpm) : ""},
            {"beats", beats}};
}

char escaped_character(char letter) {
    return letter == 'n' ? '\n' : letter == 't' ? '\t' : letter;
}

}  // namespace

std::string format_head(result_format format) {
    if (format != result_format::csv) return "";
    std::string row;
    for (const char *name : kColumns) row += (row.empty() ? "" : ",") + std::string(name);
    return row + "\n";
}

std::string format_record(const options &opts, const record &result) {
    std::string filled;
    switch (opts.format) {
        case result_format::text:
            return text_record(result);
        case result_format::json:
            return json_record(result);
        case result_format::csv:
            return csv_record(result);
        case result_format::print:
            if (result.status != outcome::ok) return "";
            // parse_options has already checked the template.
            return fill_template(opts.print, result, filled) ? "" : filled;
        case result_format::markers:  // name of the written file
            return result.written.empty() ? "" : shown(result.written) + "\n";
        default:
            return "";
    }
}

failure fill_template(const std::string &text, const record &result, std::string &filled) {
    const auto fields = fields_of(result);
    for (size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '\\' && i + 1 < text.size()) {
            filled += escaped_character(text[++i]);
        } else if (text[i] == '{') {
            const size_t end = std::min(text.find('}', i), text.size());
            const std::string name = text.substr(i + 1, end - i - 1);
            const auto field = std::find_if(fields.begin(), fields.end(),
                                            [&](const auto &entry) { return entry.first == name; });
            if (end == text.size() || field == fields.end()) {
                return {"--print: {" + name +
                        "} is not a field; {file}, {stem}, {hl_s}, {hl_ms}, {end_s}, {bpm} and "
                        "{beats} are. \\{ is a brace."};
            }
            filled += field->second;
            i = end;
        } else {
            filled += text[i];
        }
    }
    return {};
}

// ---- JSON.

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
