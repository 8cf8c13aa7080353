// A worker process: receives requests, analyses their files, writes markers and pages, and replies.
#ifndef TAVO_CLI_RUN_WORKER_PROCESS_H
#define TAVO_CLI_RUN_WORKER_PROCESS_H

#include "cli/options.h"
#include "cli/run/messages.h"
#include "cli/run/record.h"

reply make_reply(const record &result, const options &opts);

// Serves requests until their pipe ends. Returns the process's exit status.
int serve_requests(int request_fd, int reply_fd, const options &opts);

#endif
