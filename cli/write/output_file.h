// Output files, written atomically: a target is replaced by a complete file or stays unchanged.
#pragma once

#include <string>

#include "cli/failure.h"

// A temporary file in the target's folder, with the permissions of a new file.
struct output_file {
    std::string target;
    std::string temporary;  // path; empty before begin_output and after the file is gone
    int fd = -1;            // open for writing, or -1
};

// True if both paths refer to the same existing file.
bool same_file(const std::string &a, const std::string &b);

// Checks that the target can be written: its folder is writable, and the target does not exist or,
// with force, is a regular file, not a link or a device. Creates nothing.
failure check_target(const std::string &target, bool force);

// Creates the temporary file. Its name ends in `ending`, for programs that choose a format from the
// extension.
failure begin_output(output_file &file, const std::string &target, const std::string &ending = "");
failure write_output(output_file &file, const std::string &content);

// Renames the temporary file to the target, or removes it after a failure. Without force an
// existing target is a failure.
failure commit_output(output_file &file, bool force);

// Removes the temporary file. Does nothing after a commit or a previous call.
void abandon_output(output_file &file);

// Writes a whole file with the functions above.
failure write_file(const std::string &target, const std::string &content, bool force);
