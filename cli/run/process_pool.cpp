#include "cli/run/process_pool.h"

#include <fcntl.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>

#include "cli/run/stop.h"
#include "cli/run/worker_process.h"
#include "cli/write/value_text.h"

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr milliseconds kStopPatience{1000};

void close_fd(int &fd) {
    if (fd >= 0) close(fd);
    fd = -1;
}

// Runs in the new process. It closes the pipes of the other workers: their ends are signals.
[[noreturn]] void become_worker(process_pool &pool, pid_t command, temporary_files *files,
                                int request_fd, int reply_fd) {
    for (worker_process &other : pool.processes) {
        close_fd(other.request_fd);
        close_fd(other.reply_fd);
    }
    ignore_stop_signals();
    prctl(PR_SET_PDEATHSIG, remove_files_at_signal(files));
    if (getppid() != command) _exit(kExitFailed);  // the command has already ended
    exit(serve_requests(request_fd, reply_fd, pool.opts));
}

failure start_process(process_pool &pool) {
    worker_process worker;
    int request_pipe[2] = {-1, -1};
    int reply_pipe[2] = {-1, -1};
    worker.files = make_temporary_files();
    const pid_t command = getpid();
    const bool is_ready = worker.files != nullptr && pipe2(request_pipe, O_CLOEXEC) == 0 &&
                          pipe2(reply_pipe, O_CLOEXEC) == 0;
    worker.pid = is_ready ? fork() : -1;
    if (worker.pid == 0) {
        close(request_pipe[1]);
        close(reply_pipe[0]);
        become_worker(pool, command, worker.files, request_pipe[0], reply_pipe[1]);
    }
    const int code = errno;
    worker.request_fd = request_pipe[1];
    worker.reply_fd = reply_pipe[0];
    close_fd(request_pipe[0]);
    close_fd(reply_pipe[1]);
    if (worker.pid < 0) {
        close_fd(worker.request_fd);
        close_fd(worker.reply_fd);
        release_temporary_files(worker.files);
        return {system_sentence("The analysis process could not be started", code)};
    }
    pool.processes.push_back(std::move(worker));
    return {};
}

std::string ending_text(int status) {
    if (WIFSIGNALED(status)) {
        const int number = WTERMSIG(status);
        return "by signal " + std::to_string(number) + " (" + strsignal(number) + ")";
    }
    return "with status " + std::to_string(WEXITSTATUS(status));
}

// The reply for the job of a worker that ended without replying.
reply make_last_reply(const process_pool &pool, const worker_process &worker, int status) {
    record result = failed_record(worker.current.message.path, pool.opts.mode, "");
    if (pool.is_stopping) {
        result.status = outcome::stopped;
    } else if (worker.has_deadline && steady_clock::now() >= worker.deadline) {
        result.error = "The analysis took more than " + std::to_string(pool.opts.timeout_s) +
                       " s and was given up (--timeout).";
    } else {
        result.error = "The process that analysed this file was ended " + ending_text(status) + ".";
    }
    return make_reply(result, pool.opts);
}

void finish_job(process_pool &pool, worker_process &worker, reply &&answer) {
    worker.is_busy = false;
    worker.has_deadline = false;
    if (answer.status == outcome::failed && answer.message.empty()) {  // kEmptyReply
        answer = make_reply(failed_record(worker.current.message.path, pool.opts.mode,
                                          "There is not enough memory for the result."),
                            pool.opts);
        answer.json.clear();
    }
    pool.on_reply(std::move(worker.current), std::move(answer));
}

// The worker's reply pipe has ended.
void reap(process_pool &pool, worker_process &worker) {
    close_fd(worker.request_fd);
    close_fd(worker.reply_fd);
    int status = 0;
    while (waitpid(worker.pid, &status, 0) < 0 && errno == EINTR) {
    }
    worker.pid = -1;
    remove_files(worker.files);
    release_temporary_files(worker.files);
    const bool is_clean = WIFEXITED(status) && WEXITSTATUS(status) == 0;
    if (worker.is_busy) {
        finish_job(pool, worker, make_last_reply(pool, worker, status));
    } else if (!is_clean && !pool.is_stopping) {
        pool.on_bad_end(ending_text(status));
    }
}

void read_from(process_pool &pool, worker_process &worker) {
    char part[65536];
    const ssize_t got = read(worker.reply_fd, part, sizeof part);
    if (got > 0) {
        worker.received.append(part, static_cast<size_t>(got));
        reply answer;
        if (decode(worker.received, answer)) finish_job(pool, worker, std::move(answer));
    } else if (got == 0 || errno != EINTR) {
        reap(pool, worker);
    }
}

void set_deadline(worker_process &worker, milliseconds wait) {
    worker.has_deadline = true;
    worker.deadline = steady_clock::now() + wait;
}

}  // namespace

worker_process *find_idle(process_pool &pool, failure &failed) {
    for (worker_process &worker : pool.processes) {
        if (worker.request_fd >= 0 && !worker.is_busy) return &worker;
    }
    if (pool.processes.size() >= static_cast<size_t>(pool.opts.jobs)) return nullptr;
    const failure start = start_process(pool);
    if (!start) return &pool.processes.back();
    if (pool.processes.empty()) failed = start;
    return nullptr;
}

void send_job(const process_pool &pool, worker_process &worker, job &&next) {
    worker.current = std::move(next);
    worker.is_busy = true;
    if (pool.opts.timeout_s > 0) set_deadline(worker, std::chrono::seconds(pool.opts.timeout_s));
    // If the worker has died, its reply pipe ends: no need to check here.
    const std::string message = encode(worker.current.message);
    write_all(worker.request_fd, message.data(), message.size());
}

bool has_busy(const process_pool &pool) {
    return std::any_of(pool.processes.begin(), pool.processes.end(),
                       [](const worker_process &worker) { return worker.is_busy; });
}

void end_workers(process_pool &pool, bool is_stop) {
    pool.is_stopping = is_stop;
    for (worker_process &worker : pool.processes) {
        close_fd(worker.request_fd);
        if (is_stop) set_deadline(worker, kStopPatience);
    }
}

void append_watched(const process_pool &pool, std::vector<pollfd> &watched) {
    for (const worker_process &worker : pool.processes) {
        watched.push_back({worker.reply_fd, POLLIN, 0});
    }
}

int deadline_timeout_ms(const process_pool &pool) {
    int64_t left = INT32_MAX;
    for (const worker_process &worker : pool.processes) {
        if (!worker.has_deadline) continue;
        const auto wait = std::chrono::ceil<milliseconds>(worker.deadline - steady_clock::now());
        left = std::clamp<int64_t>(wait.count(), 0, left);
    }
    return left == INT32_MAX ? -1 : static_cast<int>(left);
}

void serve_workers(process_pool &pool, const pollfd *watched) {
    for (size_t i = 0; i < pool.processes.size(); ++i) {
        if (watched[i].revents != 0) read_from(pool, pool.processes[i]);
    }
    for (const worker_process &worker : pool.processes) {
        const bool is_late = worker.has_deadline && steady_clock::now() >= worker.deadline;
        if (worker.pid > 0 && is_late) kill(worker.pid, SIGKILL);
    }
    const auto has_ended = [](const worker_process &worker) { return worker.pid < 0; };
    pool.processes.erase(std::remove_if(pool.processes.begin(), pool.processes.end(), has_ended),
                         pool.processes.end());
}
