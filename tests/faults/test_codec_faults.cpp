// Runs jobs with a codec library that returns a wrong value in one call, or in one call and all
// later ones. Either the file is refused or the job reports once. Nothing leaks or hangs.
#include <sys/resource.h>

#include <algorithm>
#include <map>

#include "tests/media_source/source_case.h"
#include "tests/support/job_harness.h"
#include "tests/support/song.h"

// Under a sanitizer an allocation that is too large must fail instead of ending the program.
extern "C" const char *__asan_default_options() {
    return "allocator_may_return_null=1:max_allocation_size_mb=512";
}

namespace {

constexpr unsigned kMaxSeconds = 30;  // of one job
constexpr long kMaxMib = 256;
constexpr int64_t kFrame = 8192;  // samples
// About kCalls calls per value get faults. Every kStep-th fault runs (all if TAVO_FAULTS is set).
constexpr int kCalls = 2, kStep = 31;

// Returns wrong values: some near the limits of the named value, and some used for every value.
std::vector<int64_t> replacements_for(const std::string &value) {
    static std::map<std::string, std::vector<int64_t>> near_limits = {
        {"bytes", {16'384, 16'385, 131'071, 1'048'576, 1'048'577}},
        {"reached", {9'999'999, 159'999'999, 160'000'000, -10'000'000}},
        {"rate", {7999, 8001, 11'025, 48'001, 192'001}},
        {"bits", {15, 24}},
        {"codec", {300, 305, 306, 323, kWexaTagAac, kWexaTagMpegLayer3}},
        {"count", {17, 65}},
        {"duration",
         {9'999'999, 10'000'000, 10'000'001, 50'000'000, 50'000'001, INT64_MAX / 16'000}}};
    std::vector<int64_t> replacements = near_limits[value];
    replacements.insert(replacements.end(), {-1, 0, 1, 2, 3, 255, 65'536, 1 << 20, INT32_MAX,
                                             INT32_MIN, 1LL << 40, INT64_MAX, INT64_MIN});
    return replacements;
}

using value_id = std::pair<std::string, std::string>;  // function and value

// The fault of the current run. The fake library's lock guards it.
struct fault {
    value_id id = {};
    int64_t call = -1;  // index of the wrong call
    int64_t replacement = 0;
    bool persistent = false;  // all later calls are wrong too
    bool applied = false;
    std::map<value_id, int64_t> calls = {};
} current_fault;

int64_t apply_fault(const std::string &function, const std::string &value, int64_t original) {
    fault &now = current_fault;
    const value_id id = {function, value};
    const int64_t call = now.calls[id]++;
    const bool wrong = id == now.id && (now.persistent ? call >= now.call : call == now.call);
    if (!wrong) return original;
    now.applied = now.applied || now.replacement != original;
    return now.replacement;
}

// Returns a stream of the song. Its stated duration is too long, so that jobs read to the end.
fake_codec::stream_spec stream_of(const support::song &song) {
    fake_codec::stream_spec stream;
    stream.sample_rate = song.plan.rate;
    stream.channels = song.plan.channels;
    const auto samples = static_cast<int64_t>(song.pcm.size());
    const int64_t second = stream.sample_rate * stream.channels;
    stream.duration = samples * kUnitsPerSecond / second + kUnitsPerSecond / 2;
    for (int64_t at = 0; at < samples; at += kFrame) {
        const int64_t end = std::min(samples, at + kFrame);
        stream.frames.push_back(
            {{song.pcm.begin() + at, song.pcm.begin() + end}, at * kUnitsPerSecond / second});
    }
    return stream;
}

class CodecFaults : public testing::TestWithParam<std::string> {
 protected:
    // Runs one job with the fault. Returns true if all promises hold.
    bool run(int32_t mode) {
        fake_codec::state = {};
        fake_codec::state.streams.push_back(stream);
        fake_codec::state.replace = apply_fault;
        int32_t err = 99;
        TAVO_CTX *ctx = job::create(file.path, mode, &err);
        bool good = err == TAVO_ERR_HANDLE && job::last.calls == 0;
        if (ctx != nullptr) {
            good = err == TAVO_OK && tavo_analyze(ctx, 0, 0, 0) == TAVO_OK;
            job::wait();
            good = tavo_deinit(ctx) == TAVO_OK && !job::find_inconsistency(job::last, mode) && good;
        }
        return good && fake_codec::state.objects.empty() && fake_codec::tags_are_empty() &&
               fake_codec::state.misuses.empty();
    }

    void try_replacements(const value_id &id, int64_t call, int32_t mode) {
        static const char *all = getenv("TAVO_FAULTS");
        for (const int64_t replacement : replacements_for(id.second)) {
            for (const bool persistent : {false, true}) {
                if (all == nullptr && tried++ % kStep != 0) continue;
                current_fault = {id, call, replacement, persistent};
                snprintf(job::current_run, sizeof job::current_run,
                         "%s %s %s=%lld at call %lld%s in mode %d\n", GetParam().c_str(),
                         id.first.c_str(), id.second.c_str(), static_cast<long long>(replacement),
                         static_cast<long long>(call), persistent ? " and later" : "", mode);
                alarm(kMaxSeconds);
                EXPECT_TRUE(run(mode)) << job::current_run;
                applied += current_fault.applied ? 1 : 0;
            }
        }
    }

    const support::temporary_file file{"codec_faults"};
    fake_codec::stream_spec stream;
    int tried = 0, applied = 0;
};

TEST_P(CodecFaults, JobIsRefusedOrReportsOnce) {
    const int32_t channels = GetParam() == "ogg" ? 1 : 2;  // Vorbis is decoded to mono
    stream = stream_of(support::make_song({8000, channels, 15.5, 120.0, 1, 6.0, 15.0}));
    const source_row &row = row_of(GetParam());
    if (row.tag != 0) stream.codec = row.tag;
    std::ofstream(file.path) << row.file;
    job::report_interruptions();
    for (const int32_t mode : {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH}) {
        current_fault = fault{};
        ASSERT_TRUE(run(mode) && job::last.status == 0) << mode;
        EXPECT_EQ(job::last.hl_pos > 1000, mode != TAVO_MODE_BEATS);  // late enough for a seek
        const std::map<value_id, int64_t> calls = current_fault.calls;
        for (const auto &[id, count] : calls) {
            const int64_t step = std::max<int64_t>(1, count / kCalls);
            for (int64_t call = 0; call < count; call += step) try_replacements(id, call, mode);
        }
    }
    alarm(0);
    EXPECT_GT(applied, 50);
    rusage used = {};
    getrusage(RUSAGE_SELF, &used);
    // Sanitizers need more memory.
    EXPECT_TRUE(CODEC_FAULTS_SANITIZED || used.ru_maxrss / 1024 < kMaxMib) << used.ru_maxrss;
}

INSTANTIATE_TEST_SUITE_P(Formats, CodecFaults,
                         testing::Values("wav", "aac", "flac", "mpeg", "mp4 with aac",
                                         "mp4 with mpeg", "ogg"));

}  // namespace
