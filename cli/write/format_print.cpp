// --print: a line of the user's own making for each song.
#include <unistd.h>

#include <array>
#include <cmath>
#include <cstdio>

#include "cli/write/file_names.h"
#include "cli/write/format.h"
#include "cli/write/markers.h"

namespace {

std::string seconds(double ms) {
    std::array<char, 48> text{};
    snprintf(text.data(), text.size(), "%.3f", ms / 1000.0);
    return text.data();
}

// For a terminal nothing that it obeys; else byte for byte.
std::string name_text(const std::string &name) {
    return isatty(STDOUT_FILENO) == 1 ? shown(name) : name;
}

std::string highlight_start(const record &result) {
    return result.has_highlight ? seconds(player_ms(result, result.hl_pos_ms)) : "";
}

std::string highlight_start_ms(const record &result) {
    if (!result.has_highlight) return "";
    return std::to_string(std::llround(player_ms(result, result.hl_pos_ms)));
}

std::string highlight_end(const record &result) {
    return result.has_highlight ? seconds(player_ms(result, region_end_ms(result))) : "";
}

std::string beat_times(const record &result) {
    std::string times;
    for (const float beat : result.beats_ms) {
        times += (times.empty() ? "" : " ") + seconds(player_ms(result, static_cast<double>(beat)));
    }
    return times;
}

struct field {
    const char *name;
    std::string (*value)(const record &result);
};
constexpr field kFields[] = {
    {"file", [](const record &result) { return name_text(result.file); }},
    {"stem", [](const record &result) { return name_text(stem(base_name(result.file))); }},
    {"hl_s", highlight_start},
    {"hl_ms", highlight_start_ms},
    {"end_s", highlight_end},
    {"bpm",
     [](const record &result) { return result.has_beats ? std::to_string(result.bpm) : ""; }},
    {"beats", beat_times},
};

const field *find_field(const std::string &name) {
    for (const field &entry : kFields) {
        if (name == entry.name) return &entry;
    }
    return nullptr;
}

char escaped_character(char letter) {
    return letter == 'n' ? '\n' : letter == 't' ? '\t' : letter;
}

}  // namespace

failure fill_template(const std::string &text, const record &result, std::string &filled) {
    for (size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '\\' && i + 1 < text.size()) {
            filled += escaped_character(text[++i]);
        } else if (text[i] == '{') {
            const size_t end = text.find('}', i);
            const std::string name = text.substr(i + 1, end - i - 1);
            const field *known = end == std::string::npos ? nullptr : find_field(name);
            if (known == nullptr) {
                return {"--print: {" + name +
                        "} is not a field; {file}, {stem}, {hl_s}, {hl_ms}, {end_s}, {bpm} and "
                        "{beats} are. \\{ is a brace."};
            }
            filled += known->value(result);
            i = end;
        } else {
            filled += text[i];
        }
    }
    return {};
}
