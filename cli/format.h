// A record as text in one of the formats, ready for standard output.
#ifndef TAVO_CLI_FORMAT_H
#define TAVO_CLI_FORMAT_H

#include <string>

#include "cli/options.h"
#include "cli/record.h"

// What comes before the first record; empty for most formats.
std::string format_head(result_format format);

// One record; empty when the format has nothing to say about it on standard output.
std::string format_record(result_format format, const record &result);

std::string text_record(const record &result);
std::string json_record(const record &result);
std::string csv_head();
std::string csv_record(const record &result);

// The label track's content, its path for an input, and the line that names it.
std::string label_track(const record &result);
std::string label_path(const std::string &input, const std::string &output_dir);
std::string labels_record(const record &result);

#endif
