#include "tests/faults/fault_run.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>

#include "tests/faults/trial.h"

extern "C" void __sanitizer_set_death_callback(void (*callback)()) __attribute__((weak));

namespace fault {

namespace {

constexpr unsigned kHangSeconds = 60;
constexpr int64_t kMissesAtEnd = 3;  // the threads take turns: one more or less from run to run

const char *const kCallNames[] = {"none", "allocation", "thread", "mutex", "condition",  "open",
                                  "dup",  "read",       "seek",   "close", "click_track"};

// The run that a crash or a hang interrupts; written before it.
char current[512];

void tell_place() {
    const ssize_t told = write(STDERR_FILENO, current, strlen(current));
    static_cast<void>(told);
}
void on_signal(int number) {
    tell_place();
    if (number == SIGALRM) _exit(124);
    signal(number, SIG_DFL);
    raise(number);
}

// A sanitizer's own handlers stay.
void watch() {
    static const bool once = [] {
        for (const int number : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGABRT, SIGALRM}) {
            struct sigaction set = {};
            sigaction(number, nullptr, &set);
            if (set.sa_handler == SIG_DFL) signal(number, on_signal);
        }
        if (__sanitizer_set_death_callback != nullptr) __sanitizer_set_death_callback(tell_place);
        return true;
    }();
    static_cast<void>(once);
}

std::string describe(const subject &of, const plan &by) {
    const size_t slash = of.path.rfind('/');
    return of.path.substr(slash + 1) + " mode " + std::to_string(of.mode) +
           (of.second_decoding ? " decoded twice, " : ", ") +
           kCallNames[static_cast<size_t>(by.what)] + " " + std::to_string(by.place) +
           (by.forever ? " and on" : "") + "\n";
}

void start(const subject &of, TAVO_CTX *ctx, outcome *out) {
    hide_landing(of.second_decoding);
    out->started = tavo_analyze(ctx, 0, 0, 0);
    if (out->started != 0) {
        out->state = load_flag(&ctx->state);
        disarm();
        out->started_again = tavo_analyze(ctx, 0, 0, 0);
    }
    if (out->started_again == 0) {
        job::wait();
        out->state = load_flag(&ctx->state);
    }
    hide_landing(false);
}

bool same(const outcome &run, const outcome &other) {
    const job::result &a = run.result;
    const job::result &b = other.result;
    return run.created == other.created && run.song_ms == other.song_ms && a.status == b.status &&
           a.hl_pos == b.hl_pos && a.beats == b.beats;
}

// Null when the record is as the mode and its own status say.
const char *flaw_of(const job::result &found, int32_t mode, double song_ms) {
    if (found.hl_pos < 0 || found.hl_pos > song_ms) return "highlight outside the song";
    if (mode == TAVO_MODE_BEATS && found.hl_pos != 0) return "highlight without a search";
    if (found.status != 0 && (found.status != -1 || mode == TAVO_MODE_HIGHLIGHT)) return "status";
    if (found.status == -1 || mode == TAVO_MODE_HIGHLIGHT) {
        return found.beat_count == 0 && found.null_beats ? nullptr : "beats where none belong";
    }
    if (found.beat_count < 1 || found.null_beats) return "no beats";
    float last = static_cast<float>(found.hl_pos);
    for (const float beat : found.beats) {
        if (!(beat >= last && beat <= song_ms)) return "beats out of order or outside the song";
        last = beat;
    }
    return nullptr;
}

// The first calls of a kind, whose failure tavo_init reports as out of memory: the instance, its
// result and the records of its mode.
int64_t memory_places(const subject &of, const plan &by) {
    if (by.what != call::allocation) return 0;
    return of.mode == TAVO_MODE_BOTH ? 4 : 3;
}

// Null when a run ended as the interface says. The number of callbacks is looked at elsewhere.
const char *flaw_of(const outcome &run, const subject &of, const plan &by) {
    if (!run.created) {
        const int32_t code = by.place < memory_places(of, by) ? -2 : -4;
        return run.created_code == code ? nullptr : "code of tavo_init";
    }
    if (run.created_code != 0 || run.released != 0) return "code of tavo_init or tavo_deinit";
    if (!of.analysed) return nullptr;
    // The first thread is the job's.
    const bool refused = by.what == call::thread && by.place == 0;
    if (run.started != (refused ? -2 : 0) || run.started_again != 0) return "code of tavo_analyze";
    const int32_t state = run.result.status == 0 ? kStateFinished : kStateFailed;
    if (run.state != state) return "state";
    return flaw_of(run.result, of.mode, run.song_ms);
}

}  // namespace

outcome run(const subject &of, const plan &by) {
    watch();
    snprintf(current, sizeof(current), "interrupted: %s", describe(of, by).c_str());
    static const std::string click =
        testing::TempDir() + "tavo_faults_" + std::to_string(getpid()) + ".wav";
    static const struct removal {
        ~removal() { unlink(click.c_str()); }
    } at_end;
    outcome out;
    const holdings before = held();
    alarm(kHangSeconds);
    arm(by);
    TAVO_CTX *ctx = job::create(of.path, of.mode, &out.created_code);
    out.created = ctx != nullptr;
    if (ctx != nullptr) {
        fnamedec = click.c_str();
        out.song_ms = static_cast<double>(ctx->duration) / kUnitsPerMs;
        out.early = refusals();
        if (of.analysed) start(of, ctx, &out);
        out.released = tavo_deinit(ctx);
    }
    out.calls = calls(by.what);
    out.refusals = refusals();
    out.plans = second_plans();
    disarm();
    alarm(0);
    out.result = job::last;
    const holdings after = held();
    out.left = {after.blocks - before.blocks, after.locks - before.locks,
                after.descriptors - before.descriptors};
    return out;
}

std::vector<std::pair<std::string, std::string>> tally::columns() const {
    // A run that hangs ends the program by its alarm.
    const std::pair<const char *, int64_t> all[] = {
        {"places", places},       {"runs", runs},
        {"refused", refused},     {"failed", failed},
        {"differing", differing}, {"complete", complete},
        {"leaked", leaked},       {"hung", runs - ended},
        {"wrong", wrong},         {"callbacks_wrong", callbacks_wrong}};
    std::vector<std::pair<std::string, std::string>> text;
    for (const auto &[name, value] : all) text.emplace_back(name, std::to_string(value));
    return text;
}

outcome judged(const subject &of, const plan &by, const outcome &undisturbed, bool equal,
               tally *sum) {
    ++sum->runs;
    const outcome found = run(of, by);
    ++sum->ended;
    sum->places += found.refusals > 0 ? 1 : 0;
    const bool whole = same(found, undisturbed);
    ++(!found.created                       ? sum->refused
       : found.result.status != 0 && !whole ? sum->failed
       : whole                              ? sum->complete
                                            : sum->differing);

    const char *flaw = flaw_of(found, of, by);
    // What was met while opening is reported there or does no harm.
    const bool unharmed = found.created && found.early > 0 && found.early == found.refusals;
    if (flaw == nullptr && (equal || unharmed) && !whole) flaw = "result";
    const bool leak =
        found.left.blocks != 0 || found.left.locks != 0 || found.left.descriptors != 0;
    const bool calls = found.result.calls != (found.created && of.analysed ? 1 : 0);
    sum->wrong += flaw != nullptr ? 1 : 0;
    sum->leaked += leak ? 1 : 0;
    sum->callbacks_wrong += calls ? 1 : 0;
    if (flaw != nullptr || leak || calls) {
        ADD_FAILURE() << describe(of, by) << (flaw != nullptr ? flaw : "") << "; left "
                      << found.left.blocks << " blocks, " << found.left.locks << " locks, "
                      << found.left.descriptors << " files; " << found.result.calls << " callbacks";
    }
    return found;
}

void at_every_place(const subject &of, plan by, bool equal, int64_t quick, tally *sum) {
    by.place = INT64_MAX;
    const outcome undisturbed = run(of, by);
    ASSERT_TRUE(undisturbed.created) << describe(of, by);
    ASSERT_EQ(undisturbed.result.status == 0, of.analysed) << describe(of, by);
    ASSERT_EQ(undisturbed.result.hl_pos > 0, of.analysed && of.mode != TAVO_MODE_BEATS);
    ASSERT_TRUE(!of.second_decoding || undisturbed.plans == 1) << describe(of, by);
    for (const int64_t place : trial::places(undisturbed.calls, quick)) {
        by.place = place;
        judged(of, by, undisturbed, equal, sum);
    }
    by.place = undisturbed.calls;
    for (int64_t missed = 0; trial::full() && missed < kMissesAtEnd; ++by.place) {
        const outcome found = judged(of, by, undisturbed, equal, sum);
        missed = found.refusals > 0 ? 0 : missed + 1;
    }
}

}  // namespace fault
