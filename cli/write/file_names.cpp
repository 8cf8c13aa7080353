#include "cli/write/file_names.h"

#include <algorithm>
#include <array>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <memory>

namespace {

constexpr const char *kHex = "0123456789ABCDEF";

uint8_t byte_at(const std::string &bytes, size_t i) {
    return i < bytes.size() ? static_cast<uint8_t>(bytes[i]) : uint8_t{0};
}

// Length of the character that starts at i, 0 when none does: no overlong forms, no surrogates,
// nothing beyond U+10FFFF.
size_t character_length(const std::string &bytes, size_t i) {
    const uint8_t lead = byte_at(bytes, i);
    if (lead < 0x80) return 1;
    const size_t length = lead < 0xC2 ? 0 : lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : lead < 0xF5 ? 4 : 0;
    if (length == 0 || i + length > bytes.size()) return 0;
    for (size_t k = 1; k < length; ++k) {
        if ((byte_at(bytes, i + k) & 0xC0) != 0x80) return 0;
    }
    const uint8_t second = byte_at(bytes, i + 1);
    if (lead == 0xE0 && second < 0xA0) return 0;
    if (lead == 0xED && second >= 0xA0) return 0;
    if (lead == 0xF0 && second < 0x90) return 0;
    if (lead == 0xF4 && second >= 0x90) return 0;
    return length;
}

void add_hex(std::string &out, const char *before, uint8_t byte) {
    out += before;
    out += kHex[byte >> 4];
    out += kHex[byte & 15];
}

uint32_t code_point(const std::string &bytes, size_t i, size_t length) {
    uint32_t point = byte_at(bytes, i) & (length == 1 ? 0x7Fu : 0xFFu >> (length + 1));
    for (size_t k = 1; k < length; ++k) point = point << 6 | (byte_at(bytes, i + k) & 0x3Fu);
    return point;
}

// Characters that move the cursor or reorder the text of a terminal: control characters, line
// separators, and marks of the writing direction.
bool is_control(uint32_t point) {
    struct range {
        uint32_t first, last;
    };
    constexpr range kControls[] = {{0, 0x1F},        {0x7F, 0x9F},     {0x61C, 0x61C},
                                   {0x200E, 0x200F}, {0x2028, 0x202E}, {0x2066, 0x2069}};
    return std::any_of(std::begin(kControls), std::end(kControls), [=](const range &controls) {
        return point >= controls.first && point <= controls.last;
    });
}

// FNV-1a
uint32_t hash_of(const std::string &bytes) {
    uint32_t hash = 2'166'136'261u;
    for (const char byte : bytes) hash = (hash ^ static_cast<uint8_t>(byte)) * 16'777'619u;
    return hash;
}

}  // namespace

bool is_utf8(const std::string &bytes) {
    for (size_t i = 0; i < bytes.size();) {
        const size_t length = character_length(bytes, i);
        if (length == 0) return false;
        i += length;
    }
    return true;
}

std::string shown(const std::string &bytes) {
    std::string out;
    for (size_t i = 0; i < bytes.size();) {
        const size_t length = character_length(bytes, i);
        const uint8_t byte = byte_at(bytes, i);
        if (byte == '\n') {
            out += "\\n";
        } else if (byte == '\t') {
            out += "\\t";
        } else if (byte == '\\') {
            out += "\\\\";
        } else if (length == 0 || is_control(code_point(bytes, i, length))) {
            for (size_t k = 0; k < std::max<size_t>(length, 1); ++k) {
                add_hex(out, "\\x", byte_at(bytes, i + k));
            }
        } else {
            out.append(bytes, i, length);
        }
        i += length == 0 ? 1 : length;
    }
    return out;
}

std::string json_text(const std::string &utf8) {
    std::string out;
    for (size_t i = 0; i < utf8.size();) {
        const size_t length = std::max<size_t>(character_length(utf8, i), 1);
        const uint32_t point = code_point(utf8, i, length);
        if (is_control(point)) {
            add_hex(out, "\\u", static_cast<uint8_t>(point >> 8));
            add_hex(out, "", static_cast<uint8_t>(point & 0xFF));
        } else {
            out.append(utf8, i, length);
        }
        i += length;
    }
    return out;
}

std::string as_utf8(const std::string &bytes) {
    std::string out;
    for (size_t i = 0; i < bytes.size();) {
        const size_t length = character_length(bytes, i);
        if (length == 0) {
            out += "\xEF\xBF\xBD";
            ++i;
        } else {
            out.append(bytes, i, length);
            i += length;
        }
    }
    return out;
}

std::string percent_encoded(const std::string &bytes) {
    std::string out;
    for (const char c : bytes) {
        const bool plain = (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
                           (c >= '0' && c <= '9') || (c != '\0' && strchr("-._~/", c) != nullptr);
        if (plain) {
            out += c;
        } else {
            add_hex(out, "%", static_cast<uint8_t>(c));
        }
    }
    return out;
}

std::string base_name(const std::string &path) {
    const size_t slash = path.rfind('/');
    return slash == std::string::npos ? path : path.substr(slash + 1);
}

std::string stem(const std::string &name) {
    const size_t period = name.rfind('.');
    return period == 0 ? name : name.substr(0, period);
}

std::string file_url(const std::string &path) {
    const std::unique_ptr<char, decltype(&free)> whole(realpath(path.c_str(), nullptr), free);
    return "file://" + percent_encoded(whole == nullptr ? path : whole.get());
}

std::string fitting_name(const std::string &name, const std::string &suffix) {
    if (name.size() + suffix.size() <= NAME_MAX) return name + suffix;
    std::array<char, 16> number{};
    snprintf(number.data(), number.size(), "~%08x", hash_of(name));
    size_t kept = NAME_MAX - suffix.size() - 9;
    while (kept > 0 && (static_cast<uint8_t>(name[kept]) & 0xC0) == 0x80) --kept;  // in a character
    return name.substr(0, kept) + number.data() + suffix;
}
