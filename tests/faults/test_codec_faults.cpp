// Every value that the codec library returns is made wrong at every call, once and from there on,
// and a job runs in every mode: it is refused or reports once, nothing leaks or hangs.
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstring>
#include <map>

#include "tests/media_source/source_case.h"
#include "tests/support/job_harness.h"
#include "tests/support/song.h"

// Claims of more memory than there is are refused, not fatal.
extern "C" const char *__asan_default_options() {
    return "allocator_may_return_null=1:max_allocation_size_mb=512";
}
extern "C" const char *__tsan_default_options() {
    return "allocator_may_return_null=1:max_allocation_size_mb=512";
}

namespace {

constexpr unsigned kLongest = 30;  // seconds of one job
constexpr long kMostMib = 256;
constexpr int64_t kFrame = 8192;  // samples
// The quick tier tries this many calls of a value, and one in so many of the answers there.
constexpr int kCalls = 2, kStep = 31;

// The replacements of each value: general ones, and those close to a limit of its own.
std::vector<int64_t> answers_for(const std::string &value) {
    static std::map<std::string, std::vector<int64_t>> all = {
        {"bytes", {16'384, 16'385, 131'071, 1'048'576, 1'048'577}},
        {"reached", {9'999'999, 159'999'999, 160'000'000, -10'000'000}},
        {"rate", {7999, 8001, 11'025, 48'001, 192'001}},
        {"bits", {15, 24}},
        {"codec", {300, 305, 306, 323, kWexaTagAac, kWexaTagMpegLayer3}},
        {"count", {17, 65}},
        {"duration",
         {9'999'999, 10'000'000, 10'000'001, 50'000'000, 50'000'001, INT64_MAX / 16'000}}};
    std::vector<int64_t> answers = all[value];
    answers.insert(answers.end(), {-1, 0, 1, 2, 3, 255, 65'536, 1 << 20, INT32_MAX, INT32_MIN,
                                   1LL << 40, INT64_MAX, INT64_MIN});
    return answers;
}

using place = std::pair<std::string, std::string>;  // function and value

// The fault of the current run. The hook runs under the fake library's lock; between runs no
// other thread is alive.
struct fault {
    place where = {};
    int64_t call = -1;
    int64_t answer = 0;
    bool ever = false;
    bool struck = false;
    std::map<place, int64_t> calls = {};
} now;

int64_t hand_back(const std::string &function, const std::string &value, int64_t truth) {
    const place here = {function, value};
    const int64_t call = now.calls[here]++;
    const bool wrong = here == now.where && (now.ever ? call >= now.call : call == now.call);
    if (!wrong) return truth;
    now.struck = now.struck || now.answer != truth;
    return now.answer;
}

// PCM cut into frames, each starting at its time. A little longer than there is: the end is
// reached.
scripted::script script_of(const support::song &song) {
    scripted::script made;
    made.sample_rate = song.plan.rate;
    made.channels = song.plan.channels;
    const auto samples = static_cast<int64_t>(song.pcm.size());
    const int64_t second = made.sample_rate * made.channels;
    made.duration = samples * kUnitsPerSecond / second + kUnitsPerSecond / 2;
    for (int64_t at = 0; at < samples; at += kFrame) {
        const int64_t end = std::min(samples, at + kFrame);
        made.frames.push_back(
            {{song.pcm.begin() + at, song.pcm.begin() + end}, at * kUnitsPerSecond / second});
    }
    return made;
}

char current[256];  // the run that hangs

class CodecFaults : public testing::TestWithParam<std::string> {
 protected:
    // Runs one job with the fault. Returns true if all promises hold.
    bool run(int32_t mode) {
        scripted::all = {};
        scripted::all.use(script);
        scripted::all.tamper = hand_back;
        int32_t err = 99;
        TAVO_CTX *ctx = job::create(file.path, mode, &err);
        bool good = err == TAVO_ERR_HANDLE && job::last.calls == 0;
        if (ctx != nullptr) {
            good = err == TAVO_OK && tavo_analyze(ctx, 0, 0, 0) == TAVO_OK;
            job::wait();
            good = tavo_deinit(ctx) == TAVO_OK && !job::flaw_of(job::last, mode) && good;
        }
        return good && scripted::all.alive.empty() && scripted::tags_are_empty() &&
               scripted::all.faults.empty();
    }

    void strike(const place &where, int64_t call, int32_t mode) {
        static const char *all = getenv("TAVO_FAULTS");
        for (const int64_t answer : answers_for(where.second)) {
            for (const bool ever : {false, true}) {
                if (all == nullptr && turn++ % kStep != 0) continue;
                now = {where, call, answer, ever};
                snprintf(current, sizeof current, "%s %s %s=%lld at call %lld%s in mode %d\n",
                         GetParam().c_str(), where.first.c_str(), where.second.c_str(),
                         static_cast<long long>(answer), static_cast<long long>(call),
                         ever ? " and on" : "", mode);
                alarm(kLongest);
                EXPECT_TRUE(run(mode)) << current;
                struck += now.struck ? 1 : 0;
            }
        }
    }

    const support::temporary_file file{"codec_faults"};
    scripted::script script;
    int turn = 0, struck = 0;
};

TEST_P(CodecFaults, AreSurvived) {
    const int32_t channels = GetParam() == "ogg" ? 1 : 2;  // what the decoder is asked for
    script = script_of(support::make_song({8000, channels, 15.5, 120.0, 1, 6.0, 15.0}));
    const source_row &row = row_of(GetParam());
    if (row.tag != 0) script.codec = row.tag;
    std::ofstream(file.path) << row.file;
    signal(SIGALRM, [](int) {
        (void)!write(STDERR_FILENO, current, strlen(current));
        _exit(3);
    });
    for (const int32_t mode : {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH}) {
        now = fault{};
        ASSERT_TRUE(run(mode) && job::last.status == 0) << mode;
        EXPECT_EQ(job::last.hl_pos > 1000, mode != TAVO_MODE_BEATS);  // so that mode 2 seeks
        const std::map<place, int64_t> calls = now.calls;
        for (const auto &[where, times] : calls) {
            const int64_t step = std::max<int64_t>(1, times / kCalls);
            for (int64_t call = 0; call < times; call += step) strike(where, call, mode);
        }
    }
    alarm(0);
    EXPECT_GT(struck, 50);
    rusage used = {};
    getrusage(RUSAGE_SELF, &used);
    // Sanitizers touch what is only reserved.
    EXPECT_TRUE(CODEC_FAULTS_SANITIZED || used.ru_maxrss / 1024 < kMostMib) << used.ru_maxrss;
}

INSTANTIATE_TEST_SUITE_P(Formats, CodecFaults,
                         testing::Values("wav", "aac", "flac", "mpeg", "mp4 with aac",
                                         "mp4 with mpeg", "ogg"));

}  // namespace
