// Finds the files to analyse, one at a time, in the order of the command line.
//
// Input: the files, folders and lists in the options. Output: one input per file. Used by main.cpp.
#pragma once

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "cli/failure.h"
#include "cli/options.h"

// Distinguishes a file from a later version of it.
struct file_state {
    int64_t size = 0;      // bytes
    int64_t mtime_ns = 0;  // last change, since 1970
};

// An input, from its discovery to its result.
struct input {
    std::string path = {};    // any bytes except NUL
    failure refusal = {};     // set if the input, or its row in the store, cannot be used
    std::string stored = {};  // the result in the store, as JSON; empty if it has none yet
    file_state file = {};     // before the analysis, for the store
    uint64_t index = 0;       // number of earlier inputs
};

// A list of names that is read as it arrives: from a file, a pipe or a terminal.
struct name_list {
    std::string name = {};  // name of the list; "-" is standard input
    int fd = -1;            // -1 if no list is being read
    std::string text = {};  // text that was read and not yet returned
    bool is_empty = true;   // no name was returned
    bool begun = false;     // the start of the text has been checked
    bool ended = false;     // the end of the list has been read
};

struct input_supply {
    const options &opts;
    size_t argument = 0;                    // next index in opts.inputs, then in opts.lists
    name_list list = {};                    // list that is being read
    std::string folder = {};                // folder that is being searched, or empty
    std::vector<std::string> entries = {};  // entries of the folder not yet examined, last first
    std::set<std::string> searched = {};    // ids of the folder and its searched subfolders
    size_t found = 0;                       // audio files found in the folder
    size_t skipped = 0;                     // other files found in the folder
    size_t existing = 0;                    // inputs left out by --skip-existing
    std::map<std::string, std::string> targets = {};  // ids of output files and their inputs
    std::string notes = {};                           // lines for standard error
};

enum class supply_state {
    ready,
    searching,  // one name was examined, and it is not an input: call again
    waiting,    // call again when the descriptor of the list is readable
    ended,
};

// Finds the next input. Never waits.
//
// Searches folders for audio files, which are recognised by content, not by name. Unsupported
// formats count as audio, so that they are reported. With --recursive, subfolders and linked
// folders are searched too, each once. An unreadable file or folder, a folder without audio, and an
// input whose marker file or clip would replace that of another input get a refusal. Memory use
// grows with the number of folders and output files, not with the length of a list.
supply_state next_input(input_supply &supply, input &out);
