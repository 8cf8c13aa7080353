// A worker process: files in, finished texts out. The library allows one instance per process:
// workers run several analyses at once and confine a crash to its own file.
//
// Between the command and a worker run two pipes. A request is a request_head, a path and, for a
// song that the store knows, its result as JSON; it is sent only while the worker has none. The end
// of the request pipe stops a running analysis and the worker. A reply is a reply_head and its
// texts.
#ifndef TAVO_CLI_RUN_WORKER_H
#define TAVO_CLI_RUN_WORKER_H

#include <cstdint>
#include <string>

#include "cli/options.h"
#include "cli/run/record.h"

struct request_head {
    uint64_t index;           // of the input
    uint64_t path_bytes;      // follow the head
    uint64_t recalled_bytes;  // follow the path
};

struct reply_head {
    uint64_t index;  // of the input
    outcome status;
    uint32_t text_bytes[4];  // of the reply's texts, which follow the head in their order
};

struct reply {
    outcome status = outcome::failed;
    std::string result;   // for standard output
    std::string message;  // for standard error
    std::string json;     // the result for the store and the forecast, where there is one
    std::string row;      // of the report's index, where there is one
};

// The texts in the order in which they are sent.
constexpr std::string reply::*kReplyTexts[] = {&reply::result, &reply::message, &reply::json,
                                               &reply::row};

// Whether replies carry the result as JSON.
bool needs_json(const options &opts);

reply make_reply(const record &result, const options &opts);

// Serves requests until their pipe ends. Returns the process's exit status.
int serve_requests(int request_fd, int reply_fd, const options &opts);

// Writes all of it, going on after interruptions. Returns 0 or errno.
int write_all(int fd, const char *data, size_t size);

#endif
