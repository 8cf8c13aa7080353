// Replaces a path that the library cannot open. The library accepts paths of at most 511 bytes and
// treats the path "fd" specially.
#ifndef TAVO_CLI_INPUT_SHORT_PATH_H
#define TAVO_CLI_INPUT_SHORT_PATH_H

#include <string>

struct short_path {
    std::string path;  // for the library
    int fd = -1;       // kept open while path is used, or -1
};

// Never fails. If a path cannot be replaced, it stays as it is, and the library refuses it.
short_path open_short_path(const std::string &path);
void close_short_path(short_path &opened);

#endif
