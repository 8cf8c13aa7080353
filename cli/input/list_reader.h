// A list of names, read as it comes: from a file, a pipe or a terminal.
#ifndef TAVO_CLI_INPUT_LIST_READER_H
#define TAVO_CLI_INPUT_LIST_READER_H

#include <string>

#include "cli/failure.h"

struct list_reader {
    std::string name;  // of the list, "-" for standard input
    int fd = -1;       // -1 when no list is being read
    std::string text;  // read and not yet taken
    bool begun = false;
    bool ended = false;  // nothing more can be read
    size_t names = 0;    // taken
};

enum class list_state { name, waiting, ended, failed };

failure open_list(list_reader &list, const std::string &name);

// Reads the next name, which ends at the separator or at the end of the list.
// Lists with a newline per name may be M3U playlists: carriage returns at line ends and comments
// are dropped. failed says why when the state is failed. Never waits.
list_state next_name(list_reader &list, char separator, std::string &name, failure &failed);

void close_list(list_reader &list);

// "the list on standard input" or "the list NAME".
std::string list_text(const list_reader &list);

#endif
