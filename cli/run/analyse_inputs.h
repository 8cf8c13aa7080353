// Sends inputs to the worker processes, and their replies to the store and, in the order of the
// inputs, to the output.
#ifndef TAVO_CLI_RUN_ANALYSE_INPUTS_H
#define TAVO_CLI_RUN_ANALYSE_INPUTS_H

#include "cli/options.h"

// Returns the command's exit status; in a worker process it does not return.
int analyse_inputs(const options &opts);

#endif
