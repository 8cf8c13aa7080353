#include "cli/write/value_text.h"

#include <cctype>
#include <climits>
#include <cmath>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <new>
#include <string_view>
#include <system_error>
#include <vector>

#include "include/tavo.h"

namespace {

namespace fs = std::filesystem;

constexpr const char *kModeWords[] = {"highlight", "beats", "both"};  // indexed by TAVO_MODE_*

std::string seconds_text(long long seconds) {
    const long long hours = seconds / 3600;
    return (hours > 0 ? formatted("%lld:%02lld", hours, seconds / 60 % 60)
                      : std::to_string(seconds / 60)) +
           formatted(":%02lld", seconds % 60);
}

constexpr const char *kReplacement = "\xEF\xBF\xBD";  // U+FFFD

// A character in UTF-8, or a single byte that is not part of one.
struct character {
    std::string_view bytes;
    uint32_t point = 0;
    bool is_valid = false;
};

// Returns the character at the start of text. Overlong forms and surrogates are not valid.
character first_character(std::string_view text) {
    constexpr uint32_t kLeast[] = {0, 0, 0x80, 0x800, 0x10000};  // by length in bytes
    const auto lead = static_cast<uint8_t>(text[0]);
    if (lead < 0x80) return {text.substr(0, 1), lead, true};
    const size_t length = lead < 0xC2 ? 1 : lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : lead < 0xF5 ? 4 : 1;
    const std::string_view bytes = text.substr(0, length);
    uint32_t point = lead & (0xFFu >> (length + 1));
    bool is_valid = length > 1 && bytes.size() == length;
    for (const char byte : bytes.substr(1)) {
        is_valid = is_valid && (byte & 0xC0) == 0x80;
        point = point << 6 | (static_cast<uint8_t>(byte) & 0x3Fu);
    }
    const bool is_surrogate = point >= 0xD800 && point <= 0xDFFF;
    is_valid = is_valid && point >= kLeast[length] && point <= 0x10FFFF && !is_surrogate;
    return is_valid ? character{bytes, point, true} : character{text.substr(0, 1)};
}

std::vector<character> characters_of(std::string_view text) {
    std::vector<character> characters;
    for (; !text.empty(); text.remove_prefix(characters.back().bytes.size())) {
        characters.push_back(first_character(text));
    }
    return characters;
}

// True for a character that moves the cursor or reorders text on a terminal: control characters,
// line separators and bidirectional marks.
bool is_control(uint32_t point) {
    const auto is_in = [=](uint32_t first, uint32_t last) {
        return point >= first && point <= last;
    };
    return is_in(0, 0x1F) || is_in(0x7F, 0x9F) || point == 0x61C || is_in(0x200E, 0x200F) ||
           is_in(0x2028, 0x202E) || is_in(0x2066, 0x2069);
}

// Returns the FNV-1a hash.
uint32_t hash_of(const std::string &bytes) {
    uint32_t hash = 2'166'136'261u;
    for (const char byte : bytes) hash = (hash ^ static_cast<uint8_t>(byte)) * 16'777'619u;
    return hash;
}

}  // namespace

std::string formatted(const char *format, ...) {
    char *text = nullptr;
    va_list values;
    va_start(values, format);
    const int size = vasprintf(&text, format, values);
    va_end(values);
    if (size < 0) throw std::bad_alloc();
    const std::unique_ptr<char, decltype(&free)> owner(text, free);
    return text;
}

const char *mode_word(int32_t mode) {
    return kModeWords[mode];
}

int32_t mode_of(const std::string &word) {
    int32_t mode = TAVO_MODE_HIGHLIGHT;
    while (mode < TAVO_MODE_BOTH && word != kModeWords[mode]) ++mode;
    return mode;
}

std::string whole_clock_text(double ms) {
    return seconds_text(std::llround(ms / 1000.0));
}

std::string clock_text(double ms) {
    const long long tenths = std::llround(ms / 100.0);
    return seconds_text(tenths / 10) + "." + std::to_string(tenths % 10);
}

std::string count_text(size_t count, const char *noun) {
    return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

std::string system_sentence(const std::string &subject, int code) {
    std::string reason = std::generic_category().message(code);
    // Makes the first letter lower case unless the word is an acronym.
    if (reason.size() > 1 && isupper(static_cast<unsigned char>(reason[0])) != 0 &&
        islower(static_cast<unsigned char>(reason[1])) != 0) {
        reason[0] = static_cast<char>(tolower(static_cast<unsigned char>(reason[0])));
    }
    return subject + ": " + reason + ".";
}

std::string shown(const std::string &bytes) {
    const std::map<std::string_view, const char *> escapes = {
        {"\n", "\\n"}, {"\t", "\\t"}, {"\\", "\\\\"}};
    std::string out;
    for (const character &each : characters_of(bytes)) {
        const auto escape = escapes.find(each.bytes);
        if (escape != escapes.end()) {
            out += escape->second;
        } else if (each.is_valid && !is_control(each.point)) {
            out += each.bytes;
        } else {
            for (const char byte : each.bytes) out += formatted("\\x%02X", byte & 0xFF);
        }
    }
    return out;
}

std::string json_text(const std::string &utf8) {
    std::string out;
    for (const character &each : characters_of(utf8)) {
        out += is_control(each.point) ? formatted("\\u%04X", each.point) : std::string(each.bytes);
    }
    return out;
}

std::string as_utf8(const std::string &bytes) {
    std::string out;
    for (const character &each : characters_of(bytes)) {
        out += each.is_valid ? each.bytes : kReplacement;
    }
    return out;
}

std::string replaced(const std::string &text, const std::map<char, const char *> &replacements) {
    std::string out;
    for (const char c : text) {
        const auto found = replacements.find(c);
        out += found == replacements.end() ? std::string(1, c) : found->second;
    }
    return out;
}

std::string xml_text(const std::string &bytes) {
    std::string allowed;
    for (const character &each : characters_of(bytes)) {
        const bool is_allowed = each.point >= 0x20 && each.point != 0xFFFE && each.point != 0xFFFF;
        allowed += is_allowed ? each.bytes : kReplacement;
    }
    return replaced(allowed, {{'&', "&amp;"}, {'<', "&lt;"}, {'>', "&gt;"}, {'"', "&quot;"}});
}

std::string percent_encoded(const std::string &bytes) {
    std::string out;
    for (const char c : bytes) {
        const bool is_plain =
            (c & 0x80) == 0 && c != '\0' && (isalnum(c) != 0 || strchr("-._~/", c) != nullptr);
        out += is_plain ? std::string(1, c) : formatted("%%%02X", c & 0xFF);
    }
    return out;
}

std::string base_name(const std::string &path) {
    return fs::path(path).filename();
}

std::string stem(const std::string &name) {
    return fs::path(name).stem();
}

std::string file_url(const std::string &path) {
    std::error_code failed;
    const fs::path absolute = fs::canonical(path, failed);
    return "file://" + percent_encoded(failed ? path : absolute.string());
}

std::string fitting_name(const std::string &name, const std::string &suffix) {
    if (name.size() + suffix.size() <= NAME_MAX) return name + suffix;
    const std::string number = formatted("~%08x", hash_of(name));
    size_t kept = NAME_MAX - suffix.size() - number.size();
    while (kept > 0 && (name[kept] & 0xC0) == 0x80) --kept;  // cut between characters
    return name.substr(0, kept) + number + suffix;
}
