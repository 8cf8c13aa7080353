// The progress line on the terminal: a bar, files done, files per minute and the time left.
#ifndef TAVO_CLI_RUN_PROGRESS_H
#define TAVO_CLI_RUN_PROGRESS_H

#include <chrono>
#include <cstddef>

struct progress {
    bool shown = false;  // standard error is a terminal, and not --quiet
    bool drawn = false;  // the line is on the terminal
    std::chrono::steady_clock::time_point started;
};

constexpr int kRedrawMs = 500;  // between two redraws

progress start_progress(bool quiet);

// Redraws the line if the work has taken at least a second, except for a single file. total: number
// of files, or 0 if it is not known yet.
void draw_progress(progress &bar, size_t done, size_t total);

// Clears the line. Call it before writing anything else to the terminal.
void clear_progress(progress &bar);

#endif
