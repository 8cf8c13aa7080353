#include "cli/report/svg.h"

#include <array>
#include <charconv>

#include "cli/write/file_names.h"

std::string decimal(double value, int digits) {
    std::array<char, 400> text{};  // the largest double has 309 digits before the point
    const auto end = std::to_chars(text.data(), text.data() + text.size(), value,
                                   std::chars_format::fixed, digits);
    return std::string(text.data(), end.ptr);
}

std::string point(double x, double y) {
    return decimal(x, 1) + " " + decimal(y, 1);
}

std::string xml(const std::string &bytes) {
    const std::string text = as_utf8(bytes);
    std::string out;
    for (size_t i = 0; i < text.size(); ++i) {
        const auto c = static_cast<unsigned char>(text[i]);
        const bool none =
            text.compare(i, 3, "\xEF\xBF\xBE") == 0 || text.compare(i, 3, "\xEF\xBF\xBF") == 0;
        if (c < 0x20 || none) {
            out += "\xEF\xBF\xBD";
            if (none) i += 2;
        } else if (c == '&') {
            out += "&amp;";
        } else if (c == '<') {
            out += "&lt;";
        } else if (c == '>') {
            out += "&gt;";
        } else {
            out += text[i];
        }
    }
    return out;
}

std::string xml_attribute(const std::string &bytes) {
    std::string out;
    for (const char c : xml(bytes)) out += c == '"' ? std::string("&quot;") : std::string(1, c);
    return out;
}

std::string opened(const char *name, const attributes &with) {
    std::string out = std::string("<") + name;
    for (const auto &[key, value] : with) out += std::string(" ") + key + "=\"" + value + "\"";
    return out;
}

std::string element(const char *name, const attributes &with) {
    return opened(name, with) + "/>\n";
}

std::string text_at(double x, double y, const char *anchor, const std::string &content) {
    const attributes place = {{"x", decimal(x, 1)}, {"y", decimal(y, 1)}, {"text-anchor", anchor}};
    return opened("text", place) + ">" + content + "</text>\n";
}

std::string stroke(const char *id, const char *colour, double width, const std::string &path) {
    return element("path", {{"id", id},
                            {"fill", "none"},
                            {"stroke", colour},
                            {"stroke-width", decimal(width, 1)},
                            {"stroke-linejoin", "round"},
                            {"d", path}});
}

attributes line(double x1, double y1, double x2, double y2, const char *colour, double width,
                const char *dashes) {
    return {{"x1", decimal(x1, 2)},      {"y1", decimal(y1, 2)},
            {"x2", decimal(x2, 2)},      {"y2", decimal(y2, 2)},
            {"stroke", colour},          {"stroke-width", decimal(width, 1)},
            {"stroke-dasharray", dashes}};
}

std::string named_line(const char *id, attributes with) {
    with.insert(with.begin(), {"id", id});
    return element("line", with);
}
