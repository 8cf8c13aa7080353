// The tag record of a file: allocated here, owned by the reader; the text buffers are malloc'ed,
// NUL-terminated UTF-8, and the source's to free.
#ifndef WEXAAUDIO_TAGS_H
#define WEXAAUDIO_TAGS_H

#include <cstddef>
#include <cstdint>

#include "media_source/wexaaudio.h"

struct AVDictionary;

// Places in wexa_tags.text. A name that has none goes to the entries (first: name, second: value);
// the encoder's name goes to last.
enum tag_slot {
    kTagTitle,
    kTagArtist,
    kTagAlbum,
    kTagGenre,
    kTagDate,
    kTagTrack,
    kTagComposer,
    kTagComment,
    kTagAlbumArtist,
};

constexpr int32_t kTagTextBytes = 4096;  // a longer text is cut

// A zeroed record, null when out of memory.
wexa_tags *tags_create(void);

// Frees the record and the buffers still in it. Null is allowed.
void tags_delete(wexa_tags *tags);

// Adds one field by its name (not case-sensitive; names as in Vorbis comments and as libavformat
// gives them). The first value of a name stays. Out of memory or out of places: left out.
void tags_add(wexa_tags *tags, const char *name, size_t name_bytes, const char *value,
              size_t value_bytes);

// From a whole ID3v2 tag (2.2 to 2.4), starting at "ID3". Damaged frames end the reading.
void tags_from_id3v2(wexa_tags *tags, const uint8_t *tag, size_t bytes);

// From a Vorbis comment block, starting at the vendor string's length.
void tags_from_vorbis(wexa_tags *tags, const uint8_t *block, size_t bytes);

// From libavformat's metadata.
void tags_from_metadata(wexa_tags *tags, const AVDictionary *metadata);

#endif
