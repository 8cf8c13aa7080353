// The click track of one analysis, which the library writes without reporting errors. None is
// written without --click.
#ifndef TAVO_CLI_WRITE_CLICK_H
#define TAVO_CLI_WRITE_CLICK_H

#include <string>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/write/output_file.h"

// Sets fnamedec for opts.click: to the temporary file of track, or to opts.click itself if it is a
// device or a pipe. input: the file to analyse, which the track must not replace.
failure begin_click(output_file &track, const options &opts, const std::string &input);

// After the job: gives a complete track its name and removes any other.
failure finish_click(output_file &track, const options &opts, bool is_analysed);

#endif
