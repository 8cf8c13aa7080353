// One file becomes one record: the library's instance from creation to release.
//
// In: a path and options. Out: a record. Runs in a worker process (worker_process.h), which holds
// at most one instance at a time. After: format.h.
#ifndef TAVO_CLI_RUN_ANALYSE_H
#define TAVO_CLI_RUN_ANALYSE_H

#include <string>

#include "cli/input/song_file.h"
#include "cli/options.h"
#include "cli/run/record.h"

// stop_fd: becoming readable or closed at its other end stops the analysis through tavo_deinit.
// Returns when the file's job has ended. song receives the sound that was analysed, if path could
// be opened; the caller closes it.
record analyse(const std::string &path, const options &opts, int stop_fd, song_file &song);

#endif
