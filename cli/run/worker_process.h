// A worker process: receives requests, analyses their files, writes markers, pages and clips, and
// replies.
//
// Input: one request at a time, from process_pool.h. Output: a reply to each, for ordered_output.h.
#ifndef TAVO_CLI_RUN_WORKER_PROCESS_H
#define TAVO_CLI_RUN_WORKER_PROCESS_H

#include <cstdint>
#include <string>

#include "cli/options.h"
#include "cli/run/record.h"

struct request {
    uint64_t index = 0;  // index of the input
    std::string path;
    std::string stored;  // the result as JSON, if the store has it; otherwise empty
};

struct reply {
    outcome status = outcome::failed;
    std::string result;   // for standard output
    std::string message;  // for standard error
    std::string json;     // the result to store, or empty
    std::string row;      // row of the report's index, or empty
};

reply make_reply(const record &result, const options &opts);

// Serves requests until the other end of the socket is closed. Returns the exit status.
int serve_requests(int fd, const options &opts);

// Encodes a request or a reply for the socket.
template <typename record_type>
std::string encode(const record_type &message);

// Decodes the message at the start of `received` and removes it. Returns false if it is not
// complete yet.
template <typename record_type>
bool decode(std::string &received, record_type &message);

#endif
