#include "cli/write/xml.h"

#include "cli/write/file_names.h"

std::string xml_attribute(const std::string &bytes) {
    const std::string text = as_utf8(bytes);
    std::string out;
    for (size_t i = 0; i < text.size(); ++i) {
        const bool is_noncharacter =
            text.compare(i, 3, "\xEF\xBF\xBE") == 0 || text.compare(i, 3, "\xEF\xBF\xBF") == 0;
        if (static_cast<unsigned char>(text[i]) < 0x20 || is_noncharacter) {
            out += "\xEF\xBF\xBD";
            if (is_noncharacter) i += 2;
        } else if (text[i] == '&') {
            out += "&amp;";
        } else if (text[i] == '<') {
            out += "&lt;";
        } else if (text[i] == '>') {
            out += "&gt;";
        } else if (text[i] == '"') {
            out += "&quot;";
        } else {
            out += text[i];
        }
    }
    return out;
}

std::string opened(const char *name, const attributes &values) {
    std::string out = std::string("<") + name;
    for (const auto &[key, value] : values) out += std::string(" ") + key + "=\"" + value + "\"";
    return out;
}

std::string element(const char *name, const attributes &values) {
    return opened(name, values) + "/>\n";
}
