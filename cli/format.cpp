#include "cli/format.h"

#include <array>
#include <charconv>

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

std::string number(float value) {
    std::array<char, 64> text{};
    const auto end =
        std::to_chars(text.data(), text.data() + text.size(), value, std::chars_format::fixed);
    return std::string(text.data(), end.ptr);
}
