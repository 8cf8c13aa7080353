// Formats a record as text for standard output.
//
// Input: a record (run/record.h). Output: text, which run/ordered_output.h writes. Follows
// run/analyse.h.
#ifndef TAVO_CLI_WRITE_FORMAT_H
#define TAVO_CLI_WRITE_FORMAT_H

#include <string>

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

#endif
