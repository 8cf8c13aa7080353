// Helpers for file descriptors, signals and processes, shared by several parts of the command.
#pragma once

#include <sys/types.h>

#include <climits>
#include <memory>
#include <string>
#include <string_view>

// Closes fd and sets it to -1. Does nothing if fd is negative.
void close_fd(int &fd);

// True if a read would return immediately, with bytes or because the other end is closed. A
// readable stop_fd means that a stop was requested.
bool is_readable(int fd);

// Writes all bytes; continues after an interrupted call. Returns 0 or errno.
int write_all(int fd, std::string_view bytes);

// Waits for a child process to end. Returns the waitpid status.
int wait_for_end(pid_t pid);

// Converts a waitpid status to words: "by signal 9 (Killed)" or "with status 1".
std::string ending_text(int status);

// ---- Stop signals: Ctrl-C, a termination request or a closed terminal. The first one asks the
// command to stop; the second one ends it immediately.

// Installs the handlers, which interrupt blocked calls. Ignores SIGPIPE and SIGXFSZ, so that a
// failed write returns an error instead.
void watch_for_stop();

int stop_signal();  // number of the first signal, or 0

// ---- The temporary file of a worker process.

// The path of the temporary file that a worker process is writing. The worker shares this memory
// with the command: if either process dies, the other one removes the file.
struct temporary_file {
    char path[PATH_MAX];  // empty if there is no file
};

// Returns null if memory runs out.
std::shared_ptr<temporary_file> share_temporary_file();

// Called in a worker. From then on, note_temporary_file stores its path in `file`, SIGALRM removes
// the temporary file and ends the worker, and the stop signals are ignored.
void set_worker_signals(temporary_file &file);

// Stores the path of this worker's temporary file, or an empty path once the file is gone. A worker
// has at most one such file at a time. Does nothing in the command itself.
void note_temporary_file(const std::string &path);

// Removes the file, if there is one. Safe in a signal handler.
void remove_file(temporary_file &file);
