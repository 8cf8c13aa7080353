// --print: a text that the user specifies, for each song.
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <utility>
#include <vector>

#include "cli/write/file_names.h"
#include "cli/write/format.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"

namespace {

std::string seconds(double ms) {
    return formatted("%.3f", ms / 1000.0);
}

// Prints without control characters to a terminal, otherwise byte for byte.
std::string name_text(const std::string &name) {
    return isatty(STDOUT_FILENO) == 1 ? shown(name) : name;
}

std::string beat_times(const record &result) {
    std::string times;
    for (const float beat : result.beats_ms) {
        times += (times.empty() ? "" : " ") + seconds(player_ms(result, static_cast<double>(beat)));
    }
    return times;
}

// Returns the fields and a song's values, which are empty where the song has none.
std::vector<std::pair<std::string, std::string>> fields_of(const record &result) {
    const double start = player_ms(result, result.hl_pos_ms);
    const double end = player_ms(result, region_end_ms(result));
    const bool has_highlight = result.has_highlight;
    return {{"file", name_text(result.file)},
            {"stem", name_text(stem(base_name(result.file)))},
            {"hl_s", has_highlight ? seconds(start) : ""},
            {"hl_ms", has_highlight ? std::to_string(std::llround(start)) : ""},
            {"end_s", has_highlight ? seconds(end) : ""},
            {"bpm", result.has_beats ? std::to_string(result.bpm) : ""},
            {"beats", beat_times(result)}};
}

char escaped_character(char letter) {
    return letter == 'n' ? '\n' : letter == 't' ? '\t' : letter;
}

}  // namespace

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
