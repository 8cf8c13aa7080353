#include "cli/format.h"

#include <array>
#include <charconv>
#include <cmath>
#include <cstdio>

#include "core/tavo.h"

std::string format_head(result_format format) {
    return format == result_format::csv ? csv_head() : "";
}

std::string format_record(result_format format, const record &what) {
    switch (format) {
        case result_format::text:
            return text_record(what);
        case result_format::json:
            return json_record(what);
        case result_format::csv:
            return csv_record(what);
        case result_format::labels:
            return labels_record(what);
    }
    return "";
}

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

std::string clock_text(double ms) {
    const long long tenths = std::llround(ms / 100.0);
    const long long whole = tenths / 10;
    std::array<char, 48> text{};
    if (whole >= 3600) {
        snprintf(text.data(), text.size(), "%lld:%02lld:%02lld.%lld", whole / 3600, whole / 60 % 60,
                 whole % 60, tenths % 10);
    } else {
        snprintf(text.data(), text.size(), "%lld:%02lld.%lld", whole / 60, whole % 60, tenths % 10);
    }
    return text.data();
}

std::string number(float value) {
    std::array<char, 64> text{};
    const auto end =
        std::to_chars(text.data(), text.data() + text.size(), value, std::chars_format::fixed);
    return std::string(text.data(), end.ptr);
}
