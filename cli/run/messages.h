// Messages between the command and a worker process. A worker has one request at a time.
#ifndef TAVO_CLI_RUN_MESSAGES_H
#define TAVO_CLI_RUN_MESSAGES_H

#include <cstdint>
#include <string>

#include "cli/run/record.h"

struct request {
    uint64_t index = 0;  // of the input
    std::string path;
    std::string stored;  // the result as JSON, if the store has it; otherwise empty
};

struct reply {
    outcome status = outcome::failed;
    std::string result;   // for standard output
    std::string message;  // for standard error
    std::string json;     // the result to store, or empty
    std::string row;      // of the report's index, or empty
};

// Encodes a request or a reply.
template <typename record_type>
std::string encode(const record_type &message);

// Decodes the message at the start of `received` and removes it. Returns false if it is not
// complete yet.
template <typename record_type>
bool decode(std::string &received, record_type &message);

#endif
