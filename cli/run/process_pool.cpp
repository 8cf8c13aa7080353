#include "cli/run/process_pool.h"

#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>

#include "cli/write/value_text.h"

namespace {

using std::chrono::steady_clock;

constexpr std::chrono::milliseconds kStopPatience{900};
constexpr timeval kReplyPatience = {10, 0};  // from the start of a reply to its end

// Runs in the new process. Closes its copies of the other workers' sockets, because otherwise those
// workers would not notice the end of the command.
[[noreturn]] void become_worker(process_pool &pool, pid_t command, temporary_file &file, int fd) {
    for (worker_process &other : pool.workers) close_fd(other.fd);
    set_worker_signals(file);
    prctl(PR_SET_PDEATHSIG, SIGALRM);
    if (getppid() != command) _exit(kExitFailed);  // the command has already ended
    serve_inputs(fd, pool.opts);
    exit(kExitOk);
}

failure start_worker(process_pool &pool, worker_process &worker) {
    int ends[2] = {-1, -1};
    const pid_t command = getpid();
    worker.file = share_temporary_file();
    if (worker.file != nullptr && socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) == 0) {
        worker.pid = fork();
    }
    if (worker.pid == 0) {
        close(ends[0]);
        become_worker(pool, command, *worker.file, ends[1]);
    }
    const int code = errno;
    worker.fd = ends[0];
    close_fd(ends[1]);
    if (worker.pid < 0) {
        close_fd(worker.fd);
        return {system_sentence("The analysis process could not be started", code)};
    }
    setsockopt(worker.fd, SOL_SOCKET, SO_RCVTIMEO, &kReplyPatience, sizeof kReplyPatience);
    ++pool.running;
    return {};
}

// Returns the result of an input whose worker ended without a reply.
record unfinished_record(const process_pool &pool, const worker_process &worker, int status) {
    record result = {worker.current->path, pool.opts.mode};
    if (steady_clock::now() >= worker.deadline) {
        result.error = "The analysis took more than " + std::to_string(pool.opts.timeout_s) +
                       " s and was given up (--timeout).";
    } else {
        result.error = "The process that analysed this file was ended " + ending_text(status) + ".";
    }
    return result;
}

void finish_input(const process_pool &pool, worker_process &worker, reply &&answer) {
    const bool is_stopped = pool.is_stopping || stop_signal() != 0;
    if (is_stopped && answer.status == outcome::failed) answer = {outcome::stopped};
    pool.on_reply(std::move(*worker.current), std::move(answer));
    worker.current.reset();
    worker.deadline = time_point::max();
}

// Called when the worker has closed its socket or its reply did not arrive whole.
void reap(process_pool &pool, worker_process &worker) {
    kill(worker.pid, SIGKILL);
    const int status = wait_for_end(worker.pid);
    remove_file(*worker.file);
    if (worker.current) {
        finish_input(pool, worker, make_reply(unfinished_record(pool, worker, status), pool.opts));
    } else if (status != 0 && !pool.is_stopping) {
        pool.on_bad_end(
            {"an analysis process without a file was ended " + ending_text(status) + "."});
    }
    close(worker.fd);
    worker = {};
    --pool.running;
}

void read_from(process_pool &pool, worker_process &worker) {
    reply answer;
    if (receive_reply(worker.fd, answer)) {
        finish_input(pool, worker, std::move(answer));
    } else {
        reap(pool, worker);
    }
}

}  // namespace

bool assign(process_pool &pool, input &next) {
    const auto is_idle = [](const worker_process &worker) { return !worker.current; };
    const auto is_waiting = [](const worker_process &worker) {
        return worker.pid > 0 && !worker.current;
    };
    auto worker = std::find_if(pool.workers.begin(), pool.workers.end(), is_waiting);
    if (worker == pool.workers.end()) {
        worker = std::find_if(pool.workers.begin(), pool.workers.end(), is_idle);
    }
    if (worker == pool.workers.end()) return false;
    if (worker->pid < 0 && !next.refusal) {
        const failure not_started = start_worker(pool, *worker);
        if (not_started && pool.running > 0) return false;
        next.refusal = not_started;
    }
    if (next.refusal) {
        const record result = {next.path, pool.opts.mode, outcome::failed, next.refusal.sentence};
        pool.on_reply(std::move(next), make_reply(result, pool.opts));
        return true;
    }
    send_input(worker->fd, next);
    worker->current = std::move(next);
    if (pool.opts.timeout_s > 0) {
        worker->deadline = steady_clock::now() + std::chrono::seconds(pool.opts.timeout_s);
    }
    return true;
}

void end_workers(process_pool &pool, bool is_stop) {
    pool.is_stopping = is_stop;
    for (worker_process &worker : pool.workers) {
        shutdown(worker.fd, SHUT_WR);
        if (is_stop) worker.deadline = steady_clock::now() + kStopPatience;
    }
}

void poll_workers(process_pool &pool, std::vector<pollfd> &watched, int wait_ms) {
    size_t at = watched.size();
    for (const worker_process &worker : pool.workers) {
        // poll refuses more descriptors than the process may open, even if they are -1.
        if (worker.fd >= 0) watched.push_back({worker.fd, POLLIN, 0});
    }
    const bool is_ready = poll(watched.data(), watched.size(), wait_ms) > 0;
    for (worker_process &worker : pool.workers) {
        const bool is_watched = worker.fd >= 0;
        if (is_watched && watched[at++].revents != 0 && is_ready) read_from(pool, worker);
        if (worker.pid > 0 && steady_clock::now() >= worker.deadline) kill(worker.pid, SIGKILL);
    }
}
