#include "cli/run/analyse_inputs.h"

#include <poll.h>
#include <unistd.h>

#include <deque>
#include <vector>

#include "cli/input/inputs.h"
#include "cli/run/ordered_output.h"
#include "cli/run/process_pool.h"
#include "cli/run/stop.h"
#include "cli/run/worker_process.h"
#include "cli/store/store.h"

namespace {

constexpr size_t kMostAhead = 10'000;   // inputs found but not yet being analysed
constexpr size_t kFoundAtOnce = 64;     // inputs found before the workers are served again
constexpr size_t kMostWaiting = 1'000;  // results that wait for an earlier one

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
    bool has_error = false;  // an error that does not belong to a file
};

// Prints a failure that does not belong to a single file. Returns true if there was one.
bool report(run_state &state, const failure &failed) {
    if (!failed) return false;
    state.has_error = true;
    write_message(state.output, "tavo: " + failed.sentence + "\n");
    return true;
}

void accept_result(run_state &state, job &&done, reply &&answer) {
    if (done.message.stored.empty()) {
        report(state,
               add_song(state.db, {done.message.path, done.file, std::move(answer.json), {}}));
    }
    accept_reply(state.output, done.message.index, std::move(answer));
}

// Finds the next input from the command line or the store.
supply_state find_next(run_state &state, job &next) {
    if (!state.opts.from_store) {
        input entry;
        const supply_state found = next_input(state.supply, entry);
        next.message.path = std::move(entry.path);
        next.refusal = std::move(entry.refusal);
        return found;
    }
    stored_song song;
    bool found = false;
    report(state, read_next(state.db, song, found));
    next.message.path = song.path;
    next.message.stored = song.result;
    next.refusal = song.damage;
    return found ? supply_state::ready : supply_state::ended;
}

// True if the input belongs to this command's shard and is not stored yet.
bool is_wanted(run_state &state, job &next) {
    if (!in_shard(state.opts.share, next.message.path)) return false;
    if (state.opts.from_store || next.refusal) return true;
    bool is_new = true;
    report(state, find_song(state.db, next.message.path, next.file, is_new));
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
        next.message.index = state.count++;
        state.queue.push_back(std::move(next));
    }
    if (!state.opts.quiet) write_message(state.output, state.supply.notes);
    state.supply.notes.clear();
}

// Sends a job to every idle worker.
void send_jobs(run_state &state) {
    while (!state.is_ending && !state.queue.empty()) {
        job &first = state.queue.front();
        if (first.message.index >= state.output.next + kMostWaiting) return;
        failure failed = first.refusal;
        worker_process *worker = failed ? nullptr : find_idle(state.pool, failed);
        if (worker == nullptr && !failed) return;
        job next = std::move(first);
        state.queue.pop_front();
        if (failed) {
            const record result =
                failed_record(next.message.path, state.opts.mode, failed.sentence);
            accept_result(state, std::move(next), make_reply(result, state.opts));
        } else {
            send_job(state.pool, *worker, std::move(next));
        }
    }
}

// Returns how long poll may wait: until the earliest of the timeouts. -1 means no limit.
int wait_ms(const run_state &state) {
    int shortest = state.output.bar.shown ? kRedrawMs : -1;
    for (const int wait : {batch_timeout_ms(state.db), deadline_timeout_ms(state.pool)}) {
        if (wait >= 0 && (shortest < 0 || wait < shortest)) shortest = wait;
    }
    return shortest;
}

// Waits for replies, names in a list, a stop, or the end of the process that reads the results.
// Does not wait while inputs are being searched for.
void wait_and_serve(run_state &state) {
    const bool is_listening = may_search(state) && state.found == supply_state::waiting;
    const bool is_searching = may_search(state) && !is_listening;
    std::vector<pollfd> watched = {
        {state.is_ending ? -1 : stop_fd(), POLLIN, 0},
        {state.output.to_pipe && !state.is_ending ? STDOUT_FILENO : -1, 0, 0},
        {is_listening ? state.supply.list.fd : -1, POLLIN, 0}};
    const size_t first_worker = watched.size();
    append_watched(state.pool, watched);
    if (poll(watched.data(), watched.size(), is_searching ? 0 : wait_ms(state)) >= 0) {
        if ((watched[1].revents & POLLERR) != 0) state.output.reader_gone = true;
        serve_workers(state.pool, watched.data() + first_worker);
    }
    report(state, commit_old_batch(state.db));
    draw_progress(state.output.bar, state.output.done, state.output.total);
}

// Ends the workers at a stop or if no work is left.
void end_if_done(run_state &state) {
    if (state.is_ending) return;
    const bool is_stop = stop_signal() != 0 || output_failed(state.output) || state.db.has_failed;
    const bool is_exhausted = state.found == supply_state::ended && state.queue.empty();
    if (!is_stop && (!is_exhausted || has_busy(state.pool))) return;
    state.is_ending = true;
    end_workers(state.pool, is_stop);
}

}  // namespace

int analyse_inputs(const options &opts) {
    run_state state{opts};
    state.pool.on_reply = [&](job &&done, reply &&answer) {
        accept_result(state, std::move(done), std::move(answer));
    };
    state.pool.on_bad_end = [&](const failure &failed) { report(state, failed); };
    if (report(state, open_store(state.db, opts))) return kExitFailed;
    if (report(state, start_output(state.output, opts))) return kExitFailed;
    while (true) {
        search_inputs(state);
        send_jobs(state);
        end_if_done(state);
        if (state.is_ending && state.pool.processes.empty()) break;
        wait_and_serve(state);
    }
    const bool has_known_failure = state.db.known_failed > 0;
    std::string summary;
    report(state, close_store(state.db, summary));
    write_message(state.output, summary);
    return finish_output(state.output, opts, state.has_error || has_known_failure);
}
