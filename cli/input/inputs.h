// From the words of the command line to the files to analyse, one at a time and in their order.
//
// In: options (files, folders, lists). Out: one input per file. Before: workers.h.
#ifndef TAVO_CLI_INPUT_INPUTS_H
#define TAVO_CLI_INPUT_INPUTS_H

#include <string>
#include <unordered_map>
#include <vector>

#include "cli/input/list_reader.h"
#include "cli/options.h"

struct input {
    std::string path;   // any bytes but NUL
    std::string error;  // a sentence when the input is known to be unusable already, else empty
};

// A folder that is being searched.
struct open_folder {
    std::string path;
    std::vector<std::string> names;  // of its entries, in the order of their bytes
    size_t next = 0;                 // name to look at
    uint64_t id[2] = {};             // device and inode
};

struct input_supply {
    const options &opts;
    size_t argument = 0;                    // next of opts.inputs, then of opts.lists
    list_reader list = {};                  // being read
    std::vector<open_folder> folders = {};  // being searched, the innermost last
    size_t found = 0;                       // audio files in the outermost of them
    size_t skipped = 0;                     // other files there
    size_t existing = 0;                    // inputs left out by --skip-existing
    std::unordered_map<uint64_t, uint64_t> targets =
        {};                  // marker files and their inputs, both hashed
    std::string notes = {};  // lines for standard error, to be taken
};

enum class supply_state { ready, waiting, ended };

// The next input, when it is ready. Never waits: a list that has not yet said more is waiting,
// and supply_fd becomes readable when it has.
//
// Folders are searched for audio files, recognised by content rather than by name; refused formats
// count as audio, so that they are reported. With --recursive the folders inside are searched too,
// linked ones included. What cannot be read becomes an input with an error, and so does a folder
// without audio. Where the format writes files, no two inputs get the same one. Memory does not
// grow with a list, but for 16 bytes a marker file.
supply_state next_input(input_supply &supply, input &out);

int supply_fd(const input_supply &supply);

#endif
