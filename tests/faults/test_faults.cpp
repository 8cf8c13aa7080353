// Every call of memory, threads, locks and files fails in its turn, once and from there on: nothing
// crashes, hangs or leaks, and each job calls back once. TAVO_FAULTS=all tries all places.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstring>

#include "tests/support/bytes.h"
#include "tests/support/fault_layer.h"
#include "tests/support/job_harness.h"

namespace {

using fault::plan;

// Kinds of calls that fail together. unharmed: the result is the undisturbed one all the same.
struct group {
    const char *name;
    uint32_t calls;
    bool unharmed;
    int error = EIO;
};
constexpr uint32_t kClickTrack = fault::kFopen | fault::kFwrite;
constexpr group kGroups[] = {
    {"memory", fault::kMemory, false},
    {"thread", fault::kThread, true},
    {"mutex", fault::kMutex, false},
    {"condition", fault::kCondition, false},
    {"open", fault::kOpen, false},
    {"read", fault::kRead, false},
    {"interrupted", fault::kRead, true, EINTR},
    {"seek", fault::kSeek, false},
    {"close", fault::kClose, true},
    {"click", kClickTrack, true},
};
constexpr int kOpenedOnly = -1;

// The outcome of a run.
struct outcome {
    int32_t created = 99, started = 0, released = 0, state = 0, complete = 0;
    int64_t met = 0, refused = 0;  // calls
    int64_t early = 0;             // of those refused, before the job
    double song_ms = 0.0;
    job::result result;
};

char current[256];  // the run that a crash or a hang interrupts

void tell(int) {
    (void)!write(STDERR_FILENO, current, strlen(current));
    _exit(3);
}

int64_t descriptors() {
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return std::distance(begin(all), end(all));
}

outcome run(const std::string &path, int mode, const plan &by) {
    const support::temporary_file click("click");
    outcome out;
    alarm(60);
    fault::arm(by);
    TAVO_CTX *ctx = job::create(path, std::max(mode, 0), &out.created);
    if (ctx != nullptr) {
        out.early = fault::refused();
        out.song_ms = static_cast<double>(ctx->duration) / kUnitsPerMs;
        fnamedec = click.path.c_str();
        out.started = mode == kOpenedOnly ? 1 : tavo_analyze(ctx, 0, 0, 0);
        if (out.started == 0) job::wait();
        out.state = load_flag(&ctx->state);
        out.complete = tavo_is_complete(ctx);
        out.released = tavo_deinit(ctx);
    }
    out.met = fault::met();
    out.refused = fault::refused();
    fault::disarm();
    alarm(0);
    out.result = job::last;
    return out;
}

// Null if all promises hold, else the broken one.
const char *flaw_of(const outcome &found, int mode, const group &kind, const plan &by,
                    const outcome &undisturbed) {
    if (found.created != 0) {
        const bool record =
            kind.calls == fault::kMemory && by.place < (mode == TAVO_MODE_BOTH ? 4 : 3);
        if (kind.unharmed || found.result.calls != 0) return "a failed tavo_init";
        const int32_t expected = record ? TAVO_ERR_MEMORY : TAVO_ERR_HANDLE;
        return found.created == expected ? nullptr : "code of tavo_init";
    }
    if (found.released != 0) return "code of tavo_deinit";
    constexpr uint32_t kLocks = fault::kMutex | fault::kCondition;
    if (found.early > 0 && (kind.calls & kLocks) != 0) return "a lock that was refused";
    if (mode == kOpenedOnly) return nullptr;
    const bool no_job = kind.calls == fault::kThread && by.place == 0;
    if (found.started != (no_job ? TAVO_ERR_MEMORY : 0)) return "code of tavo_analyze";
    if (no_job) return found.result.calls == 0 ? nullptr : "callback without a job";
    if (found.state != (found.result.status == 0 ? kStateFinished : kStateFailed)) return "state";
    // A failure while opening is reported there or does no harm.
    const job::result &a = found.result, &b = undisturbed.result;
    const bool same = a.status == b.status && a.hl_pos == b.hl_pos && a.beats == b.beats;
    if (!same && (kind.unharmed || found.refused == found.early)) return "result";
    if (!same && a.status == 0 && found.complete == 1)
        return "another result, reported as complete";
    if (a.hl_pos < 0 || a.hl_pos > found.song_ms) return "highlight";
    const bool inside = a.beats.empty() || (a.beats.front() >= static_cast<float>(a.hl_pos) &&
                                            a.beats.back() <= found.song_ms);
    return inside ? job::flaw_of(a, mode) : "beats outside the song";
}

// Fails count of the places of this job, spread evenly; all of them when there are no more.
void try_places(const std::string &path, int mode, const group &kind, int64_t count) {
    plan by = {kind.calls, INT64_MAX, false, kind.error};
    const outcome undisturbed = run(path, mode, by);
    ASSERT_EQ(undisturbed.created, 0) << path;
    ASSERT_EQ(undisturbed.result.status, mode == kOpenedOnly ? -2 : 0) << path;
    ASSERT_EQ(undisturbed.result.hl_pos > 0, mode == TAVO_MODE_HIGHLIGHT || mode == TAVO_MODE_BOTH)
        << path;
    const int64_t step =
        getenv("TAVO_FAULTS") != nullptr ? 1 : std::max<int64_t>(1, undisturbed.met / count);
    int64_t struck = 0;
    for (by.place = 0; by.place < undisturbed.met; by.place += step) {
        for (const bool forever : {false, true}) {
            by.forever = forever && kind.error != EINTR;
            snprintf(current, sizeof current, "interrupted: %s, mode %d, %s %d%s\n", path.c_str(),
                     mode, kind.name, static_cast<int>(by.place), by.forever ? " and on" : "");
            const int64_t before = descriptors();
            const outcome found = run(path, mode, by);
            struck += found.refused > 0 ? 1 : 0;
            const char *flaw = flaw_of(found, mode, kind, by, undisturbed);
            EXPECT_EQ(flaw, nullptr) << flaw << "; " << current;
            EXPECT_EQ(descriptors(), before) << current;
        }
    }
    EXPECT_GT(struck, 0) << path << ' ' << kind.name;
}

class Faults : public testing::TestWithParam<std::tuple<const char *, int>> {
 protected:
    void SetUp() override {
        for (const int number : {SIGALRM, SIGSEGV, SIGABRT}) signal(number, tell);
    }
    const std::string format = std::get<0>(GetParam());
    const int mode = std::get<1>(GetParam());
    const int64_t count = format == "wav" && EVERY_PLACE ? INT64_MAX : FAULT_SAMPLE;
};

TEST_P(Faults, AtEveryPlace) {
    const std::string song = mode == kOpenedOnly ? "/many." : "/long.";
    for (const group &kind : kGroups) {
        if (mode == kOpenedOnly && (kind.unharmed || kind.calls == fault::kMutex)) continue;
        if (mode == TAVO_MODE_HIGHLIGHT && kind.calls == kClickTrack) continue;
        try_places(SHORT_SONGS + song + format, mode, kind, count);
    }
}

// The thread sanitizer slows the rest down most, and finds no other threads in them.
const auto kFormats = EVERY_PLACE ? std::vector{"wav", "mp3", "m4a", "flac", "aac", "ogg"}
                                  : std::vector{"wav", "mp3"};
INSTANTIATE_TEST_SUITE_P(Jobs, Faults,
                         testing::Combine(testing::ValuesIn(kFormats),
                                          testing::Values(kOpenedOnly, 0, 1, 2)));

// A path that names a descriptor, which every source duplicates. Duplicates share one offset:
// a song that is decoded in one part is read by one of them at a time.
TEST(FaultsOfFiles, Duplicates) {
    const int input = dup(STDIN_FILENO);
    const int file = open(SHORT_SONGS "/brief.flac", O_RDONLY);
    ASSERT_EQ(dup2(file, STDIN_FILENO), STDIN_FILENO);
    close(file);
    try_places("fd", TAVO_MODE_BEATS, {"dup", fault::kDup, false}, INT64_MAX);
    dup2(input, STDIN_FILENO);
    close(input);
}

}  // namespace
