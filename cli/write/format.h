// Formats a record as text for standard output and as JSON, also for the store and the pages.
//
// Input: a record (run/record.h). Output: text, which run/ordered_output.h writes, or JSON. Follows
// run/analyse.h.
#pragma once

#include <cstdint>
#include <nlohmann/json_fwd.hpp>
#include <string>
#include <vector>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/run/record.h"

// Returns the text before the first record; empty for most formats.
std::string format_head(result_format format);

// Returns the text of one record; empty if the format does not print it.
std::string format_record(const options &opts, const record &result);

// Fills a template of --print: appends its text to `filled`, with each {field} and each escape such
// as \n replaced. Fails for an unknown field.
failure fill_template(const std::string &text, const record &result, std::string &filled);

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
