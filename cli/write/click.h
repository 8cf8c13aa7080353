// The click track of one analysis. The library ignores write errors, so the command reports them.
// Without a request no track is written.
#ifndef TAVO_CLI_WRITE_CLICK_H
#define TAVO_CLI_WRITE_CLICK_H

#include <string>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/write/output_file.h"

// Sets fnamedec to the temporary file of track, or to opts.click itself if that is a device or a
// pipe. input: the file to analyse, which the track must not replace.
failure begin_click(output_file &track, const options &opts, const std::string &input);

// Called after the job. Renames a complete track to its target and removes an incomplete one.
// Returns an empty string or an error sentence.
failure finish_click(output_file &track, const options &opts, bool is_analysed);

#endif
