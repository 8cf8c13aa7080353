// The click track of one analysis. The library ignores write errors; the command reports them. No
// track is written unless one was asked for.
#ifndef TAVO_CLI_WRITE_CLICK_H
#define TAVO_CLI_WRITE_CLICK_H

#include <string>

#include "cli/write/output_file.h"

struct click_file {
    output_file file;    // its temporary is what the library writes
    std::string direct;  // instead of file, when the target is no regular file
    bool wanted = false;
    bool force = false;  // overwrites an existing track
};

// Points fnamedec at a place for the target, or at an empty path when target is empty. input: the
// file to analyse, which the click track must not replace. Without force an existing file is
// refused. Returns an empty string or a sentence.
std::string begin_click(click_file &click, const std::string &target, const std::string &input,
                        bool force);

// After the job: gives a complete track its name and removes an incomplete one. Returns as above.
std::string finish_click(click_file &click, bool analysed);

#endif
