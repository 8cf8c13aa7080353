// One line on the terminal that tells how far the work is: a bar, files done, files a minute and
// the time left.
#ifndef TAVO_CLI_PROGRESS_H
#define TAVO_CLI_PROGRESS_H

#include <chrono>
#include <cstddef>

struct progress {
    bool shown = false;  // whether there is a line at all: a terminal, several files, not quiet
    bool drawn = false;  // the line is on the terminal now
    size_t total = 0;    // files
    std::chrono::steady_clock::time_point started;
};

constexpr int kRedrawMs = 500;

progress start_progress(size_t total, bool quiet);

// Draws the line anew, once the work has taken a moment.
void draw_progress(progress &bar, size_t done);

// Takes the line off the terminal, before anything else is written there.
void clear_progress(progress &bar);

#endif
