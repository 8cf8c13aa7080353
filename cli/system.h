// Helpers for file descriptors and processes, shared by several parts of the command.
#ifndef TAVO_CLI_SYSTEM_H
#define TAVO_CLI_SYSTEM_H

#include <csignal>
#include <string>
#include <string_view>

// Closes fd and sets it to -1. Does nothing if fd is negative.
void close_fd(int &fd);

// True if a read returns immediately, with bytes or because the other end is closed. For a stop_fd
// this means that a stop was requested.
bool is_readable(int fd);

// Writes all bytes and repeats interrupted calls. Returns 0 or errno.
int write_all(int fd, std::string_view bytes);

// Installs a signal handler, without SA_RESTART, so that a blocked read returns. Returns the
// previous handler.
sighandler_t set_signal_handler(int number, sighandler_t handler);

// Describes how a process ended, from the status of waitpid: "by signal 9 (Killed)" or "with status
// 1".
std::string ending_text(int status);

#endif
