// A record as JSON: --format json, and the form in which a store and a page take it.
#ifndef TAVO_CLI_WRITE_JSON_H
#define TAVO_CLI_WRITE_JSON_H

#include <cstdint>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "cli/run/record.h"

// Keys in the order they are set, numbers as the single-precision values that results are.
using result_json = nlohmann::basic_json<nlohmann::ordered_map, std::vector, std::string, bool,
                                         int64_t, uint64_t, float>;

// Has a key for each value that the record has. JSON cannot contain a name that is not UTF-8: file
// then has U+FFFD instead of the invalid bytes, and file_bytes has the exact name, percent-encoded.
result_json json_object(const record &result);

// The object in one line.
std::string json_record(const record &result);

// The record that json_record made the text of, except the file's name. Throws std::exception for
// any other text.
record record_from_json(const std::string &text);

#endif
