// Recognises audio by a file's first bytes rather than by its name, and names its format for
// people. The library decides what can be analysed.
#ifndef TAVO_CLI_INPUT_RECOGNISE_H
#define TAVO_CLI_INPUT_RECOGNISE_H

#include <string>
#include <string_view>

enum class file_kind {
    unknown,
    wav,
    aiff,
    flac,
    ogg,
    mp4,
    aac,
    mpeg,  // Layers I to III, "MP3"
    asf,
    matroska,
};

constexpr size_t kKindBytes = 16;  // that recognise_bytes looks at

// head: the first bytes of a file, or those after its ID3v2 tag.
file_kind recognise_bytes(std::string_view head);

// Returns 0, or errno when the file cannot be opened or read. Anything but a regular file is
// unknown. Never blocks.
int recognise(const std::string &path, file_kind &kind);

// The format's name for people.
const char *kind_name(file_kind kind);

#endif
