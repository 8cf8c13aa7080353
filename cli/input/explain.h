// Why a file cannot be analysed, in a sentence: tavo_init has one code for every reason, so the
// system and the media source are asked.
#ifndef TAVO_CLI_INPUT_EXPLAIN_H
#define TAVO_CLI_INPUT_EXPLAIN_H

#include <cstdint>
#include <string>

#include "cli/run/record.h"

// What can be said before the file is opened as audio: empty when it is a readable regular file of
// sufficient size. Never blocks, whatever kind of file it is.
std::string explain_before_open(const std::string &path);

// After tavo_init has failed with code. path is the one that the library was given. Fills
// what is known of the stream into result.
std::string explain_unusable(const std::string &path, int32_t code, record &result);

#endif
