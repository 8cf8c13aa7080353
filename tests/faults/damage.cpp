// Damaged files: every format's reader and the whole analysis go through them, in bounded time and
// memory. Short files are cut at each length, and each byte and bit of their heads is changed; the
// codec tests' files suffer accidents.
//
// A file lies in memory and is opened as /proc/self/fd/N. Processes share the runs; a process that
// dies says in the common record which run it died in.
#include <sys/mman.h>
#include <sys/wait.h>

#include <algorithm>
#include <cmath>
#include <thread>

#include "tests/desktop/codec_test.h"
#include "tests/faults/encode.h"
#include "tests/faults/measure.h"
#include "tests/faults/trial.h"
#include "tests/support/job_harness.h"

namespace {

using codec_test::bytes;

constexpr unsigned kLongest = 5;  // seconds of one run
constexpr double kMostMib = 512.0;
constexpr int64_t kHead = 4096;     // bytes, each of which is changed and cut at
constexpr int64_t kLater = 1000;    // cuts behind them
constexpr int64_t kQuickRuns = 12;  // of each kind
constexpr int64_t kSeekStep = 8;    // one run in so many seeks
constexpr int kMaxWorkers = 8;

struct format {
    const char *name;
    const char *sample;  // the short file
    int32_t rate;        // Hz, of it
    std::vector<const char *> fixtures;
    const char *table = nullptr;  // whose count of entries, once damaged, asked for a gigabyte
};

void PrintTo(const format &each, std::ostream *out) {
    *out << each.name;
}

enum kind { kCut, kZero, kOnes, kBit, kAccidents, kKinds };
constexpr const char *kKindNames[kKinds] = {"cut", "zero", "ones", "bit", "accidents"};

int64_t runs_of(int kind) {
    if (kind == kCut) return kHead + 1 + kLater;
    if (kind == kAccidents) return trial::full() ? 500 : 20;
    return kind == kBit ? kHead * 8 : kHead;
}

// What a worker found, in memory shared with its parent.
struct tally {
    int32_t kind = 0;  // the run going on
    int64_t run = 0;
    int64_t runs[kKinds] = {}, opened[kKinds] = {}, results[kKinds] = {};
    double slowest_ms[kKinds] = {};
    double peak_mib[kKinds] = {};
    bool failed = false;
};

// A file in memory with a path.
struct memory_file {
    int fd = memfd_create("damaged", 0);
    std::string path = "/proc/self/fd/" + std::to_string(fd);

    memory_file() = default;
    memory_file(const memory_file &) = delete;
    memory_file &operator=(const memory_file &) = delete;
    ~memory_file() { close(fd); }
    void hold(const bytes &contents) const {
        EXPECT_EQ(ftruncate(fd, 0), 0);
        EXPECT_EQ(pwrite(fd, contents.data(), contents.size(), 0),
                  static_cast<ssize_t>(contents.size()));
    }
};

bytes damaged(const bytes &sample, const std::vector<bytes> &fixtures, int kind, int64_t run) {
    if (kind == kAccidents) {
        std::mt19937 random(static_cast<uint32_t>(2024 + run));
        return codec_test::damaged(fixtures[static_cast<size_t>(run) % fixtures.size()], random);
    }
    bytes file = sample;
    if (kind == kCut) {
        const auto size = static_cast<int64_t>(sample.size());
        const int64_t later = kHead + (run - kHead) * (size - kHead) / (kLater + 1);
        file.resize(static_cast<size_t>(run <= kHead ? run : later));
        return file;
    }
    uint8_t &byte = file[static_cast<size_t>(kind == kBit ? run / 8 : run)];
    if (kind == kZero) byte = 0;
    if (kind == kOnes) byte = 0xFF;
    if (kind == kBit) byte = static_cast<uint8_t>(byte ^ 1 << run % 8);
    return file;
}

// The run that sets a high bit of the number of entries of a table of that name.
int64_t count_bit(const bytes &sample, const std::string &table) {
    const auto at = std::search(sample.begin(), sample.end(), table.begin(), table.end());
    EXPECT_LT(at - sample.begin(), kHead);
    return (at - sample.begin() + 8) * 8 + 3;
}

// Reads a file to its end. False when it does not open; where it does, it has what it says.
bool reads_to_its_end(const std::string &path) {
    const codec_test::opened file(path);
    if (file.source == nullptr) {
        EXPECT_LT(file.error, 0);
        return false;
    }
    const auto samples = static_cast<int64_t>(codec_test::read(file.source, SIZE_MAX).size());
    EXPECT_EQ(file.format.duration * file.format.sample_rate / 10'000'000, samples);
    return true;
}

// Reads a file, now and then behind seeks as well, and analyses it. The mode goes round.
void go_through(const std::string &path, int kind, int64_t run, tally *count) {
    std::mt19937 random(static_cast<uint32_t>(run));
    trial::peak::start();
    const auto start = std::chrono::steady_clock::now();
    const bool seeks = kind == kAccidents || run % kSeekStep == 0;
    const bool opens =
        seeks ? codec_test::reads_consistently(path, random) : reads_to_its_end(path);
    count->opened[kind] += opens ? 1 : 0;
    int32_t err = 0;
    const auto mode = static_cast<int32_t>((run + run / 8) % 3);
    TAVO_CTX *ctx = job::create(path, mode, &err);
    if (ctx == nullptr) {
        EXPECT_EQ(err, TAVO_ERR_HANDLE);
    } else {
        EXPECT_EQ(tavo_analyze(ctx, 5, 0, 0), TAVO_OK);
        count->results[kind] += job::wait().status == 0 ? 1 : 0;
        EXPECT_EQ(tavo_deinit(ctx), TAVO_OK);
        EXPECT_EQ(job::last.calls, 1);
    }
    const double ms = trial::ms_since(start);
    const double mib = trial::peak::mib();
    EXPECT_LT(ms, kLongest * 1000.0);
    EXPECT_LT(mib, kMostMib);
    ++count->runs[kind];
    count->slowest_ms[kind] = std::max(count->slowest_ms[kind], ms);
    count->peak_mib[kind] = std::max(count->peak_mib[kind], mib);
}

class Damage : public testing::TestWithParam<format> {
 protected:
    // The share of one of so many workers.
    void work(int worker, int workers, tally *count) {
        const memory_file file;
        for (int kind = 0; kind < kKinds; ++kind) {
            const int64_t quick = kind == kAccidents ? runs_of(kind) : kQuickRuns;
            std::vector<int64_t> places = trial::places(runs_of(kind), quick);
            if (kind == kBit && GetParam().table != nullptr && !trial::full()) {
                places.push_back(count_bit(sample, GetParam().table));
            }
            for (size_t i = static_cast<size_t>(worker); i < places.size();
                 i += static_cast<size_t>(workers)) {
                count->kind = kind;
                count->run = places[i];
                const std::string name = std::string(GetParam().name) + " " + kKindNames[kind] +
                                         " " + std::to_string(places[i]);
                SCOPED_TRACE(name);
                trial::watch(2 * kLongest, name);
                file.hold(damaged(sample, fixtures, kind, places[i]));
                go_through(file.path, kind, places[i], count);
            }
        }
        alarm(0);
        count->failed = HasFailure();
    }

    bytes sample;
    std::vector<bytes> fixtures;
};

TEST_P(Damage, IsSurvived) {
    support::song_spec plan;
    plan.rate = GetParam().rate;
    plan.seconds = 1.3;
    plan.loud_at = 0.6;
    plan.tail_at = 1.2;
    const std::string path =
        testing::TempDir() + "tavo_damage_" + std::to_string(getpid()) + "_" + GetParam().sample;
    ASSERT_NO_FATAL_FAILURE(trial::encode(support::make_song(plan), path));
    sample = codec_test::load(path);
    unlink(path.c_str());
    ASSERT_GT(static_cast<int64_t>(sample.size()), kHead + kLater);
    for (const char *name : GetParam().fixtures) {
        fixtures.push_back(codec_test::load(codec_test::fixture(name)));
    }

    const int workers =
        std::clamp(static_cast<int>(std::thread::hardware_concurrency()), 1, kMaxWorkers);
    const size_t size = sizeof(tally) * kMaxWorkers;
    auto *found = static_cast<tally *>(
        mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
    ASSERT_NE(found, MAP_FAILED);
    pid_t children[kMaxWorkers];
    fflush(stdout);
    for (int k = 0; k < workers; ++k) {
        children[k] = fork();
        ASSERT_GE(children[k], 0);
        if (children[k] == 0) {
            work(k, workers, &found[k]);
            fflush(stdout);
            _exit(0);
        }
    }
    tally sum;
    for (int k = 0; k < workers; ++k) {
        int status = -1;
        ASSERT_EQ(waitpid(children[k], &status, 0), children[k]);
        EXPECT_EQ(status, 0) << "died in " << kKindNames[found[k].kind] << " " << found[k].run;
        EXPECT_FALSE(found[k].failed);
        for (int kind = 0; kind < kKinds; ++kind) {
            sum.runs[kind] += found[k].runs[kind];
            sum.opened[kind] += found[k].opened[kind];
            sum.results[kind] += found[k].results[kind];
            sum.slowest_ms[kind] = std::max(sum.slowest_ms[kind], found[k].slowest_ms[kind]);
            sum.peak_mib[kind] = std::max(sum.peak_mib[kind], found[k].peak_mib[kind]);
        }
    }
    munmap(found, size);
    for (int kind = 0; kind < kKinds; ++kind) {
        // An Ogg file's head is all set-up data behind check sums: hardly any change is survived.
        EXPECT_GT(sum.opened[kind], kind == kAccidents ? sum.runs[kind] / 5 : 0)
            << kKindNames[kind];
        trial::figure("damage", {{"format", GetParam().name},
                                 {"kind", kKindNames[kind]},
                                 {"runs", std::to_string(sum.runs[kind])},
                                 {"opened", std::to_string(sum.opened[kind])},
                                 {"results", std::to_string(sum.results[kind])},
                                 {"slowest_ms", std::to_string(lround(sum.slowest_ms[kind]))},
                                 {"peak_mib", std::to_string(lround(sum.peak_mib[kind]))}});
    }
}

INSTANTIATE_TEST_SUITE_P(
    Formats, Damage,
    testing::Values(
        format{"wav", "short.wav", 22'050, {"song.wav", "mono.wav", "six.wav"}},
        format{"flac",
               "short.flac",
               22'050,
               {"song.flac", "short_blocks.flac", "huge_blocks.flac", "six.flac"}},
        format{"mp3", "short.mp3", 44'100, {"vbr.mp3", "tagged.mp3", "low.mp3", "checked.mp3"}},
        format{"mp2", "short.mp2", 22'050, {"layer2.mp2"}},
        format{"aac",
               "short.aac",
               22'050,
               {"low.aac", "noisy.aac", "mono.aac", "six.aac", "core.aac"}},
        format{"m4a",
               "short.m4a",
               22'050,
               {"first.m4a", "last.m4a", "fragmented.mp4", "video.mp4", "layer3.mp4"},
               "stco"},
        format{"ogg", "short.ogg", 22'050, {"song.ogg", "other.ogg", "six.ogg", "video.ogv"}}),
    [](const testing::TestParamInfo<format> &each) { return std::string(each.param.name); });

}  // namespace
