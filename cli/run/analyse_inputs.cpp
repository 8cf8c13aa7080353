#include "cli/run/analyse_inputs.h"

#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <deque>
#include <vector>

#include "cli/input/inputs.h"
#include "cli/run/ordered_output.h"
#include "cli/run/process_pool.h"
#include "cli/run/stop.h"
#include "cli/store/store.h"

namespace {

constexpr size_t kMostAhead = 10'000;   // inputs waiting for a worker
constexpr size_t kFoundAtOnce = 64;     // names examined between two calls to poll
constexpr size_t kMostWaiting = 1'000;  // results that may wait for an earlier one

struct run_state {
    const options &opts;
    input_supply supply{opts};
    process_pool pool{opts};
    supply_state found = supply_state::ready;  // result of the last search
    std::deque<job> queue = {};
    size_t count = 0;  // inputs found so far
    ordered_output output = {};
    store db = {};
    bool is_ending = false;  // no more jobs are sent
};

void accept_result(run_state &state, job &&done, reply &&answer) {
    if (done.stored.empty()) {
        report_failure(
            state.output,
            add_song(state.db, {done.entry.path, done.file, std::move(answer.json), {}}));
    }
    accept_reply(state.output, done.index, std::move(answer));
}

// Finds the next input from the command line or the store.
supply_state find_next(run_state &state, job &next) {
    if (!state.opts.from_store) return next_input(state.supply, next.entry);
    stored_song song;
    bool found = false;
    report_failure(state.output, read_next(state.db, song, found));
    next.entry = {song.path, song.damage};
    next.stored = song.result;
    return found ? supply_state::ready : supply_state::ended;
}

// True if the input belongs to this command's shard and is not skipped as already stored.
bool is_wanted(run_state &state, job &next) {
    if (!in_shard(state.opts.share, next.entry.path)) return false;
    if (state.opts.from_store || next.entry.refusal) return true;
    bool is_new = true;
    report_failure(state.output, find_song(state.db, next.entry.path, next.file, is_new));
    return is_new;
}

bool may_search(const run_state &state) {
    return !state.is_ending && state.found != supply_state::ended &&
           state.queue.size() < kMostAhead;
}

// Finds a few more inputs unless enough are queued.
void search_inputs(run_state &state) {
    for (size_t i = 0; i < kFoundAtOnce && may_search(state); ++i) {
        job next;
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

bool may_send(const run_state &state) {
    return !state.is_ending && !state.queue.empty() &&
           state.queue.front().index < state.output.next + kMostWaiting;
}

// Waits for replies, names in a list, a stop, or the end of the process that reads the results.
// Does not wait while inputs are being searched for.
void wait_and_serve(run_state &state) {
    const bool is_listening = may_search(state) && state.found == supply_state::waiting;
    int wait_ms = batch_timeout_ms(state.db);
    if (state.output.has_bar && (wait_ms < 0 || wait_ms > kRedrawMs)) wait_ms = kRedrawMs;
    if (may_search(state) && !is_listening) wait_ms = 0;
    std::vector<pollfd> watched = {
        {state.is_ending ? -1 : stop_fd(), POLLIN, 0},
        {state.output.to_pipe && !state.is_ending ? STDOUT_FILENO : -1, 0, 0},
        {is_listening ? state.supply.list.fd : -1, POLLIN, 0}};
    poll_workers(state.pool, watched, wait_ms);
    if ((watched[1].revents & POLLERR) != 0) state.output.write_error = EPIPE;
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

}  // namespace

int analyse_inputs(const options &opts) {
    run_state state{opts};
    state.pool.on_reply = [&](job &&done, reply &&answer) {
        accept_result(state, std::move(done), std::move(answer));
    };
    state.pool.on_bad_end = [&](const failure &failed) { report_failure(state.output, failed); };
    if (report_failure(state.output, open_store(state.db, opts))) return kExitFailed;
    if (report_failure(state.output, start_output(state.output, opts))) return kExitFailed;
    while (true) {
        search_inputs(state);
        while (may_send(state) && send_job(state.pool, state.queue.front())) {
            state.queue.pop_front();
        }
        end_if_done(state);
        if (state.is_ending && state.pool.processes.empty()) break;
        wait_and_serve(state);
    }
    if (state.db.known_failed > 0) state.output.has_failure = true;
    std::string summary;
    report_failure(state.output, close_store(state.db, summary));
    write_message(state.output, summary);
    return finish_output(state.output, opts);
}
