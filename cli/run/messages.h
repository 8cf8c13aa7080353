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

std::string encode(const request &message);
std::string encode(const reply &message);

// Decodes the message at the start of received and removes it. False if it is not complete yet.
bool decode(std::string &received, request &message);
bool decode(std::string &received, reply &message);

#endif
