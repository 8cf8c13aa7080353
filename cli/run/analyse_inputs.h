// Runs the command: sends inputs to the worker processes, and their replies to the store and to the
// output.
//
// Input: options. Output: an exit status. Uses input/inputs.h, process_pool.h, ordered_output.h and
// store/store.h.
#ifndef TAVO_CLI_RUN_ANALYSE_INPUTS_H
#define TAVO_CLI_RUN_ANALYSE_INPUTS_H

#include "cli/options.h"

// Returns the command's exit status; in a worker process it does not return.
int analyse_inputs(const options &opts);

#endif
