// The click track of one analysis. The library writes it to the path in fnamedec and says nothing
// when it cannot; here that becomes an error, and without a path no file is written at all.
#ifndef TAVO_CLI_CLICK_H
#define TAVO_CLI_CLICK_H

#include <string>

#include "cli/output_file.h"

struct click_file {
    output_file file;    // its temporary is what the library writes
    std::string direct;  // instead of file, when the target is no regular file
    bool wanted = false;
    bool force = false;  // overwrites an existing track
};

// Points fnamedec at the place for the target, at an empty path when target is empty. input: the
// file to analyse, which the click track must not replace. An existing file is refused without
// force. Returns an empty string or what failed.
std::string begin_click(click_file &click, const std::string &target, const std::string &input,
                        bool force);

// After the job: puts a complete track in place, with the RIFF chunks behind its sound, and removes
// an incomplete one. Returns as above.
std::string finish_click(click_file &click, bool analysed, const std::string &chunks);

#endif
