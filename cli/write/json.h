// Converts a record to JSON, for --format json, the store and the pages.
#ifndef TAVO_CLI_WRITE_JSON_H
#define TAVO_CLI_WRITE_JSON_H

#include <cstdint>
#include <nlohmann/json_fwd.hpp>
#include <string>
#include <vector>

#include "cli/run/record.h"

// Keeps the order in which keys are set. Numbers are single-precision, as results are.
using result_json = nlohmann::basic_json<nlohmann::ordered_map, std::vector, std::string, bool,
                                         int64_t, uint64_t, float>;

// Has a key for each value of the record. If a name is not valid UTF-8, "file" has U+FFFD in place
// of the invalid bytes, and "file_bytes" has the exact name, percent-encoded.
result_json json_object(const record &result);

// Returns the object as one line.
std::string json_record(const record &result);

// Converts the text of json_record back to a record, without the file's name. Throws std::exception
// for any other text.
record record_from_json(const std::string &text);

#endif
