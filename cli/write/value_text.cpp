#include "cli/write/value_text.h"

#include <array>
#include <cctype>
#include <cmath>
#include <cstdarg>
#include <cstdio>
#include <system_error>

#include "include/tavo.h"

namespace {

constexpr const char *kModeWords[] = {"highlight", "beats", "both"};  // indexed by TAVO_MODE_*

std::string seconds_text(long long seconds) {
    const long long hours = seconds / 3600;
    return (hours > 0 ? formatted("%lld:%02lld", hours, seconds / 60 % 60)
                      : std::to_string(seconds / 60)) +
           formatted(":%02lld", seconds % 60);
}

}  // namespace

std::string formatted(const char *format, ...) {
    std::array<char, 96> text{};
    va_list values;
    va_start(values, format);
    vsnprintf(text.data(), text.size(), format, values);
    va_end(values);
    return text.data();
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
