// Analyses one file: creates a library instance, runs its job and releases the instance.
//
// Input: a path and options. Output: a record. Follows input/song_file.h; precedes write/format.h.
// Runs in a worker process, which has at most one instance at a time.
#pragma once

#include <string>

#include "cli/input/song_file.h"
#include "cli/options.h"
#include "cli/run/record.h"

// Returns after the job has ended. If stop_fd becomes readable, the job is stopped. If the path
// could be opened, `song` receives the sound that was analysed, and the caller closes it.
record analyse(const std::string &path, const options &opts, int stop_fd, song_file &song);
