// Converts a record to JSON, for --format json and csv, the store and the pages.
//
// Input: a record (run/record.h). Output: JSON. Follows run/analyse.h.
#ifndef TAVO_CLI_WRITE_JSON_H
#define TAVO_CLI_WRITE_JSON_H

#include <cstdint>
#include <nlohmann/json_fwd.hpp>
#include <string>
#include <vector>

#include "cli/run/record.h"

// Keeps the order in which keys are set. Numbers have single precision, like the results.
using result_json = nlohmann::basic_json<nlohmann::ordered_map, std::vector, std::string, bool,
                                         int64_t, uint64_t, float>;

// Returns an object with a key for each value that the record has. If the file's name is not valid
// UTF-8, "file" has U+FFFD in place of the invalid bytes, and "file_bytes" has the exact name,
// percent-encoded.
result_json json_object(const record &result);

// Returns the object as one line of text.
std::string json_record(const record &result);

// Converts the text of json_record back to a record without the file's name. Throws std::exception
// if the text is not of that form.
record record_from_json(const std::string &text);

#endif
