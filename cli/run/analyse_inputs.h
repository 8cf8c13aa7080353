// From the inputs to the results: hands inputs to the worker processes, their replies to the store
// and to the output, in the order of the inputs.
#ifndef TAVO_CLI_RUN_ANALYSE_INPUTS_H
#define TAVO_CLI_RUN_ANALYSE_INPUTS_H

#include "cli/options.h"

// Returns the command's exit status; in a worker process it does not return.
int analyse_inputs(const options &opts);

#endif
