// What a catalogue needs, from a random sample of it: --forecast.
//
// In: a list of files. Out: on standard output, means with their 95 % intervals and what all files
// need. Runs the sample through workers.h.
#ifndef TAVO_CLI_RUN_FORECAST_H
#define TAVO_CLI_RUN_FORECAST_H

#include "cli/options.h"

// Returns the command's exit status.
int run_forecast(const options &opts);

#endif
