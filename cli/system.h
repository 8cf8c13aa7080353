// What several parts of the command do with file descriptors and processes.
#ifndef TAVO_CLI_SYSTEM_H
#define TAVO_CLI_SYSTEM_H

#include <string>
#include <string_view>

// Closes fd and sets it to -1. Does nothing for a negative one.
void close_fd(int &fd);

// True if reading returns immediately, with bytes or because the other end is closed. Of a stop_fd
// this means that a stop was requested.
bool is_readable(int fd);

// Writes all bytes and repeats interrupted calls. Returns 0 or errno.
int write_all(int fd, std::string_view bytes);

// How a process ended, from the status of waitpid: "by signal 9 (Killed)" or "with status 1".
std::string ending_text(int status);

#endif
