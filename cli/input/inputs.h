// Finds the files to analyse, one at a time, in the order of the command line.
//
// In: options (files, folders, lists). Out: one input per file. Used by analyse_inputs.h.
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
    std::string path;  // any bytes except NUL
    failure refusal;   // set if the input is already known to be unusable
};

using file_id = std::pair<dev_t, ino_t>;

struct input_supply {
    const options &opts;
    size_t argument = 0;                    // next index in opts.inputs, then in opts.lists
    list_reader list = {};                  // list that is being read
    std::string folder = {};                // folder that is being searched, or empty
    std::vector<std::string> entries = {};  // of folder, not yet examined, in reverse order
    std::set<file_id> searched = {};        // folder and the folders entered in it
    size_t found = 0;                       // audio files in it
    size_t skipped = 0;                     // other files in it
    size_t existing = 0;                    // inputs left out by --skip-existing
    std::unordered_map<std::string, file_id> targets = {};  // marker files and their inputs
    std::string notes = {};                                 // lines for standard error
};

enum class supply_state {
    ready,
    searching,  // one name was examined, and it is not an input: call again
    waiting,    // for a list, whose descriptor becomes readable when more has arrived
    ended,
};

// Finds the next input. Never waits.
//
// Folders are searched for audio files, which are recognised by content, not by name; refused
// formats count as audio, so that they are reported. With --recursive the folders inside, including
// linked ones, are searched too, each once. A file or folder that cannot be read becomes an input
// with a refusal, and so does a folder without audio. If the format writes files, no two inputs get
// the same one. Memory grows with the folders of a search and the marker files, but not with a
// list.
supply_state next_input(input_supply &supply, input &out);

#endif
