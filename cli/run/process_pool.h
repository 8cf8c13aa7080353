// The worker processes, seen from the command. The library allows one instance per process: workers
// run several analyses at once and confine a crash to its own file.
//
// The end of a request pipe stops a running analysis and its worker; the end of a reply pipe is
// that of its worker. Single-threaded, so that a fork is safe at any moment.
#ifndef TAVO_CLI_RUN_PROCESS_POOL_H
#define TAVO_CLI_RUN_PROCESS_POOL_H

#include <poll.h>
#include <sys/types.h>

#include <chrono>
#include <functional>
#include <string>
#include <vector>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/run/messages.h"
#include "cli/run/temporary_files.h"
#include "cli/store/store.h"

// An input on its way through the command.
struct job {
    request asked;
    failure refusal;  // if the input is known to be unusable already
    file_state file;  // for the store
};

struct worker_process {
    pid_t pid = -1;
    int request_fd = -1;  // -1 once the worker is to end
    int reply_fd = -1;    // -1 once it has ended
    bool is_busy = false;
    job current;           // while busy
    std::string received;  // a reply under way
    bool has_deadline = false;
    std::chrono::steady_clock::time_point deadline;  // the worker is killed then
    temporary_files *files = nullptr;                // shared with the worker
};

struct process_pool {
    const options &opts;
    // Called with each job's reply, in any order.
    std::function<void(job &&, reply &&)> on_reply;
    // Called if a worker without a job ended badly.
    std::function<void(const std::string &how)> on_bad_end;
    std::vector<worker_process> processes = {};
    bool is_stopping = false;
};

// An idle worker, started if there are fewer than --jobs. Null if all are busy, or with a failure
// if there is none. In a new worker process this does not return.
worker_process *find_idle(process_pool &pool, failure &failed);

void send_job(const process_pool &pool, worker_process &worker, job &&next);

bool has_busy(const process_pool &pool);

// Lets the workers end. With is_stop their jobs are given up, and workers that have not ended after
// a second are killed.
void end_workers(process_pool &pool, bool is_stop);

// For poll: appends one entry for each worker, in their order.
void append_watched(const process_pool &pool, std::vector<pollfd> &watched);
int deadline_timeout_ms(const process_pool &pool);  // -1 without a deadline

// Reads what workers have sent, given poll's answer, kills those past their deadline and reaps
// those that have ended.
void serve_workers(process_pool &pool, const pollfd *watched);

#endif
