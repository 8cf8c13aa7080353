#include "cli/run/workers.h"

#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <iterator>
#include <vector>

#include "cli/input/inputs.h"
#include "cli/run/ordered_output.h"
#include "cli/run/stop.h"
#include "cli/run/worker.h"
#include "cli/store/keeper.h"
#include "cli/write/value_text.h"

namespace {

constexpr size_t kMostAhead = 10'000;   // inputs found before they can be analysed
constexpr size_t kFoundAtOnce = 64;     // between two looks at the workers
constexpr size_t kMostWaiting = 1'000;  // results kept back for an earlier one

struct numbered_input {
    size_t index;
    input entry;
    file_state file;       // for the store
    std::string recalled;  // the result as JSON, when the store gave it
};

struct process {
    pid_t pid = -1;
    int request_fd = -1;  // -1 once the worker was told to end
    int reply_fd = -1;    // -1 once the worker is gone
    bool busy = false;
    numbered_input asked;  // while busy
    std::string received;  // of the reply under way
};

struct worker_pool {
    const options &opts;
    input_supply supply;
    supply_state found;  // by the last search
    std::deque<numbered_input> queue;
    size_t count;  // inputs found so far
    ordered_output output;
    store_keeper keeper;
    const reply_sink &sink;
    std::vector<process> processes;
    bool ending;   // nothing is handed out any more
    bool unclean;  // a worker without a file ended badly
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
    const int status = serve_requests(request_fd, reply_fd, pool.opts);
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

void take_result(worker_pool &pool, const numbered_input &asked, reply &&made) {
    if (asked.recalled.empty()) {
        write_message(pool.output,
                      keep_result(pool.keeper, asked.entry.path, asked.file, made.json));
    }
    if (pool.sink) pool.sink(asked.entry.path, made);
    accept_reply(pool.output, asked.index, std::move(made));
}

void fail_input(worker_pool &pool, const numbered_input &failed, const std::string &error) {
    const record result = failed_record(failed.entry.path, pool.opts.mode, error);
    take_result(pool, failed, make_reply(result, pool.opts));
}

bool may_search(const worker_pool &pool) {
    return !pool.ending && pool.found != supply_state::ended && pool.queue.size() < kMostAhead;
}

// The next input of the command line, or of the store that it names.
supply_state find_next(worker_pool &pool, numbered_input &next) {
    if (!pool.opts.from_store) return next_input(pool.supply, next.entry);
    std::string message;
    const bool found = next_stored(pool.keeper, next.entry.path, next.recalled, message);
    write_message(pool.output, message);
    return found ? supply_state::ready : supply_state::ended;
}

// Whether the input is this command's to analyse, and is not stored yet.
bool is_wanted(worker_pool &pool, numbered_input &next) {
    if (!in_shard(pool.opts.share, next.entry.path)) return false;
    if (pool.opts.from_store || next.entry.refusal) return true;
    std::string message;
    const bool wanted = wants_song(pool.keeper, pool.opts, next.entry.path, next.file, message);
    write_message(pool.output, message);
    return wanted;
}

// Finds a few more inputs, unless enough are waiting.
void search_inputs(worker_pool &pool) {
    for (size_t i = 0; i < kFoundAtOnce && may_search(pool); ++i) {
        numbered_input next;
        pool.found = find_next(pool, next);
        if (pool.found == supply_state::ended) set_total(pool.output, pool.count);
        if (pool.found != supply_state::ready) break;
        if (!is_wanted(pool, next)) continue;
        next.index = pool.count++;
        pool.queue.push_back(std::move(next));
    }
    if (!pool.opts.quiet) write_message(pool.output, pool.supply.notes);
    pool.supply.notes.clear();
}

process *find_idle(worker_pool &pool) {
    for (process &worker : pool.processes) {
        if (worker.request_fd >= 0 && !worker.busy) return &worker;
    }
    return nullptr;
}

void send_request(process &worker, numbered_input &&next) {
    const request_head head = {next.index, next.entry.path.size(), next.recalled.size()};
    std::string sent(reinterpret_cast<const char *>(&head), sizeof head);
    sent += next.entry.path + next.recalled;
    worker.busy = true;
    worker.asked = std::move(next);
    // A worker that died meanwhile shows at its reply pipe's end.
    write_all(worker.request_fd, sent.data(), sent.size());
}

// Gives every idle worker an input, starting workers up to the number asked for.
void hand_out(worker_pool &pool) {
    while (!pool.ending && !pool.queue.empty()) {
        const numbered_input &first = pool.queue.front();
        if (first.index >= pool.output.next + kMostWaiting) return;
        if (first.entry.refusal) {
            fail_input(pool, first, first.entry.refusal.sentence);
            pool.queue.pop_front();
            continue;
        }
        process *worker = find_idle(pool);
        if (worker == nullptr && pool.processes.size() < static_cast<size_t>(pool.opts.jobs)) {
            const int code = start_process(pool);
            worker = code == 0 ? &pool.processes.back() : nullptr;
            if (code != 0 && pool.processes.empty()) {
                fail_input(pool, first,
                           system_sentence("The analysis process could not be started", code));
                pool.queue.pop_front();
                continue;
            }
        }
        if (worker == nullptr) return;
        send_request(*worker, std::move(pool.queue.front()));
        pool.queue.pop_front();
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
    if (worker.busy) {
        fail_input(pool, worker.asked,
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
    if (worker.received.size() < sizeof head) return;
    memcpy(&head, worker.received.data(), sizeof head);
    size_t size = sizeof head;
    for (const uint32_t bytes : head.text_bytes) size += bytes;
    if (worker.received.size() < size) return;
    reply made;
    made.status = head.status;
    size_t at = sizeof head;
    for (size_t i = 0; i < std::size(kReplyTexts); ++i) {
        made.*kReplyTexts[i] = worker.received.substr(at, head.text_bytes[i]);
        at += head.text_bytes[i];
    }
    worker.received.erase(0, size);
    worker.busy = false;
    take_result(pool, worker.asked, std::move(made));
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

// Takes the processes that are gone out of the list.
void remove_buried(worker_pool &pool) {
    size_t kept = 0;
    for (process &worker : pool.processes) {
        if (worker.pid < 0) continue;
        if (&pool.processes[kept] != &worker) pool.processes[kept] = std::move(worker);
        ++kept;
    }
    pool.processes.resize(kept);
}

// Of two times for poll, where -1 is for ever.
int shorter_wait(int a, int b) {
    return a < 0 || b < 0 ? std::max(a, b) : std::min(a, b);
}

// Waits for whatever comes next: replies, names in a list, a stop, the reader of the results gone.
// Returns at once while there are inputs to be found.
void wait_and_serve(worker_pool &pool) {
    const bool listening = may_search(pool) && pool.found == supply_state::waiting;
    const bool searching = may_search(pool) && !listening;
    std::vector<pollfd> watched;
    watched.push_back({pool.ending ? -1 : stop_fd(), POLLIN, 0});
    watched.push_back({pool.output.to_pipe && !pool.ending ? STDOUT_FILENO : -1, 0, 0});
    watched.push_back({listening ? supply_fd(pool.supply) : -1, POLLIN, 0});
    for (const process &worker : pool.processes) watched.push_back({worker.reply_fd, POLLIN, 0});
    const int timeout =
        searching ? 0
                  : shorter_wait(redraw_timeout_ms(pool.output), keeper_timeout_ms(pool.keeper));
    if (poll(watched.data(), watched.size(), timeout) > 0) {
        if ((watched[1].revents & POLLERR) != 0) note_reader_gone(pool.output);
        for (size_t i = 0; i < pool.processes.size(); ++i) {
            if (watched[i + 3].revents != 0) read_from(pool, pool.processes[i]);
        }
        remove_buried(pool);
    }
    write_message(pool.output, keep_time(pool.keeper));
    redraw(pool.output);
}

bool is_busy(const worker_pool &pool) {
    for (const process &worker : pool.processes) {
        if (worker.busy) return true;
    }
    return false;
}

}  // namespace

int run_workers(const options &opts, const reply_sink &sink) {
    worker_pool pool{opts, {opts}, supply_state::ready, {}, 0, {}, {}, sink, {}, false, false};
    std::string message = open_keeper(pool.keeper, opts);
    if (message.empty()) message = start_output(pool.output, opts);
    write_message(pool.output, message);
    if (!message.empty()) return kExitFailed;
    while (true) {
        search_inputs(pool);
        hand_out(pool);
        const bool stop = stop_requested() || output_failed(pool.output) || pool.keeper.failed;
        const bool exhausted = pool.found == supply_state::ended && pool.queue.empty();
        // Only a stop may reach workers that still have a file.
        if (!pool.ending && (stop || (exhausted && !is_busy(pool)))) tell_to_end(pool);
        if (pool.processes.empty() && pool.ending) break;
        wait_and_serve(pool);
    }
    write_message(pool.output, close_keeper(pool.keeper, opts));
    return finish_output(pool.output, opts, pool.unclean || pool.keeper.failed);
}
