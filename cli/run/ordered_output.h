// Writes replies in the order of the inputs, whatever order they arrive in: results to standard
// output, messages to standard error. On a terminal it also draws a progress line: a bar, files
// done, files per minute and the time left.
//
// Input: replies of worker processes. Used by main.cpp.
#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <string>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/report/report.h"
#include "cli/run/reply.h"

struct ordered_output {
    std::map<size_t, reply> waiting;  // replies waiting for those of earlier inputs
    size_t next = 0;                  // index of the input whose reply is next
    size_t total = 0;                 // number of inputs, or 0 if not all are known yet
    size_t done = 0;                  // replies of analyses that were not stopped
    bool has_failure = false;         // a file failed, or a failure was reported
    int write_error = 0;              // errno of standard output; EPIPE if its reader closed it
    output_file index;                // of the pages
    bool has_bar = false;             // standard error is a terminal, and not --quiet
    bool is_drawn = false;            // the progress line is on the terminal
    std::chrono::steady_clock::time_point started;
};

// Fails if the report's index cannot be created.
failure start_output(ordered_output &output, const options &opts);

// Writes the reply of input `index` once the replies of all earlier inputs have arrived.
void accept_reply(ordered_output &output, size_t index, reply &&answer);

// Writes to standard error, after clearing the progress line.
void write_message(ordered_output &output, const std::string &text);

// Writes a failure that concerns no single file. Returns false if `failed` is not a failure.
bool report_failure(ordered_output &output, const failure &failed);

// Redraws the progress line if the work has taken at least a second, except for a single file.
void draw_progress(ordered_output &output);

// Finishes the report's index and reports output errors and a stop. Call it after the last
// reply. Returns the exit status.
int finish_output(ordered_output &output, const options &opts);
