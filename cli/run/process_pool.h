// Starts, feeds, stops and reaps the worker processes. The library allows one instance per process,
// so workers are needed to analyse several files at once. A crashing worker affects one file.
//
// The command and a worker are connected by a pair of sockets. When the command closes its end for
// writing, the worker stops its analysis and ends. When a worker ends, the command reads
// end-of-file from it. The command is single-threaded, so that it can fork at any moment.
#ifndef TAVO_CLI_RUN_PROCESS_POOL_H
#define TAVO_CLI_RUN_PROCESS_POOL_H

#include <poll.h>
#include <sys/types.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "cli/failure.h"
#include "cli/options.h"
#include "cli/run/messages.h"
#include "cli/run/temporary_files.h"
#include "cli/store/store.h"

// An input, from its discovery to its result.
struct job {
    request message;
    failure refusal;  // if the input is already known to be unusable
    file_state file;  // for the store
};

using time_point = std::chrono::steady_clock::time_point;

struct worker_process {
    pid_t pid = -1;  // -1 after it was reaped
    int fd = -1;     // socket
    bool is_busy = false;
    job current;                              // while busy
    std::string received;                     // start of a reply
    time_point deadline = time_point::max();  // time at which the worker is killed
    std::shared_ptr<temporary_files> files;
};

struct process_pool {
    const options &opts;
    // Called with each job's reply, in any order.
    std::function<void(job &&, reply &&)> on_reply = {};
    // Called if a worker without a job ended badly.
    std::function<void(const failure &)> on_bad_end = {};
    std::vector<worker_process> processes = {};
    bool is_stopping = false;
};

// Returns an idle worker; starts one if there are fewer than --jobs. Returns null if all are busy,
// or, with a failure, if none could be started. Does not return in a new worker process.
worker_process *find_idle(process_pool &pool, failure &failed);

void send_job(const process_pool &pool, worker_process &worker, job &&next);

bool has_busy(const process_pool &pool);

// Asks the workers to end. With is_stop they abort their jobs, and are killed if they have not
// ended after one second. Call it once; no job may be sent afterwards.
void end_workers(process_pool &pool, bool is_stop);

// Appends one entry for poll for each worker, in the order of the workers.
void append_watched(const process_pool &pool, std::vector<pollfd> &watched);
int deadline_timeout_ms(const process_pool &pool);  // -1 if there is no deadline

// Reads the replies, kills workers past their deadline and reaps those that have ended. watched:
// the entries of append_watched, after poll.
void serve_workers(process_pool &pool, const pollfd *watched);

#endif
