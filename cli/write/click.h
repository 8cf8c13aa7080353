// The click track of one analysis: --click. The library writes the track and ignores write errors,
// so the command reports them. Without the option, no track is written.
//
// Input: the options and an output file for the track. Output: the track. Used by run/analyse.h.
#ifndef TAVO_CLI_WRITE_CLICK_H
#define TAVO_CLI_WRITE_CLICK_H

#include <string>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/write/output_file.h"

// Called before the job. Points fnamedec (tavo.h) at the temporary file of the track. Fails if the
// track would replace the input.
failure begin_click(output_file &track, const options &opts, const std::string &input);

// Called after the job. Renames a complete track to its target and removes an incomplete one.
failure finish_click(output_file &track, const options &opts, bool is_analysed);

#endif
