// Writes replies in the order of the inputs, whatever order they arrive in: results to standard
// output, messages to standard error. The progress line is cleared first.
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
    std::map<size_t, reply> waiting;  // for earlier inputs
    size_t next = 0;                  // input to write
    size_t total = 0;                 // inputs; 0 while not all are known
    size_t done = 0;                  // replies of analyses that were not stopped
    bool a_file_failed = false;
    bool reader_gone = false;  // standard output was closed by its reader, with results to come
    int write_error = 0;       // errno of any other failure on standard output
    report_index index;
    bool to_pipe = false;  // standard output is a pipe, whose reader may go
    progress bar;
};

// Fails if the report's index cannot be begun.
failure start_output(ordered_output &out, const options &opts);
void set_total(ordered_output &out, size_t total);  // once all inputs are known
void accept_reply(ordered_output &out, size_t index, reply &&made);
void write_message(ordered_output &out, const std::string &text);
void note_reader_gone(ordered_output &out);
bool output_failed(const ordered_output &out);

int redraw_timeout_ms(const ordered_output &out);  // for poll: -1 when there is no line
void redraw(ordered_output &out);

// After the last reply: finishes the report's index, says what went wrong with the output and that
// the work was stopped, if it was. Returns the exit status; has_other_error: something but a file
// has failed.
int finish_output(ordered_output &out, const options &opts, bool has_other_error);

#endif
