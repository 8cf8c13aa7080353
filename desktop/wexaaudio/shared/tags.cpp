#include "desktop/wexaaudio/shared/tags.h"

#include <strings.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>

extern "C" {
#include <libavutil/dict.h>
}

namespace {

struct tag_name {
    const char *name;
    int32_t slot;
};

constexpr int32_t kSlotEncoder = -1;

constexpr tag_name kNames[] = {
    {"title", kTagTitle},
    {"artist", kTagArtist},
    {"album", kTagAlbum},
    {"genre", kTagGenre},
    {"date", kTagDate},
    {"year", kTagDate},
    {"track", kTagTrack},
    {"tracknumber", kTagTrack},
    {"composer", kTagComposer},
    {"comment", kTagComment},
    {"description", kTagComment},
    {"albumartist", kTagAlbumArtist},
    {"album_artist", kTagAlbumArtist},
    {"album artist", kTagAlbumArtist},
    {"encoder", kSlotEncoder},
    {"encoded-by", kSlotEncoder},
};

// A NUL-terminated copy, null when out of memory.
char *copy_text(const char *text, size_t bytes) {
    bytes = strnlen(text, std::min<size_t>(bytes, kTagTextBytes));
    char *copy = static_cast<char *>(malloc(bytes + 1));
    if (copy != nullptr) {
        memcpy(copy, text, bytes);
        copy[bytes] = '\0';
    }
    return copy;
}

void add_entry(wexa_tags *tags, const char *name, size_t name_bytes, const char *value,
               size_t value_bytes) {
    for (wexa_tag_entry &entry : tags->entry) {
        if (entry.first == nullptr) {
            entry.first = copy_text(name, name_bytes);
            entry.second = entry.first != nullptr ? copy_text(value, value_bytes) : nullptr;
            return;
        }
    }
}

uint32_t le32(const uint8_t *p) {
    return static_cast<uint32_t>(p[0]) | static_cast<uint32_t>(p[1]) << 8 |
           static_cast<uint32_t>(p[2]) << 16 | static_cast<uint32_t>(p[3]) << 24;
}

}  // namespace

wexa_tags *tags_create(void) {
    return static_cast<wexa_tags *>(calloc(1, sizeof(wexa_tags)));
}

void tags_delete(wexa_tags *tags) {
    if (tags == nullptr) {
        return;
    }
    for (const wexa_tag_text &text : tags->text) {
        free(text.data);
    }
    for (const wexa_tag_entry &entry : tags->entry) {
        free(entry.first);
        free(entry.second);
    }
    free(tags->last);
    free(tags);
}

void tags_add(wexa_tags *tags, const char *name, size_t name_bytes, const char *value,
              size_t value_bytes) {
    if (tags == nullptr || name_bytes == 0) {
        return;
    }
    for (const tag_name &known : kNames) {
        if (strlen(known.name) == name_bytes && strncasecmp(known.name, name, name_bytes) == 0) {
            void **place = known.slot == kSlotEncoder ? &tags->last : &tags->text[known.slot].data;
            if (*place == nullptr) {
                *place = copy_text(value, value_bytes);
            }
            return;
        }
    }
    add_entry(tags, name, name_bytes, value, value_bytes);
}

void tags_from_vorbis(wexa_tags *tags, const uint8_t *block, size_t bytes) {
    if (tags == nullptr || bytes < 8 || le32(block) > bytes - 8) {
        return;
    }
    const size_t vendor = le32(block);
    tags_add(tags, "encoder", 7, reinterpret_cast<const char *>(block + 4), vendor);
    uint32_t count = le32(block + 4 + vendor);
    size_t at = 8 + vendor;
    for (; count > 0 && bytes - at >= 4; --count) {
        const size_t length = le32(block + at);
        at += 4;
        if (length > bytes - at) {
            return;
        }
        const char *field = reinterpret_cast<const char *>(block + at);
        const void *equals = memchr(field, '=', length);
        if (equals != nullptr) {
            const size_t name = static_cast<size_t>(static_cast<const char *>(equals) - field);
            tags_add(tags, field, name, field + name + 1, length - name - 1);
        }
        at += length;
    }
}

void tags_from_metadata(wexa_tags *tags, const AVDictionary *metadata) {
    const AVDictionaryEntry *field = nullptr;
    while ((field = av_dict_get(metadata, "", field, AV_DICT_IGNORE_SUFFIX)) != nullptr) {
        tags_add(tags, field->key, strlen(field->key), field->value, strlen(field->value));
    }
}
