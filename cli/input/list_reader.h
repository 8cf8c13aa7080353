// A list of names that is read as it arrives: from a file, a pipe or a terminal.
#ifndef TAVO_CLI_INPUT_LIST_READER_H
#define TAVO_CLI_INPUT_LIST_READER_H

#include <optional>
#include <string>

#include "cli/failure.h"

struct list_reader {
    std::string name;    // of the list, "-" for standard input
    char separator = 0;  // after each name
    int fd = -1;         // -1 if no list is being read
    std::string text;    // read, not yet returned
    size_t names = 0;    // number of names returned
    bool begun = false;  // the start has been checked
    bool ended = false;  // the end has been read
};

failure open_list(list_reader &list, const std::string &name, char separator);

// Reads the next name. If it returns no name, the list has ended, or more will come when fd is
// readable. Never waits. A list with one name per line may be an M3U playlist, so comments and
// carriage returns at line ends are removed.
failure read_name(list_reader &list, std::optional<std::string> &name);

void close_list(list_reader &list);

#endif
