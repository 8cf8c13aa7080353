// The page that shows and plays a song's result, and the index of several songs' pages: --report.
//
// In: a record (record.h) and its song_view. Out: HTML files that work without a network. The
// worker writes the pages after analyse.h; the command writes the index (ordered_output.h).
#ifndef TAVO_CLI_REPORT_REPORT_H
#define TAVO_CLI_REPORT_REPORT_H

#include <cstdint>
#include <string>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/run/record.h"
#include "cli/write/output_file.h"

// Path of a song's page: opts.report itself for a single file, otherwise a file in a folder beside
// it.
std::string report_page_path(const options &opts, uint64_t index, const std::string &song);

// Checks that a page can be written; it must not replace a song or a device. Returns an empty
// string or an error sentence.
failure check_report(const std::string &target, bool force);

// Reads the sound of result.file, writes its page and creates its row of the index. Stores a
// failure or a stop in the record.
failure write_report_page(const record &result, const options &opts, const std::string &target,
                          int stop_fd, std::string &row);

// Returns the row of a song that failed.
std::string failed_report_row(const record &result);

// Writes the index. Does nothing if opts requests none. After a stop it keeps the rows added so
// far.
failure begin_report_index(output_file &index, const options &opts);
failure add_report_row(output_file &index, const std::string &row);
failure finish_report_index(output_file &index, const options &opts);

#endif
