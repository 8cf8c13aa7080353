// Stop signals: Ctrl-C, a termination request or a closed terminal. The first one asks the command
// to stop; the second one ends it immediately.
#ifndef TAVO_CLI_RUN_STOP_H
#define TAVO_CLI_RUN_STOP_H

// Installs the handlers. Ignores SIGPIPE and SIGXFSZ, so that a failed write returns an error
// instead. Returns false and sets errno on failure.
bool watch_for_stop();

// Ignores the stop signals in a worker process, which ends when its socket is closed.
void ignore_stop_signals();

int stop_signal();  // number of the first signal, or 0
int stop_fd();      // becomes readable after the first signal

#endif
