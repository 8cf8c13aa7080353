#include "cli/write/value_text.h"

#include <array>
#include <cctype>
#include <cmath>
#include <cstdio>
#include <system_error>

#include "include/tavo.h"

const char *mode_word(int32_t mode) {
    switch (mode) {
        case TAVO_MODE_HIGHLIGHT:
            return "highlight";
        case TAVO_MODE_BEATS:
            return "beats";
        default:
            return "both";
    }
}

int32_t mode_of(const std::string &word) {
    if (word == "highlight") return TAVO_MODE_HIGHLIGHT;
    return word == "beats" ? TAVO_MODE_BEATS : TAVO_MODE_BOTH;
}

const char *status_word(outcome status) {
    switch (status) {
        case outcome::ok:
            return "ok";
        case outcome::failed:
            return "failed";
        case outcome::stopped:
            return "stopped";
    }
    return "failed";
}

namespace {

std::string seconds_text(long long whole) {
    std::array<char, 48> text{};
    if (whole >= 3600) {
        snprintf(text.data(), text.size(), "%lld:%02lld:%02lld", whole / 3600, whole / 60 % 60,
                 whole % 60);
    } else {
        snprintf(text.data(), text.size(), "%lld:%02lld", whole / 60, whole % 60);
    }
    return text.data();
}

}  // namespace

std::string whole_clock_text(double ms) {
    return seconds_text(std::llround(ms / 1000.0));
}

std::string clock_text(double ms) {
    const long long tenths = std::llround(ms / 100.0);
    return seconds_text(tenths / 10) + "." + std::to_string(tenths % 10);
}

std::string highlight_text(const record &result) {
    const bool about = has_refinement(result) && !is_refined(result);
    const auto clock = about ? whole_clock_text : clock_text;
    std::string text = (about ? "about " : "") + clock(result.hl_pos_ms);
    if (result.length_s > 0) text += " to " + clock(highlight_end_ms(result, result.length_s));
    return text;
}

std::string tempo_text(const record &result) {
    return std::to_string(result.bpm) + " BPM" +
           (result.mode == TAVO_MODE_BOTH ? " from the highlight on" : "");
}

std::string count_text(size_t count, const char *noun) {
    return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

std::string system_sentence(const std::string &subject, int code) {
    std::string reason = std::generic_category().message(code);
    // A capital is lowered, unless the word is an acronym.
    if (reason.size() > 1 && isupper(static_cast<unsigned char>(reason[0])) != 0 &&
        islower(static_cast<unsigned char>(reason[1])) != 0) {
        reason[0] = static_cast<char>(tolower(static_cast<unsigned char>(reason[0])));
    }
    return subject + ": " + reason + ".";
}
