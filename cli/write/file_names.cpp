#include "cli/write/file_names.h"

#include <array>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstring>

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

// The control characters of C1, two bytes in UTF-8: terminals obey them.
bool is_c1_control(const std::string &bytes, size_t i) {
    return byte_at(bytes, i) == 0xC2 && byte_at(bytes, i + 1) < 0xA0;
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
        } else if (length == 0 || byte < 0x20 || byte == 0x7F) {
            add_hex(out, "\\x", byte);
        } else if (is_c1_control(bytes, i)) {
            add_hex(out, "\\x", byte);
            add_hex(out, "\\x", byte_at(bytes, i + 1));
        } else {
            out.append(bytes, i, length);
        }
        i += length == 0 ? 1 : length;
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

std::string fitting_name(const std::string &name, const std::string &suffix) {
    if (name.size() + suffix.size() <= NAME_MAX) return name + suffix;
    std::array<char, 16> number{};
    snprintf(number.data(), number.size(), "~%08x", hash_of(name));
    size_t kept = NAME_MAX - suffix.size() - 9;
    while (kept > 0 && (static_cast<uint8_t>(name[kept]) & 0xC0) == 0x80) --kept;  // in a character
    return name.substr(0, kept) + number.data() + suffix;
}
