// The command: reads the options, finds the files that they name, sends these to worker processes,
// and the replies to the store and to the output.
#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <cstdio>
#include <deque>
#include <exception>
#include <vector>

#include "cli/input/inputs.h"
#include "cli/options.h"
#include "cli/run/ordered_output.h"
#include "cli/run/process_pool.h"
#include "cli/store/store.h"
#include "cli/system.h"

namespace {

constexpr size_t kMostAhead = 10'000;  // inputs found whose results are not written yet
constexpr size_t kFoundAtOnce = 64;    // names examined between two calls to poll
constexpr int kTickMs = 100;  // time between two checks for a stop, an old batch and a late worker

struct run_state {
    const options &opts;
    input_supply supply{opts};
    process_pool pool{opts};
    supply_state found = supply_state::ready;  // result of the last search
    std::deque<input> queue = {};
    size_t count = 0;  // inputs found so far
    ordered_output output = {};
    store db = {};
    bool is_ending = false;  // no more inputs are assigned
};

void accept_result(run_state &state, input &&done, reply &&answer) {
    const size_t index = done.index;
    if (!state.opts.from_store) {
        done.stored = std::move(answer.json);
        report_failure(state.output, add_song(state.db, std::move(done)));
    }
    accept_reply(state.output, index, std::move(answer));
}

// Finds the next input from the command line or the store.
supply_state find_next(run_state &state, input &next) {
    if (!state.opts.from_store) return next_input(state.supply, next);
    bool found = false;
    report_failure(state.output, read_next(state.db, next, found));
    return found ? supply_state::ready : supply_state::ended;
}

// True if the input belongs to this command's shard and is not skipped as already stored.
bool is_wanted(run_state &state, input &next) {
    if (!in_shard(state.opts.share, next.path)) return false;
    if (state.opts.from_store || next.refusal) return true;
    bool is_new = true;
    report_failure(state.output, find_song(state.db, next, is_new));
    return is_new;
}

bool may_search(const run_state &state) {
    return !state.is_ending && state.found != supply_state::ended &&
           state.count < state.output.next + kMostAhead;
}

// Finds a few more inputs unless enough are queued.
void search_inputs(run_state &state) {
    for (size_t i = 0; i < kFoundAtOnce && may_search(state); ++i) {
        input next;
        state.found = find_next(state, next);
        if (state.found == supply_state::ended) state.output.total = state.count;
        if (state.found == supply_state::waiting) break;
        if (state.found != supply_state::ready || !is_wanted(state, next)) continue;
        next.index = state.count++;
        state.queue.push_back(std::move(next));
    }
    if (!state.opts.quiet) write_message(state.output, state.supply.notes);
    state.supply.notes.clear();
}

// Waits for replies, names in a list, a stop, or the end of the process that reads the results.
// Does not wait while inputs are being searched for.
void wait_and_serve(run_state &state) {
    const bool is_listening = may_search(state) && state.found == supply_state::waiting;
    std::vector<pollfd> watched = {{state.is_ending ? -1 : STDOUT_FILENO, 0, 0},
                                   {is_listening ? state.supply.list.fd : -1, POLLIN, 0}};
    poll_workers(state.pool, watched, may_search(state) && !is_listening ? 0 : kTickMs);
    if ((watched[0].revents & (POLLERR | POLLHUP)) == POLLERR) state.output.write_error = EPIPE;
    report_failure(state.output, commit_old_batch(state.db));
    draw_progress(state.output);
}

// Ends the workers if a stop is requested or no work is left.
void end_if_done(run_state &state) {
    if (state.is_ending) return;
    const bool is_stop = stop_signal() != 0 || state.output.write_error != 0 || state.db.has_failed;
    const bool is_done = state.found == supply_state::ended && state.output.next == state.count;
    if (!is_stop && !is_done) return;
    state.is_ending = true;
    end_workers(state.pool, is_stop);
}

// Returns the command's exit status. Does not return in a worker process.
int analyse_inputs(const options &opts) {
    run_state state{opts};
    state.pool.on_reply = [&](input &&done, reply &&answer) {
        accept_result(state, std::move(done), std::move(answer));
    };
    state.pool.on_bad_end = [&](const failure &failed) { report_failure(state.output, failed); };
    if (report_failure(state.output, open_store(state.db, opts))) {
        return stop_signal() != 0 ? kExitSignal + stop_signal() : kExitFailed;
    }
    if (report_failure(state.output, start_output(state.output, opts))) return kExitFailed;
    while (true) {
        search_inputs(state);
        while (!state.is_ending && !state.queue.empty() &&
               assign(state.pool, state.queue.front())) {
            state.queue.pop_front();
        }
        end_if_done(state);
        if (state.is_ending && state.pool.running == 0) break;
        wait_and_serve(state);
    }
    if (state.db.known_failed > 0) state.output.has_failure = true;
    std::string summary;
    report_failure(state.output, close_store(state.db, summary));
    write_message(state.output, summary);
    return finish_output(state.output, opts);
}

// Opens /dev/null in place of each closed standard stream, so that no other file gets its
// descriptor number. Opens it read-only, so that writes still fail.
void open_standard_streams() {
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
        if (fcntl(fd, F_GETFD) < 0) open("/dev/null", O_RDONLY);
    }
}

}  // namespace

int main(int argc, char **argv) {
    try {
        open_standard_streams();
        options opts;
        if (const std::optional<int> status = parse_options(argc, argv, opts)) return *status;
        watch_for_stop();
        return analyse_inputs(opts);
    } catch (const std::exception &error) {  // out of memory
        fprintf(stderr, "tavo: %s\n", error.what());
    }
    return kExitFailed;
}
