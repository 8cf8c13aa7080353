// Writes replies in the order of the inputs, whatever order they arrive in: results to
// standard output, messages to standard error. Clears the progress line first.
#ifndef TAVO_CLI_RUN_ORDERED_OUTPUT_H
#define TAVO_CLI_RUN_ORDERED_OUTPUT_H

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/report/report.h"
#include "cli/run/messages.h"
#include "cli/run/progress.h"

struct ordered_output {
    std::map<size_t, reply> waiting;  // replies that wait for those of earlier inputs
    size_t next = 0;                  // index of the next input to write
    size_t total = 0;                 // number of inputs, or 0 if not all are known yet
    size_t done = 0;                  // replies of analyses that were not stopped
    bool a_file_failed = false;
    bool reader_gone = false;  // the reader of standard output has closed it
    int write_error = 0;       // errno of any other failure on standard output
    output_file index;         // of the pages
    bool to_pipe = false;      // standard output is a pipe, whose reader may end before the command
    progress bar;
};

// Fails if the report's index cannot be created.
failure start_output(ordered_output &output, const options &opts);
void accept_reply(ordered_output &output, size_t index, reply &&answer);
void write_message(ordered_output &output, const std::string &text);
bool output_failed(const ordered_output &output);

// Call it after the last reply. Finishes the report's index and reports errors of the output and a
// stop. Returns the exit status; has_other_error: something other than a file failed.
int finish_output(ordered_output &output, const options &opts, bool has_other_error);

#endif
