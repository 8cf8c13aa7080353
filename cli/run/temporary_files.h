// The names of the temporary files that a worker process is writing, in memory shared with the
// command: either removes them after the death of the other.
#ifndef TAVO_CLI_RUN_TEMPORARY_FILES_H
#define TAVO_CLI_RUN_TEMPORARY_FILES_H

#include <climits>
#include <string>

struct temporary_files {
    char paths[4][PATH_MAX];  // of a click track, a page, markers, a clip; an empty one is free
};

// Returns null if memory is short.
temporary_files *make_temporary_files();
void release_temporary_files(temporary_files *files);  // accepts null

// Call it in a worker. From then on a signal, whose number it returns, removes the files and ends
// the worker, and the two functions below enter files here.
int remove_files_at_signal(temporary_files *files);

// Enter and delete a file of this worker. In the command itself they do nothing.
void note_temporary_file(const std::string &path);
void forget_temporary_file(const std::string &path);

// Removes the files that are entered. Safe in a signal handler.
void remove_files(temporary_files *files);

#endif
