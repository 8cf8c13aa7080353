// Why a file cannot be analysed: tavo_init has one code for every reason, so the system and
// tavo_probe are asked.
#ifndef TAVO_CLI_INPUT_EXPLAIN_H
#define TAVO_CLI_INPUT_EXPLAIN_H

#include <cstdint>
#include <string>

#include "cli/failure.h"
#include "cli/run/record.h"

// Checks that the file at path is a readable regular file of sufficient size. Never blocks,
// whatever kind of file it is.
failure check_file(const std::string &path);

// The reason for a failure of tavo_init with code; path is the one that the library was given.
// Fills what is known of the stream into result.
failure explain_refusal(const std::string &path, int32_t code, record &result);

// Refuses audio that is longer than the user allows, by the duration that the file states.
failure check_duration(int64_t duration_ms, int32_t max_minutes);

#endif
