// A worker process: receives inputs, analyses their files, writes markers, pages and clips, and
// replies.
//
// Input: one input at a time, from process_pool.h. Output: a reply to each, for ordered_output.h.
// Each message on the socket is a CBOR object, preceded by its size. Its strings may contain any
// bytes.
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

// Sends an input to a worker. A worker that has ended is noticed when its reply is received.
void send_input(int fd, const input &next);

// Waits until the whole reply has arrived. Returns false if the worker has ended, the socket's time
// limit has passed or a signal interrupts the wait.
bool receive_reply(int fd, reply &answer);

// Serves inputs until the other end of the socket is closed.
void serve_inputs(int fd, const options &opts);
