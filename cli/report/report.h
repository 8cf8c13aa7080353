// The page that shows and plays a song's result, and the index of several songs' pages: --report.
//
// In: a record (record.h). Out: HTML files that need no network.
// Pages are written in the worker, after analyse.h; the index by the command (ordered_output.h).
#ifndef TAVO_CLI_REPORT_REPORT_H
#define TAVO_CLI_REPORT_REPORT_H

#include <cstdint>
#include <string>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/run/record.h"
#include "cli/write/output_file.h"

// The file of a song's page: opts.report itself for one file, else a file in a folder beside it.
std::string report_page_path(const options &opts, uint64_t index, const std::string &song);

// Checks that a page can be written: never over a song or a device.
failure check_report(const std::string &target, bool force);

// Reads the sound of result.file, writes its page to target and makes its row of the index, if
// there is one.
failure write_report_page(const record &result, const options &opts, const std::string &target,
                          int stop_fd, std::string &row);

// The row of a song that failed.
std::string failed_report_row(const record &result);

// The index. Nothing is done where opts asks for none. What was added by the time of a stop is
// kept.
failure begin_report_index(output_file &index, const options &opts);
failure add_report_row(output_file &index, const std::string &row);
failure finish_report_index(output_file &index, const options &opts);

#endif
