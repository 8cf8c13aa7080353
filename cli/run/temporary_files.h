// The temporary files that a worker process is writing, in memory that it shares with the command:
// whoever outlives the other removes them.
#ifndef TAVO_CLI_RUN_TEMPORARY_FILES_H
#define TAVO_CLI_RUN_TEMPORARY_FILES_H

#include <string>

struct temporary_files;

// Null without memory.
temporary_files *make_temporary_files();
void release_temporary_files(temporary_files *files);  // accepts null

// In a worker: makes a signal remove its files and end it, and makes note_temporary_file and
// forget_temporary_file act on them. Returns the signal's number.
int remove_files_at_signal(temporary_files *files);

// Of this process; they do nothing in the command itself.
void note_temporary_file(const std::string &path);
void forget_temporary_file(const std::string &path);

// Removes the files that are noted and not forgotten. Safe in a signal handler.
void remove_files(temporary_files *files);

#endif
