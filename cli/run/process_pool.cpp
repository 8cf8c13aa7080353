#include "cli/run/process_pool.h"

#include <malloc.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <exception>
#include <nlohmann/json.hpp>

#include "cli/write/value_text.h"

// The fields that cross the socket.
NLOHMANN_DEFINE_TYPE_NON_INTRUSIVE(input, index, path, stored)
NLOHMANN_DEFINE_TYPE_NON_INTRUSIVE(reply, status, result, message, json, row)

namespace {

using std::chrono::steady_clock;

constexpr std::chrono::milliseconds kStopPatience{900};
constexpr timeval kReplyPatience = {10, 0};  // from the start of a reply to its end

// The sizes are in bytes.
constexpr int kHeapAtStart = 12 << 20;       // the buffers of a short song
constexpr int kLargestHeapBlock = 4 << 20;   // larger blocks get separate mappings
constexpr int kLargestThreshold = 32 << 20;  // largest value that malloc accepts
constexpr int kFreeMemoryKept = 64 << 20;

// An end of the connection that has closed is noticed when the next message is received.
void send_message(int fd, const nlohmann::json &message) {
    std::string bytes;
    nlohmann::json::to_cbor(message, bytes);
    const size_t size = bytes.size();
    write_all(fd, {reinterpret_cast<const char *>(&size), sizeof size});
    write_all(fd, bytes);
}

// Waits for a whole message. Returns false if the other end has closed, the socket's time limit has
// passed or a signal interrupts the wait.
template <typename record_type>
bool receive_message(int fd, record_type &message) {
    size_t size = 0;
    if (recv(fd, &size, sizeof size, MSG_WAITALL) != sizeof size) return false;
    std::string bytes(size, '\0');
    if (recv(fd, bytes.data(), size, MSG_WAITALL) != static_cast<ssize_t>(size)) return false;
    nlohmann::json::from_cbor(bytes).get_to(message);
    return true;
}

// ---- In a worker.

// Each job reuses the heap of the previous one instead of asking the system for new pages. The heap
// starts large enough for a song, in huge pages: each takes one page fault instead of 512.
void prepare_heap() {
    mallopt(M_TRIM_THRESHOLD, kFreeMemoryKept);
    mallopt(M_MMAP_THRESHOLD, kLargestThreshold);  // so that the block below is part of the heap
    const auto page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    void *block = nullptr;
    if (posix_memalign(&block, page, kHeapAtStart) == 0) {
        madvise(block, kHeapAtStart, MADV_HUGEPAGE);
        free(block);
    }
    mallopt(M_MMAP_THRESHOLD, kLargestHeapBlock);
}

// Serves inputs until the other end of the socket is closed.
void serve_inputs(int fd, const options &opts) {
    prepare_heap();
    for (input next; receive_message(fd, next);) {
        reply answer;
        try {
            answer = serve(next, opts, fd);
        } catch (const std::exception &) {  // only allocations can fail here
            const char *error = "There is not enough memory for the result.";
            answer = make_reply({next.path, opts.mode, outcome::failed, error}, opts);
            answer.json.clear();
        }
        send_message(fd, answer);
    }
}

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

// ---- In the command.

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
    if (receive_message(worker.fd, answer)) {
        finish_input(pool, worker, std::move(answer));
    } else {
        reap(pool, worker);
    }
}

}  // namespace

bool assign(process_pool &pool, input &next) {
    // An idle worker that is running comes before one that must be started.
    const auto rank = [](const auto &each) { return each.current ? 2 : each.pid < 0 ? 1 : 0; };
    const auto worker =
        std::min_element(pool.workers.begin(), pool.workers.end(),
                         [&](const auto &a, const auto &b) { return rank(a) < rank(b); });
    if (worker->current) return false;
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
    send_message(worker->fd, next);
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
