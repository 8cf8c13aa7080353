// Output files, written atomically.
#ifndef TAVO_CLI_WRITE_OUTPUT_FILE_H
#define TAVO_CLI_WRITE_OUTPUT_FILE_H

#include <string>

#include "cli/failure.h"

// A temporary file in the folder of the target, with the permissions of a new file.
struct output_file {
    std::string target;
    std::string temporary;  // empty when nothing is left to remove
    int fd = -1;            // open for writing, -1 once closed
};

// True if both paths lead to one existing file.
bool same_file(const std::string &a, const std::string &b);

// Checks that the target can be written: its folder is writable and, without force, the target
// does not exist. Creates nothing.
failure check_target(const std::string &target, bool force);

// ending: of the temporary file's name, for programs that go by it.
failure begin_output(output_file &file, const std::string &target, const std::string &ending = "");
failure write_output(output_file &file, const std::string &content);

// Gives the file its name. Without force an existing target stays and the temporary is removed.
failure commit_output(output_file &file, bool force);

// Removes what is left. Harmless after a commit and when called twice.
void abandon_output(output_file &file);

// All of the above.
failure write_file(const std::string &target, const std::string &content, bool force);

#endif
