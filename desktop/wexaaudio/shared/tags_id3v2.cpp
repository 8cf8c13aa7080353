// ID3v2 text frames, versions 2.2 to 2.4, in the four encodings.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/shared/tags.h"

namespace {

constexpr size_t kHeader = 10;             // bytes of the tag's header
constexpr uint8_t kUnsynchronised = 0x80;  // flag of the tag's header
constexpr uint8_t kExtended = 0x40;

struct frame_name {
    const char *id;        // 2.3 and 2.4
    const char *short_id;  // 2.2
    const char *name;
};

constexpr frame_name kFrames[] = {
    {"TIT2", "TT2", "title"},     {"TPE1", "TP1", "artist"},   {"TALB", "TAL", "album"},
    {"TCON", "TCO", "genre"},     {"TYER", "TYE", "date"},     {"TDRC", "", "date"},
    {"TRCK", "TRK", "track"},     {"TCOM", "TCM", "composer"}, {"TPE2", "TP2", "albumartist"},
    {"COMM", "COM", "comment"},   {"TSSE", "TSS", "encoder"},  {"TPUB", "TPB", "publisher"},
    {"TCOP", "TCR", "copyright"}, {"TBPM", "TBP", "bpm"},      {"TLAN", "TLA", "language"},
    {"TPOS", "TPA", "disc"},      {"TIT1", "TT1", "grouping"}, {"TIT3", "TT3", "subtitle"},
};

uint32_t be(const uint8_t *p, size_t bytes) {
    uint32_t value = 0;
    for (size_t i = 0; i < bytes; ++i) {
        value = value << 8 | p[i];
    }
    return value;
}

uint32_t synchsafe(const uint8_t *p) {
    return (p[0] & 0x7FU) << 21 | (p[1] & 0x7FU) << 14 | (p[2] & 0x7FU) << 7 | (p[3] & 0x7FU);
}

// Appends one code point; false when the text is full.
bool put_utf8(char *text, size_t *used, uint32_t code) {
    char bytes[4];
    size_t n = 0;
    if (code < 0x80) {
        bytes[n++] = static_cast<char>(code);
    } else if (code < 0x800) {
        bytes[n++] = static_cast<char>(0xC0 | code >> 6);
        bytes[n++] = static_cast<char>(0x80 | (code & 0x3F));
    } else if (code < 0x10000) {
        bytes[n++] = static_cast<char>(0xE0 | code >> 12);
        bytes[n++] = static_cast<char>(0x80 | (code >> 6 & 0x3F));
        bytes[n++] = static_cast<char>(0x80 | (code & 0x3F));
    } else {
        bytes[n++] = static_cast<char>(0xF0 | code >> 18);
        bytes[n++] = static_cast<char>(0x80 | (code >> 12 & 0x3F));
        bytes[n++] = static_cast<char>(0x80 | (code >> 6 & 0x3F));
        bytes[n++] = static_cast<char>(0x80 | (code & 0x3F));
    }
    if (*used + n > static_cast<size_t>(kTagTextBytes)) {
        return false;
    }
    memcpy(text + *used, bytes, n);
    *used += n;
    return true;
}

// UTF-16 with or without a byte order mark (then big-endian); stops at a zero.
size_t from_utf16(const uint8_t *p, size_t bytes, char *text) {
    bool little = false;
    if (bytes >= 2 && ((p[0] == 0xFF && p[1] == 0xFE) || (p[0] == 0xFE && p[1] == 0xFF))) {
        little = p[0] == 0xFF;
        p += 2;
        bytes -= 2;
    }
    size_t used = 0;
    uint32_t high = 0;
    for (size_t i = 0; i + 1 < bytes; i += 2) {
        uint32_t unit = little ? p[i] | static_cast<uint32_t>(p[i + 1]) << 8 : be(p + i, 2);
        if (unit == 0) {
            break;
        }
        if (unit >= 0xD800 && unit < 0xDC00) {
            high = unit;
            continue;
        }
        if (unit >= 0xDC00 && unit < 0xE000) {
            unit = high != 0 ? 0x10000 + ((high - 0xD800) << 10) + (unit - 0xDC00) : 0xFFFD;
        }
        high = 0;
        if (!put_utf8(text, &used, unit)) {
            break;
        }
    }
    return used;
}

// A frame's text, whose first byte names the encoding, as UTF-8. Returns its bytes.
size_t decode_text(uint8_t encoding, const uint8_t *p, size_t bytes, char *text) {
    if (encoding == 1 || encoding == 2) {
        return from_utf16(p, bytes, text);
    }
    size_t used = 0;
    for (size_t i = 0; i < bytes && p[i] != 0; ++i) {
        if (encoding == 3) {
            if (used == static_cast<size_t>(kTagTextBytes)) {
                break;
            }
            text[used++] = static_cast<char>(p[i]);
        } else if (!put_utf8(text, &used, p[i])) {  // ISO 8859-1
            break;
        }
    }
    return used;
}

// A comment starts with a language and a description, ended by a zero of the encoding's width.
size_t comment_start(uint8_t encoding, const uint8_t *p, size_t bytes) {
    const size_t width = encoding == 1 || encoding == 2 ? 2 : 1;
    for (size_t i = 3; i + width <= bytes; i += width) {
        if (p[i] == 0 && (width == 1 || p[i + 1] == 0)) {
            return i + width;
        }
    }
    return bytes;
}

void add_frame(wexa_tags *tags, const uint8_t *id, size_t id_bytes, const uint8_t *body,
               size_t bytes) {
    for (const frame_name &known : kFrames) {
        const char *wanted = id_bytes == 4 ? known.id : known.short_id;
        if (strlen(wanted) != id_bytes || memcmp(wanted, id, id_bytes) != 0 || bytes < 2) {
            continue;
        }
        const uint8_t encoding = body[0];
        const size_t from = id[0] == 'C' ? comment_start(encoding, body + 1, bytes - 1) : 0;
        char text[kTagTextBytes];
        const size_t used = decode_text(encoding, body + 1 + from, bytes - 1 - from, text);
        if (used > 0) {
            tags_add(tags, known.name, strlen(known.name), text, used);
        }
        return;
    }
}

// Undoes unsynchronisation (a zero follows every 0xFF) into a malloc'ed copy; null when out of
// memory.
uint8_t *resynchronise(const uint8_t *p, size_t bytes, size_t *used) {
    uint8_t *copy = static_cast<uint8_t *>(malloc(bytes + 1));
    *used = 0;
    for (size_t i = 0; copy != nullptr && i < bytes; ++i) {
        copy[(*used)++] = p[i];
        if (p[i] == 0xFF && i + 1 < bytes && p[i + 1] == 0) {
            ++i;
        }
    }
    return copy;
}

struct frame_flags {
    bool readable;        // neither compressed nor encrypted
    bool unsynchronised;  // 2.4: this frame alone
    size_t extra;         // bytes before the body
};

frame_flags read_flags(uint8_t version, uint8_t format) {
    if (version == 4) {
        const size_t extra = ((format & 0x40) != 0 ? 1U : 0U) + ((format & 0x01) != 0 ? 4U : 0U);
        return {(format & 0x0C) == 0, (format & 0x02) != 0, extra};
    }
    if (version == 3) {
        return {(format & 0xC0) == 0, false, (format & 0x20) != 0 ? 1U : 0U};
    }
    return {true, false, 0};
}

void add_body(wexa_tags *tags, const uint8_t *id, size_t id_bytes, const frame_flags &flags,
              const uint8_t *body, size_t bytes) {
    if (!flags.readable || flags.extra > bytes) {
        return;
    }
    body += flags.extra;
    bytes -= flags.extra;
    if (!flags.unsynchronised) {
        add_frame(tags, id, id_bytes, body, bytes);
        return;
    }
    size_t used = 0;
    uint8_t *plain = resynchronise(body, bytes, &used);
    if (plain != nullptr) {
        add_frame(tags, id, id_bytes, plain, used);
        free(plain);
    }
}

// The frames between the tag's header and its end.
void read_frames(wexa_tags *tags, uint8_t version, bool extended, const uint8_t *p, size_t bytes) {
    const size_t id_bytes = version == 2 ? 3 : 4;
    const size_t head = version == 2 ? 6 : 10;
    size_t at = 0;
    if (extended && version != 2 && bytes >= 4) {
        const size_t size = version == 4 ? synchsafe(p) : be(p, 4) + size_t{4};
        at = std::min(size, bytes);
    }
    while (bytes - at > head && p[at] != 0) {
        const uint8_t *frame = p + at;
        const size_t size = version == 2   ? be(frame + 3, 3)
                            : version == 4 ? synchsafe(frame + 4)
                                           : be(frame + 4, 4);
        at += head;
        if (size > bytes - at) {
            return;
        }
        const frame_flags flags = read_flags(version, version == 2 ? uint8_t{0} : frame[9]);
        add_body(tags, frame, id_bytes, flags, frame + head, size);
        at += size;
    }
}

}  // namespace

void tags_from_id3v2(wexa_tags *tags, const uint8_t *tag, size_t bytes) {
    if (tags == nullptr || bytes < kHeader || memcmp(tag, "ID3", 3) != 0 || tag[3] < 2 ||
        tag[3] > 4) {
        return;
    }
    const size_t body = std::min<size_t>(bytes - kHeader, synchsafe(tag + 6));
    const bool extended = (tag[5] & kExtended) != 0;
    if (tag[3] == 4 || (tag[5] & kUnsynchronised) == 0) {
        read_frames(tags, tag[3], extended, tag + kHeader, body);
        return;
    }
    size_t used = 0;
    uint8_t *plain = resynchronise(tag + kHeader, body, &used);
    if (plain != nullptr) {
        read_frames(tags, tag[3], extended, plain, used);
        free(plain);
    }
}
