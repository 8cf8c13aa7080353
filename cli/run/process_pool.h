// Starts, feeds, stops and reaps the worker processes. The library allows one instance per process,
// so several files at once need several workers. A crash affects only one file.
//
// The command and a worker are connected by a socket pair. When the command closes its end for
// writing, the worker stops its analysis and ends. When a worker ends, the command reads
// end-of-file from it. Each message is a CBOR object, preceded by its size. Its strings may contain
// any bytes. The command is single-threaded, so that it can fork at any moment.
#pragma once

#include <poll.h>
#include <sys/types.h>

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <vector>

#include "cli/failure.h"
#include "cli/input/inputs.h"
#include "cli/options.h"
#include "cli/run/reply.h"
#include "cli/system.h"

using time_point = std::chrono::steady_clock::time_point;

struct worker_process {
    pid_t pid = -1;                           // -1 if it is not running
    int fd = -1;                              // socket
    std::optional<input> current;             // empty if the worker is idle
    time_point deadline = time_point::max();  // time at which the worker is killed
    std::shared_ptr<temporary_file> file;
};

struct process_pool {
    const options &opts;
    // Called with each input's reply, in any order.
    std::function<void(input &&, reply &&)> on_reply = {};
    // Called if a worker without an input failed or was killed.
    std::function<void(const failure &)> on_bad_end = {};
    std::vector<worker_process> workers{static_cast<size_t>(opts.jobs)};
    size_t running = 0;
    bool is_stopping = false;
};

// Gives the input to an idle worker, which is started if it is not running. If the input has a
// refusal or no worker can be started, on_reply receives the failure at once. Returns false, with
// `next` unchanged, if all workers are busy. Does not return in a new worker process.
bool assign(process_pool &pool, input &next);

// Asks the workers to end. With is_stop they abort their analyses, and are killed if they have not
// ended within a second. Call it once; no input may be assigned afterwards.
void end_workers(process_pool &pool, bool is_stop);

// Waits until a worker has replied or ended, one of the descriptors in `watched` is ready, a signal
// arrives, or wait_ms have passed. Receives the replies, kills workers past their deadline and
// reaps those that have ended. Appends the workers to `watched`.
void poll_workers(process_pool &pool, std::vector<pollfd> &watched, int wait_ms);
