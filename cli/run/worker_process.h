// A worker process: receives requests, analyses their files, writes markers and pages, and replies.
#ifndef TAVO_CLI_RUN_WORKER_PROCESS_H
#define TAVO_CLI_RUN_WORKER_PROCESS_H

#include "cli/options.h"
#include "cli/run/messages.h"
#include "cli/run/record.h"

reply make_reply(const record &result, const options &opts);

// Serves requests until the other end of the socket is closed. Returns the exit status.
int serve_requests(int fd, const options &opts);

#endif
