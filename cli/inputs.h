// From the words of the command line to the files to analyse, in order.
//
// In: options (files, folders, lists). Out: one input per file. Before: workers.h.
#ifndef TAVO_CLI_INPUTS_H
#define TAVO_CLI_INPUTS_H

#include <string>
#include <vector>

#include "cli/options.h"

struct input {
    std::string path;   // any bytes but NUL
    std::string error;  // a sentence when the input is known to be unusable already, else empty
};

// Reads every list to its end and searches every folder: entries in the order of their bytes, kept
// when the media source recognises their content (refused formats too, so that they are reported).
// Links to folders inside folders are not followed. What cannot be read becomes an input with an
// error, and so does a folder without audio. Stops early, with what it has, when stop_requested()
// says so. Of several inputs with one and the same label track the first keeps it.
std::vector<input> expand_inputs(const options &from, bool (*stop_requested)());

#endif
