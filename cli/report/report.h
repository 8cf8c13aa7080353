// The page that plays a song and shows its result, and the index of several such pages: --report.
//
// Input: a record (run/record.h) and its view (song_view.h). Output: HTML files that work offline.
// Follows run/analyse.h. run/reply.h writes the pages, run/ordered_output.h the index.
#pragma once

#include <cstdint>
#include <string>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/run/record.h"
#include "cli/write/output_file.h"

// Returns the path of a song's page: opts.report for a single file, otherwise a file in the pages
// folder.
std::string report_page_path(const options &opts, uint64_t index, const std::string &song);

// Checks that a page can be written. A page never replaces a song.
failure check_report(const std::string &target, bool force);

// Reads the song's sound, writes its page and stores its index row in `row`. Fails if stop_fd
// becomes readable, which requests a stop.
failure write_report_page(const record &result, const options &opts, const std::string &target,
                          int stop_fd, std::string &row);

// Returns the index row of a song that failed.
std::string failed_report_row(const record &result);

// These functions write the index if the options request one, and otherwise do nothing. After a
// stop, the index has the rows that were added before the stop.
failure begin_report_index(output_file &index, const options &opts);
failure add_report_row(output_file &index, const std::string &row);
failure finish_report_index(output_file &index, const options &opts);
