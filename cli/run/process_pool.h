// Starts, feeds, stops and reaps the worker processes. The library allows one instance per process,
// so several files at once need several workers. A crash affects only one file.
//
// The command and a worker are connected by a socket pair. When the command closes its end for
// writing, the worker stops its analysis and ends. When a worker ends, the command reads
// end-of-file from it. The command is single-threaded, so that it can fork at any moment.
#ifndef TAVO_CLI_RUN_PROCESS_POOL_H
#define TAVO_CLI_RUN_PROCESS_POOL_H

#include <poll.h>
#include <sys/types.h>

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/failure.h"
#include "cli/input/inputs.h"
#include "cli/options.h"
#include "cli/run/worker_process.h"
#include "cli/store/store.h"
#include "cli/system.h"

// An input, from its discovery to its result.
struct job {
    size_t index = 0;  // number of earlier inputs
    input entry;
    std::string stored;  // the result as JSON, if the store has it; otherwise empty
    file_state file;     // for the store
};

using time_point = std::chrono::steady_clock::time_point;

struct worker_process {
    pid_t pid = -1;                           // -1 after it was reaped
    int fd = -1;                              // socket
    std::optional<job> current;               // empty if the worker is idle
    std::string received;                     // the part of a reply that has arrived
    time_point deadline = time_point::max();  // time at which the worker is killed
    std::shared_ptr<temporary_file> file;
};

struct process_pool {
    const options &opts;
    // Called with each job's reply, in any order.
    std::function<void(job &&, reply &&)> on_reply = {};
    // Called if a worker without a job failed or was killed.
    std::function<void(const failure &)> on_bad_end = {};
    std::vector<worker_process> processes = {};
    bool is_stopping = false;
};

// Sends the job to an idle worker, or to a new one if fewer than --jobs are running. If the input
// has a refusal or no worker can be started, on_reply receives the failure at once. Returns false,
// with `next` unchanged, if all workers are busy. Does not return in a new worker process.
bool send_job(process_pool &pool, job &next);

// Asks the workers to end. With is_stop they abort their jobs, and are killed if they have not
// ended after one second. Call it once; no job may be sent afterwards.
void end_workers(process_pool &pool, bool is_stop);

// Waits until a worker has replied or ended, one of the descriptors in `watched` is ready, or
// wait_ms have passed (-1: no limit). Reads the replies, kills workers past their deadline and
// reaps those that have ended. Appends the workers to `watched`.
void poll_workers(process_pool &pool, std::vector<pollfd> &watched, int wait_ms);

#endif
