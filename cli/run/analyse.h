// Analyses one file: creates an instance of the library, runs its job and releases it.
//
// In: a path and options. Out: a record. Runs in a worker process (worker_process.h), which has at
// most one instance at a time. Precedes write/format.h.
#ifndef TAVO_CLI_RUN_ANALYSE_H
#define TAVO_CLI_RUN_ANALYSE_H

#include <string>

#include "cli/input/song_file.h"
#include "cli/options.h"
#include "cli/run/record.h"

// Blocks until the job has ended. The job is stopped if stop_fd becomes readable or is closed at
// its other end. song receives the analysed sound, if path could be opened; the caller closes it.
record analyse(const std::string &path, const options &opts, int stop_fd, song_file &song);

#endif
