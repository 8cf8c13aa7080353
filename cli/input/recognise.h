// What a file contains, by its content rather than by its name.
#ifndef TAVO_CLI_INPUT_RECOGNISE_H
#define TAVO_CLI_INPUT_RECOGNISE_H

#include <cstdint>
#include <string>

// Returns 0 with the type code of media_source/mtsrc.h, an errno value when the file cannot be
// opened or read, -1 when it is not a regular file or is shorter than recognition needs. Never
// blocks, whatever kind of file it is.
int recognise(const std::string &path, int32_t &type);

// The same for bytes from the start of a file.
int recognise_bytes(const std::string &bytes, int32_t &type);

// The format's name for people.
const char *type_name(int32_t type);

#endif
