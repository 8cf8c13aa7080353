// A list of names, read as it comes: from a file, a pipe or a terminal.
#ifndef TAVO_CLI_INPUT_LIST_READER_H
#define TAVO_CLI_INPUT_LIST_READER_H

#include <optional>
#include <string>

#include "cli/failure.h"

struct list_reader {
    std::string name;    // of the list, "-" for standard input
    char separator = 0;  // after each name
    int fd = -1;         // -1 when no list is being read
    std::string text;    // read and not yet returned
    size_t names = 0;    // returned
    bool begun = false;  // the start was checked
    bool ended = false;  // nothing more can be read
};

failure open_list(list_reader &list, const std::string &name, char separator);

// Reads the next name. Without one the list has ended, or more is to come: fd becomes readable
// then. Never waits. Lists with a newline per name may be M3U playlists: carriage returns at line
// ends and comments are dropped.
failure read_name(list_reader &list, std::optional<std::string> &name);

void close_list(list_reader &list);

#endif
