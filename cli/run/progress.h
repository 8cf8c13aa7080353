// One line on the terminal with the state of the work: a bar, files done, files a minute and the
// time left.
#ifndef TAVO_CLI_RUN_PROGRESS_H
#define TAVO_CLI_RUN_PROGRESS_H

#include <chrono>
#include <cstddef>

struct progress {
    bool shown = false;  // whether there may be a line: on a terminal, not quiet
    bool drawn = false;  // the line is on the terminal now
    size_t total = 0;    // files; 0 while not all are known
    std::chrono::steady_clock::time_point started;
};

constexpr int kRedrawMs = 500;

progress start_progress(bool quiet);

// Redraws the line, once the work has taken a second. Draws nothing for a single file.
void draw_progress(progress &bar, size_t done);

// Clears the line; call this before writing anything else to the terminal.
void clear_progress(progress &bar);

#endif
