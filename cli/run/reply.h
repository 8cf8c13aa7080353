// The reply of a worker process to an input: the result as text, after the requested files of the
// song are written.
//
// Input: an input (input/inputs.h). Output: a reply, for ordered_output.h. Used by process_pool.h.
#pragma once

#include <string>

#include "cli/input/inputs.h"
#include "cli/options.h"
#include "cli/run/record.h"

struct reply {
    outcome status = outcome::failed;
    std::string result = {};   // for standard output
    std::string message = {};  // for standard error
    std::string json = {};     // the result to store, or empty
    std::string row = {};      // row of the report's index, or empty
};

reply make_reply(const record &result, const options &opts);

// Analyses an input, or takes its stored result, and writes its markers, page and clip. Called in a
// worker. Stops the analysis if stop_fd becomes readable.
reply serve(const input &next, const options &opts, int stop_fd);
