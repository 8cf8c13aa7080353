#include "cli/workers.h"

#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <optional>

#include "cli/ordered_output.h"
#include "cli/stop.h"
#include "cli/words.h"
#include "cli/worker.h"

namespace {

struct process {
    pid_t pid = -1;
    int request_fd = -1;            // -1 once the worker was told to end
    int reply_fd = -1;              // -1 once the worker is gone
    std::optional<uint32_t> asked;  // the input that it has
    std::string received;           // of the reply under way
};

struct worker_pool {
    const options &opts;
    const std::vector<input> &inputs;
    ordered_output output;
    std::vector<process> processes;
    size_t next = 0;       // input to hand out
    bool ending = false;   // nothing is handed out any more
    bool unclean = false;  // a worker without a file ended badly
};

void close_fd(int &fd) {
    if (fd >= 0) close(fd);
    fd = -1;
}

// In the new process. Other workers' pipes must not stay open here: their ends are signals.
[[noreturn]] void become_worker(worker_pool &pool, int request_fd, int reply_fd) {
    for (process &other : pool.processes) {
        close_fd(other.request_fd);
        close_fd(other.reply_fd);
    }
    ignore_stop_signals();
    const int status = serve_requests(request_fd, reply_fd, pool.opts, pool.inputs);
    exit(status);
}

// Returns 0 or errno.
int start_process(worker_pool &pool) {
    int request[2] = {-1, -1};
    int answer[2] = {-1, -1};
    int code = pipe(request) == 0 && pipe(answer) == 0 ? 0 : errno;
    const pid_t pid = code == 0 ? fork() : -1;
    if (code == 0 && pid < 0) code = errno;
    if (pid == 0) {
        close(request[1]);
        close(answer[0]);
        become_worker(pool, request[0], answer[1]);
    }
    close_fd(request[0]);
    close_fd(answer[1]);
    if (code != 0) {
        close_fd(request[1]);
        close_fd(answer[0]);
        return code;
    }
    process made;
    made.pid = pid;
    made.request_fd = request[1];
    made.reply_fd = answer[0];
    pool.processes.push_back(std::move(made));
    return 0;
}

void fail_input(worker_pool &pool, uint32_t index, const std::string &error) {
    const record result = failed_record(pool.inputs[index].path, pool.opts.mode, error);
    accept_reply(pool.output, index, make_reply(result, pool.opts));
}

process *find_idle(worker_pool &pool) {
    for (process &worker : pool.processes) {
        if (worker.request_fd >= 0 && !worker.asked) return &worker;
    }
    return nullptr;
}

// Gives every idle worker an input, starting workers up to the number asked for.
void hand_out(worker_pool &pool) {
    while (!pool.ending && pool.next < pool.inputs.size()) {
        process *worker = find_idle(pool);
        if (worker == nullptr && pool.processes.size() < static_cast<size_t>(pool.opts.jobs)) {
            const int code = start_process(pool);
            worker = code == 0 ? &pool.processes.back() : nullptr;
            if (code != 0 && pool.processes.empty()) {
                fail_input(pool, static_cast<uint32_t>(pool.next++),
                           system_sentence("The analysis process could not be started", code));
                continue;
            }
        }
        if (worker == nullptr) return;
        const auto index = static_cast<uint32_t>(pool.next++);
        worker->asked = index;
        // A worker that died meanwhile shows at its reply pipe's end.
        write_all(worker->request_fd, reinterpret_cast<const char *>(&index), sizeof(index));
    }
}

void tell_to_end(worker_pool &pool) {
    pool.ending = true;
    for (process &worker : pool.processes) close_fd(worker.request_fd);
}

std::string ending_text(int status) {
    if (WIFSIGNALED(status)) {
        const int number = WTERMSIG(status);
        return "by signal " + std::to_string(number) + " (" + strsignal(number) + ")";
    }
    return "with status " + std::to_string(WEXITSTATUS(status));
}

// The worker's reply pipe has ended.
void bury(worker_pool &pool, process &worker) {
    close_fd(worker.request_fd);
    close_fd(worker.reply_fd);
    int status = 0;
    while (waitpid(worker.pid, &status, 0) < 0 && errno == EINTR) {
    }
    if (worker.asked) {
        fail_input(pool, *worker.asked,
                   "The process that analysed this file was ended " + ending_text(status) + ".");
    } else if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) {
        pool.unclean = true;
        write_message(pool.output, "tavo: an analysis process without a file was ended " +
                                       ending_text(status) + ".\n");
    }
    worker.pid = -1;
}

// Takes whole replies out of what a worker has sent; there is at most one.
void take_reply(worker_pool &pool, process &worker) {
    reply_head head{};
    if (worker.received.size() < sizeof(head)) return;
    memcpy(&head, worker.received.data(), sizeof(head));
    const size_t size = sizeof(head) + head.result_bytes + head.message_bytes;
    if (worker.received.size() < size) return;
    reply made;
    made.status = static_cast<outcome>(head.status);
    made.result = worker.received.substr(sizeof(head), head.result_bytes);
    made.message = worker.received.substr(sizeof(head) + head.result_bytes, head.message_bytes);
    worker.received.erase(0, size);
    worker.asked.reset();
    accept_reply(pool.output, head.index, std::move(made));
}

void read_from(worker_pool &pool, process &worker) {
    char part[65536];
    const ssize_t got = read(worker.reply_fd, part, sizeof(part));
    if (got > 0) {
        worker.received.append(part, static_cast<size_t>(got));
        take_reply(pool, worker);
    } else if (got == 0 || errno != EINTR) {
        bury(pool, worker);
    }
}

// One wait for whatever comes next: replies, a stop, the reader of the results gone.
void wait_and_serve(worker_pool &pool) {
    std::vector<pollfd> watched;
    watched.push_back({pool.ending ? -1 : stop_fd(), POLLIN, 0});
    watched.push_back({pool.output.to_pipe && !pool.ending ? STDOUT_FILENO : -1, 0, 0});
    for (const process &worker : pool.processes) watched.push_back({worker.reply_fd, POLLIN, 0});
    const int ready = poll(watched.data(), watched.size(), redraw_timeout_ms(pool.output));
    if (ready > 0) {
        if ((watched[1].revents & POLLERR) != 0) note_reader_gone(pool.output);
        for (size_t i = 0; i < pool.processes.size(); ++i) {
            if (watched[i + 2].revents != 0) read_from(pool, pool.processes[i]);
        }
        size_t kept = 0;
        for (process &worker : pool.processes) {
            if (worker.pid < 0) continue;
            if (&pool.processes[kept] != &worker) pool.processes[kept] = std::move(worker);
            ++kept;
        }
        pool.processes.resize(kept);
    }
    redraw(pool.output);
}

}  // namespace

int run_workers(const options &opts, const std::vector<input> &inputs) {
    worker_pool pool{opts, inputs, start_output(opts, inputs.size()), {}, 0, false, false};
    while (true) {
        const bool stop = stop_requested() || output_failed(pool.output);
        if (!pool.ending && (stop || pool.next >= inputs.size())) {
            // Only a stop may reach workers that still have a file.
            bool busy = false;
            for (const process &worker : pool.processes) busy = busy || worker.asked;
            if (stop || !busy) tell_to_end(pool);
        }
        hand_out(pool);
        if (pool.processes.empty() && (pool.ending || pool.next >= inputs.size())) break;
        wait_and_serve(pool);
    }
    return finish_output(pool.output, pool.unclean);
}
