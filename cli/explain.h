// Why a file cannot be analysed, in a sentence: tavo_init has one code for every reason, so the
// system and the media source are asked.
#ifndef TAVO_CLI_EXPLAIN_H
#define TAVO_CLI_EXPLAIN_H

#include <cstdint>
#include <string>

#include "cli/record.h"

// "what: reason of the system." from an errno value.
std::string system_sentence(const std::string &what, int code);

// Asks the media source for the type of the file's content. Returns 0 with the type code, an errno
// value when the file cannot be opened or read, -1 when it is no regular file or shorter than what
// recognition needs.
int recognise(const std::string &path, int32_t &type);

// True for every type that is audio, the refused ones included.
bool is_audio(int32_t type);

// What can be said before the file is opened as audio: empty when it is a readable regular file of
// sufficient size. Never blocks, whatever kind of file it is.
std::string explain_before_open(const std::string &path);

// After tavo_init has failed with code. library_path is the name the library was given. Fills
// what is known of the stream into about.
std::string explain_unusable(const std::string &library_path, int32_t code, record &about);

#endif
