// Recognises audio by the first bytes of a file, whatever its name, and names the format for
// messages. The library decides whether the file can be analysed.
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

constexpr size_t kKindBytes = 16;  // needed by recognise_bytes

// head: the first bytes of a file, or of what follows its ID3v2 tag.
file_kind recognise_bytes(std::string_view head);

// Returns 0, or errno if the file cannot be opened or read. Anything but a regular file is unknown.
// Never blocks.
int recognise(const std::string &path, file_kind &kind);

// Returns the format's name for people.
const char *kind_name(file_kind kind);

#endif
