// Every call of memory, threads, locks and files fails at every place, in every mode, in every
// format: nothing crashes, hangs or leaks, and each job that was started calls back once.
#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <iterator>
#include <string>
#include <vector>

#include "tests/faults/fault_run.h"
#include "tests/faults/trial.h"

namespace {

using fault::call;
using fault::subject;
using fault::tally;

const char *const kFormats[] = {"wav", "m4a", "flac", "mp3", "aac", "ogg"};

// Those that one test goes through; the first ones only where each run is slow.
std::vector<std::string> formats() {
    const size_t count = trial::full() ? std::size(kFormats) : FAULT_FORMATS;
    return {kFormats, kFormats + count};
}

// The jobs that are tried in each format. A song with more frames than an index first has room for
// is only opened.
std::vector<subject> subjects(const std::string &format) {
    const std::string folder = FAULT_SONGS;
    const std::string short_song = folder + "/short." + format;
    const std::string long_song = folder + "/long." + format;
    return {{long_song, TAVO_MODE_HIGHLIGHT},
            {short_song, TAVO_MODE_BEATS},
            {long_song, TAVO_MODE_BOTH},
            {long_song, TAVO_MODE_BOTH, true},
            {folder + "/many." + format, TAVO_MODE_BEATS, false, false}};
}

std::string series(bool second_decoding, bool forever) {
    return std::string(second_decoding ? "second_decoding_" : "") + (forever ? "forever" : "once");
}

int64_t open_descriptors() {
    DIR *folder = opendir("/proc/self/fd");
    int64_t count = 0;
    while (folder != nullptr && readdir(folder) != nullptr) ++count;
    if (folder != nullptr) closedir(folder);
    return count;
}

using row = std::vector<std::pair<std::string, std::string>>;

void print(const char *set, row first, const tally &sum) {
    const row counts = sum.columns();
    first.insert(first.end(), counts.begin(), counts.end());
    trial::figure(set, first);
}

// One kind of call, in all formats and modes: a row for each series.
void in_all_formats(const char *set, const char *name, fault::plan by, bool equal,
                    const std::vector<bool> &endings = {false, true}) {
    for (const bool forever : endings) {
        by.forever = forever;
        tally sum;
        for (const std::string &format : formats()) {
            for (const subject &of : subjects(format)) {
                fault::at_every_place(of, by, equal, (FAULT_SAMPLE + 1) / 2, &sum);
            }
        }
        EXPECT_GT(sum.places, 0);
        print(set, {{"call", name}, {"series", series(false, forever)}}, sum);
    }
}

class Faults : public testing::TestWithParam<const char *> {};

TEST_P(Faults, Allocations) {
    const int64_t descriptors = open_descriptors();
    for (const subject &of : subjects(GetParam())) {
        for (const bool forever : {false, true}) {
            tally sum;
            fault::at_every_place(of, {call::allocation, 0, forever}, false, FAULT_SAMPLE, &sum);
            EXPECT_GT(sum.refused, 0);
            print("allocations",
                  {{"format", GetParam()},
                   {"mode", of.analysed ? std::to_string(of.mode) : "none"},
                   {"series", series(of.second_decoding, forever)}},
                  sum);
        }
    }
    EXPECT_EQ(open_descriptors(), descriptors);
}

INSTANTIATE_TEST_SUITE_P(Trial, Faults, testing::ValuesIn(kFormats),
                         [](const auto &each) { return std::string(each.param); });

TEST(FaultsOfThreads, CannotBeStarted) {
    in_all_formats("threads", "pthread_create", {call::thread}, true);
}

TEST(FaultsOfThreads, CannotBeLocked) {
    in_all_formats("threads", "pthread_mutex_init", {call::mutex}, false);
    in_all_formats("threads", "pthread_cond_init", {call::condition}, false);
}

// A stop whose watcher cannot be started waits for the job by itself.
TEST(FaultsOfThreads, StopWithoutWatcher) {
    tally sum;
    for (const std::string &format : formats()) {
        for (const subject &of : subjects(format)) {
            if (!of.analysed) continue;
            ++sum.runs;
            const fault::holdings before = fault::held();
            int32_t code = 99;
            fault::arm({call::thread, 1});
            fault::hold_decoding(true);
            TAVO_CTX *ctx = job::create(of.path, of.mode, &code);
            ASSERT_NE(ctx, nullptr);
            ASSERT_EQ(tavo_analyze(ctx, 0, 0, 0), 0);
            const int32_t released = tavo_deinit(ctx);
            const int64_t refused = fault::refusals();
            fault::hold_decoding(false);
            fault::disarm();
            ++sum.ended;
            const job::result &found = job::last;
            const bool stopped = found.status == (of.mode == TAVO_MODE_HIGHLIGHT ? 0 : -1);
            sum.places += refused;
            sum.wrong += stopped && released == 0 && refused == 1 ? 0 : 1;
            sum.callbacks_wrong += found.calls == 1 ? 0 : 1;
            sum.leaked += fault::held().blocks == before.blocks ? 0 : 1;
            ++(found.status == 0 ? sum.complete : sum.failed);
        }
    }
    EXPECT_EQ(sum.wrong + sum.callbacks_wrong + sum.leaked, 0);
    print("threads", {{"call", "pthread_create"}, {"series", "watcher"}}, sum);
}

TEST(FaultsOfFiles, EveryCall) {
    const int64_t descriptors = open_descriptors();
    in_all_formats("files", "open", {call::open}, false);
    in_all_formats("files", "read", {call::read}, false);
    in_all_formats("files", "lseek", {call::seek}, false);
    in_all_formats("files", "close", {call::close}, true);
    in_all_formats("files", "click_track", {call::click_track}, true);
    EXPECT_EQ(open_descriptors(), descriptors);
}

// A path that stands for a descriptor, which every source duplicates. Duplicates share one offset:
// of songs that are decoded in one part only one of them is read at a time.
TEST(FaultsOfFiles, Duplicates) {
    const int input = dup(STDIN_FILENO);
    for (const bool forever : {false, true}) {
        tally sum;
        for (const std::string &format : formats()) {
            const int file =
                open((std::string(FAULT_SONGS) + "/brief." + format).c_str(), O_RDONLY);
            ASSERT_EQ(dup2(file, STDIN_FILENO), STDIN_FILENO) << format;
            close(file);
            fault::at_every_place({"fd", TAVO_MODE_BEATS}, {call::dup, 0, forever}, false,
                                  FAULT_SAMPLE, &sum);
        }
        EXPECT_GT(sum.refused, 0);
        print("files", {{"call", "dup"}, {"series", series(false, forever)}}, sum);
    }
    dup2(input, STDIN_FILENO);
    close(input);
}

// A signal interrupts a read: nothing may change.
TEST(FaultsOfFiles, InterruptedReads) {
    fault::plan interrupted = {call::read};
    interrupted.error = EINTR;
    in_all_formats("files", "read_interrupted", interrupted, true, {false});
}

}  // namespace
