// The command's side of the worker processes: hands out the inputs, collects the replies and
// writes them in the order of the inputs.
#ifndef TAVO_CLI_RUN_WORKERS_H
#define TAVO_CLI_RUN_WORKERS_H

#include <functional>
#include <string>

#include "cli/options.h"
#include "cli/run/worker.h"

// Told of every result as it comes, in any order; may be empty.
using reply_sink = std::function<void(const std::string &path, const reply &made)>;

// Returns the command's exit status. Single-threaded, so that a fork is safe at any moment; in a
// worker process it does not return.
int run_workers(const options &opts, const reply_sink &sink);

#endif
