// Names of the temporary files that a worker process writes, in memory shared with the command. If
// either process dies, the other removes them.
#ifndef TAVO_CLI_RUN_TEMPORARY_FILES_H
#define TAVO_CLI_RUN_TEMPORARY_FILES_H

#include <climits>
#include <memory>
#include <string>

struct temporary_files {
    char paths[4][PATH_MAX];  // click track, page, markers and clip; or empty
};

// Returns null if memory runs out.
std::shared_ptr<temporary_files> make_temporary_files();

// Called in a worker. From then on, a signal removes the files and ends the worker, and the next
// two functions have an effect. Returns the number of the signal.
int remove_files_at_signal(temporary_files &files);

// Adds or removes the name of a file of this worker. Does nothing in the command itself.
void note_temporary_file(const std::string &path);
void forget_temporary_file(const std::string &path);

// Removes the listed files. Safe in a signal handler.
void remove_files(temporary_files &files);

#endif
