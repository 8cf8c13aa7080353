// A worker process: files in, finished texts out. The library holds one instance a process, so
// this is what makes several analyses at once possible, and what keeps a crash to its own file.
//
// Between the command and a worker run two pipes. A request is a request_head and a path, sent only
// while the worker has none; the end of the request pipe stops a running analysis and the worker.
// A reply is a reply_head and its two texts.
#ifndef TAVO_CLI_WORKER_H
#define TAVO_CLI_WORKER_H

#include <cstdint>
#include <string>

#include "cli/options.h"
#include "cli/record.h"

struct request_head {
    uint64_t index;       // of the input
    uint64_t path_bytes;  // follow the head
};

struct reply_head {
    uint64_t index;  // of the input
    outcome status;
    uint32_t result_bytes;   // follow the head
    uint32_t message_bytes;  // follow the result
};

struct reply {
    outcome status = outcome::failed;
    std::string result;   // for standard output
    std::string message;  // for standard error
};

reply make_reply(const record &result, const options &opts);

// Serves requests until their pipe ends. Returns the process's exit status.
int serve_requests(int request_fd, int reply_fd, const options &opts);

// Writes all of it, going on after interruptions. Returns 0 or errno.
int write_all(int fd, const char *data, size_t size);

#endif
