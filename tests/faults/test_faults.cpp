// Runs jobs in which a call to a memory, thread, lock or file function fails, alone or with all
// later ones. Nothing crashes, hangs or leaks, and each job calls back once. TAVO_FAULTS=all tries
// every call.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>

#include "tests/support/bytes.h"
#include "tests/support/fault_layer.h"
#include "tests/support/job_harness.h"

namespace {

// Functions that fail together. Harmless failures do not change the result of a job.
struct group {
    const char *name;
    uint32_t calls;
    bool harmless;
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

struct outcome {
    int32_t created = 99, started = 0, released = 0, state = 0, complete = 0;
    int64_t counted = 0, failed = 0;  // number of counted calls and of failed ones
    int64_t failed_early = 0;         // number of failed calls before the job
    double song_ms = 0.0;
    job::result result;
};

int64_t count_descriptors() {
    const std::filesystem::directory_iterator entries("/proc/self/fd");
    return std::distance(begin(entries), end(entries));
}

outcome run(const std::string &path, int mode, const fault::plan &plan) {
    const support::temporary_file click("click");
    outcome out;
    alarm(60);
    fault::arm(plan);
    TAVO_CTX *ctx = job::create(path, std::max(mode, 0), &out.created);
    if (ctx != nullptr) {
        out.failed_early = fault::failed_calls;
        out.song_ms = static_cast<double>(ctx->duration) / kUnitsPerMs;
        fnamedec = click.path.c_str();
        out.started = mode == kOpenedOnly ? 1 : tavo_analyze(ctx, 0, 0, 0);
        if (out.started == 0) job::wait();
        out.state = load_flag(&ctx->state);
        out.complete = tavo_is_complete(ctx);
        out.released = tavo_deinit(ctx);
    }
    out.counted = fault::counted_calls;
    out.failed = fault::failed_calls;
    fault::disarm();
    alarm(0);
    out.result = job::last;
    return out;
}

// Returns null if all promises hold, otherwise the name of a broken one.
const char *find_broken_promise(const outcome &found, int mode, const group &kind,
                                const fault::plan &plan, const outcome &undisturbed) {
    if (found.created != 0) {
        const bool failed_record =
            kind.calls == fault::kMemory && plan.index < (mode == TAVO_MODE_BOTH ? 4 : 3);
        if (kind.harmless || found.result.calls != 0) return "a failed tavo_init";
        const int32_t expected = failed_record ? TAVO_ERR_MEMORY : TAVO_ERR_HANDLE;
        return found.created == expected ? nullptr : "code of tavo_init";
    }
    if (found.released != 0) return "code of tavo_deinit";
    constexpr uint32_t kLocks = fault::kMutex | fault::kCondition;
    if (found.failed_early > 0 && (kind.calls & kLocks) != 0) return "a lock that failed";
    if (mode == kOpenedOnly) return nullptr;
    const bool no_job = kind.calls == fault::kThread && plan.index == 0;
    if (found.started != (no_job ? TAVO_ERR_MEMORY : 0)) return "code of tavo_analyze";
    if (no_job) return found.result.calls == 0 ? nullptr : "callback without a job";
    if (found.state != (found.result.status == 0 ? kStateFinished : kStateFailed)) return "state";
    // A failure in tavo_init must be reported there or have no effect.
    const job::result &a = found.result, &b = undisturbed.result;
    const bool same = a.status == b.status && a.hl_pos == b.hl_pos && a.beats == b.beats;
    if (!same && (kind.harmless || found.failed == found.failed_early)) return "result";
    if (!same && a.status == 0 && found.complete == 1)
        return "another result, reported as complete";
    if (a.hl_pos < 0 || a.hl_pos > found.song_ms) return "highlight";
    const bool in_song = a.beats.empty() || (a.beats.front() >= static_cast<float>(a.hl_pos) &&
                                             a.beats.back() <= found.song_ms);
    return in_song ? job::find_inconsistency(a, mode) : "beats outside the song";
}

// Makes about `count` evenly spread calls fail in turn, each first alone, then with all later ones.
void try_calls(const std::string &path, int mode, const group &kind, int64_t count) {
    fault::plan plan = {kind.calls, INT64_MAX, false, kind.error};
    const outcome undisturbed = run(path, mode, plan);
    ASSERT_EQ(undisturbed.created, 0) << path;
    ASSERT_EQ(undisturbed.result.status, mode == kOpenedOnly ? -2 : 0) << path;
    ASSERT_EQ(undisturbed.result.hl_pos > 0, mode == TAVO_MODE_HIGHLIGHT || mode == TAVO_MODE_BOTH)
        << path;
    const int64_t step =
        getenv("TAVO_FAULTS") != nullptr ? 1 : std::max<int64_t>(1, undisturbed.counted / count);
    int64_t applied = 0;
    for (plan.index = 0; plan.index < undisturbed.counted; plan.index += step) {
        for (const bool forever : {false, true}) {
            plan.forever = forever && kind.error != EINTR;
            snprintf(job::current_run, sizeof job::current_run,
                     "interrupted: %s, mode %d, %s %d%s\n", path.c_str(), mode, kind.name,
                     static_cast<int>(plan.index), plan.forever ? " and on" : "");
            const int64_t before = count_descriptors();
            const outcome found = run(path, mode, plan);
            applied += found.failed > 0 ? 1 : 0;
            const char *broken = find_broken_promise(found, mode, kind, plan, undisturbed);
            EXPECT_EQ(broken, nullptr) << broken << "; " << job::current_run;
            EXPECT_EQ(count_descriptors(), before) << job::current_run;
        }
    }
    EXPECT_GT(applied, 0) << path << ' ' << kind.name;
}

class Faults : public testing::TestWithParam<std::tuple<const char *, int>> {
 protected:
    void SetUp() override { job::report_interruptions(); }
    const std::string format = std::get<0>(GetParam());
    const int mode = std::get<1>(GetParam());
    const int64_t count = format == "wav" && EVERY_CALL ? INT64_MAX : FAULT_SAMPLE;
};

TEST_P(Faults, JobReportsOnceOrIsRefused) {
    const std::string song = mode == kOpenedOnly ? "/many." : "/long.";
    for (const group &kind : kGroups) {
        if (mode == kOpenedOnly && (kind.harmless || kind.calls == fault::kMutex)) continue;
        if (mode == TAVO_MODE_HIGHLIGHT && kind.calls == kClickTrack) continue;
        try_calls(SHORT_SONGS + song + format, mode, kind, count);
    }
}

// ThreadSanitizer checks two formats. The others are slow and use the same threads.
const auto kFormats =
    EVERY_CALL ? std::vector{"wav", "mp3", "m4a", "flac", "aac", "ogg"} : std::vector{"wav", "mp3"};
INSTANTIATE_TEST_SUITE_P(Jobs, Faults,
                         testing::Combine(testing::ValuesIn(kFormats),
                                          testing::Values(kOpenedOnly, 0, 1, 2)));

// The song is opened through a descriptor, which its sources duplicate.
TEST(DuplicateFaults, AreReported) {
    const int input = dup(STDIN_FILENO);
    const int file = open(SHORT_SONGS "/brief.flac", O_RDONLY);
    ASSERT_EQ(dup2(file, STDIN_FILENO), STDIN_FILENO);
    close(file);
    try_calls("fd", TAVO_MODE_BEATS, {"dup", fault::kDup, false}, INT64_MAX);
    dup2(input, STDIN_FILENO);
    close(input);
}

}  // namespace
