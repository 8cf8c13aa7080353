// The user's wish to stop: Ctrl-C, a termination request or a closed terminal. The first one is
// noted and wakes the command, the second one ends it at once.
#ifndef TAVO_CLI_RUN_STOP_H
#define TAVO_CLI_RUN_STOP_H

// Installs the handlers and makes failed writes an error instead of a signal.
// Returns false when the system refuses.
bool watch_for_stop();

// In a worker process, which ends with its request pipe: ignores these signals there.
void ignore_stop_signals();

bool stop_requested();
int stop_signal();  // its number, 0 without a request
int stop_fd();      // readable once a stop was requested

#endif
