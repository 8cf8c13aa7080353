// From the words of the command line to the files to analyse, one at a time and in their order.
//
// In: options (files, folders, lists). Out: one input per file. Before: analyse_inputs.h.
#ifndef TAVO_CLI_INPUT_INPUTS_H
#define TAVO_CLI_INPUT_INPUTS_H

#include <sys/types.h>

#include <set>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "cli/failure.h"
#include "cli/input/list_reader.h"
#include "cli/options.h"

struct input {
    std::string path;  // any bytes but NUL
    failure refusal;   // when the input is known to be unusable already
};

using file_id = std::pair<dev_t, ino_t>;

struct input_supply {
    const options &opts;
    size_t argument = 0;                    // next of opts.inputs, then of opts.lists
    list_reader list = {};                  // being read
    std::string folder = {};                // being searched; empty for none
    std::vector<std::string> entries = {};  // in it, to look at, the next one last
    std::set<file_id> searched = {};        // folders entered in it, and it
    size_t found = 0;                       // audio files in it
    size_t skipped = 0;                     // other files in it
    size_t existing = 0;                    // inputs left out by --skip-existing
    std::unordered_map<std::string, file_id> targets = {};  // marker files and their inputs
    std::string notes = {};                                 // lines for standard error
};

enum class supply_state {
    ready,
    searching,  // many files were looked at and none was audio: call again
    waiting,    // for a list; supply_fd becomes readable when there is more
    ended,
};

// Finds the next input. Never waits.
//
// Folders are searched for audio files, recognised by content rather than by name; refused formats
// count as audio, so that they are reported. With --recursive the folders inside are searched too,
// linked ones included, each once. A file or folder that cannot be read becomes an input with a
// refusal, and so does a folder without audio. Where the format writes files, no two inputs get the
// same one. Memory grows with the folders of a search and the marker files, not with a list.
supply_state next_input(input_supply &supply, input &out);

int supply_fd(const input_supply &supply);

#endif
