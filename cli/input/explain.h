// Explains why a file cannot be analysed. tavo_init returns the same code for every such file, so
// the reason comes from the system or from tavo_probe.
#ifndef TAVO_CLI_INPUT_EXPLAIN_H
#define TAVO_CLI_INPUT_EXPLAIN_H

#include <cstdint>
#include <string>

#include "cli/failure.h"
#include "cli/run/record.h"

// Checks that the file at `path` is a readable regular file of sufficient size. Never blocks,
// whatever kind of file it is.
failure check_file(const std::string &path);

// Returns the reason why tavo_init failed with `code`. path: as passed to the library. Stores
// the known properties of the stream in result.
failure explain_refusal(const std::string &path, int32_t code, record &result);

// Refuses a file that states a longer duration than the user allows.
failure check_duration(int64_t duration_ms, int32_t max_minutes);

#endif
