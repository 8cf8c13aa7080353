// The page that shows and plays a song's result, and the index of several songs' pages: --report.
//
// In: a record (record.h) and its song_view. Out: HTML files that need no network.
// Pages are written in the worker, after analyse.h; the index by the command (ordered_output.h).
#ifndef TAVO_CLI_REPORT_REPORT_H
#define TAVO_CLI_REPORT_REPORT_H

#include <cstdint>
#include <string>

#include "cli/options.h"
#include "cli/report/song_view.h"
#include "cli/run/record.h"
#include "cli/write/output_file.h"

// The file of a song's page: opts.report itself for one file, else a file in a folder beside it.
std::string report_page_path(const options &opts, uint64_t index, const std::string &song);

// Checks that a page can be written: never over a song or a device. Returns an empty string or a
// sentence.
std::string check_report(const std::string &target, bool force);

// Reads the sound of result.file, writes its page and makes its row of the index. A failure or a
// stop is entered into the record.
void write_report_page(record &result, const options &opts, const std::string &target, int stop_fd,
                       std::string &row);

// A row of the index. page: relative to the index; empty for a song that failed.
std::string report_index_row(const record &result, const song_view &view, const std::string &page);

// The index under way; nothing is done where opts asks for none. These return an empty string or a
// sentence. What was added by the time of a stop is kept.
struct report_index {
    output_file file;
    bool open = false;
};
std::string begin_report_index(report_index &index, const options &opts);
std::string add_report_row(report_index &index, const std::string &row);
std::string finish_report_index(report_index &index, const options &opts);

#endif
