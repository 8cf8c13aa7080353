// Every value that the codec library hands back is made wrong at every call, once and from there on
// for ever, and the whole job runs in every mode: it is refused or reports once, nothing is left,
// nothing hangs.
#include <climits>
#include <cmath>
#include <map>
#include <set>

#include "tests/faults/measure.h"
#include "tests/faults/trial.h"
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
constexpr double kMostMib = 256.0;
constexpr int kCalls = 2;  // of a value, tried by the quick tier
constexpr int kStep = 17;  // of what there is to try at those, the quick tier takes one in so many

// What each value is replaced by.
const std::vector<int64_t> &answers_for(const std::string &value) {
    static const std::map<std::string, std::vector<int64_t>> all = {
        {"result", {-1, 1, 2, 0, INT32_MAX, INT32_MIN}},
        {"bytes",
         {-1, 0, 1, 3, 16'384, 16'385, 131'071, 1'048'576, 1'048'577, INT32_MAX, INT32_MIN}},
        {"first", {-1, 0, 1, INT64_MAX, INT64_MIN}},
        {"reached",
         {-1, 0, 1, 9'999'999, 159'999'999, 160'000'000, INT32_MAX, 1LL << 40, INT64_MAX,
          -10'000'000, INT64_MIN}},
        {"produced", {-1, 0, INT32_MIN}},
        {"rate", {-1, 0, 1, 7999, 8001, 11'025, 48'001, 192'001, INT32_MAX, INT32_MIN}},
        {"channels", {-1, 0, 1, 3, 255, 65'536, INT32_MAX, INT32_MIN}},
        {"bits", {-1, 0, 8, 15, 24, INT32_MAX, INT32_MIN}},
        {"codec", {-1, 0, 300, 305, 306, 323, kWexaTagAac, kWexaTagMpegLayer3, INT32_MAX}},
        {"count", {-1, 0, 2, 17, 65, INT32_MAX, INT32_MIN}},
        {"kind", {-1, 0, 2, INT32_MAX, INT32_MIN}},
        {"length", {-1, 0, 1, 2, 4, 1 << 20, INT32_MAX, INT32_MIN}},
        {"duration",
         {-1, 0, 1, 9'999'999, 10'000'000, 10'000'001, 50'000'000, 50'000'001, INT32_MAX, 1LL << 40,
          INT64_MAX / 16'000, INT64_MAX, INT64_MIN}},
    };
    static const std::vector<int64_t> none;
    const auto found = all.find(value);
    EXPECT_NE(found, all.end()) << value;
    return found == all.end() ? none : found->second;
}

using place = std::pair<std::string, std::string>;  // function and value

// The fault of the run going on. The hook runs under the scripted library's lock; between runs no
// other thread is alive.
struct fault {
    place where;
    int64_t call = -1;
    int64_t answer = 0;
    bool ever = false;
    bool struck = false;
    std::map<place, int64_t> calls;
} now;

int64_t hand_back(const std::string &function, const std::string &value, int64_t truth) {
    const place here = {function, value};
    const int64_t call = now.calls[here]++;
    const bool wrong = here == now.where && (now.ever ? call >= now.call : call == now.call);
    if (!wrong) return truth;
    now.struck = now.struck || now.answer != truth;
    return now.answer;
}

struct tally {
    std::set<std::pair<std::string, int64_t>> answers;
    int trials = 0, refused = 0, failed = 0, complete = 0, wrong = 0;
    double slowest_ms = 0.0;
};

bool is_beat_list(const job::result &result) {
    for (size_t i = 0; i < result.beats.size(); ++i) {
        if (!std::isfinite(result.beats[i])) return false;
        if (i > 0 && result.beats[i] < result.beats[i - 1]) return false;
    }
    return result.beat_count > 0 && !result.null_beats;
}

// What a report must be like, whatever the codec library said.
bool is_report(const job::result &result, int32_t mode) {
    if (result.status == 0 && mode != TAVO_MODE_HIGHLIGHT) return is_beat_list(result);
    if (result.beat_count != 0 || !result.null_beats) return false;
    return result.status == (mode == TAVO_MODE_HIGHLIGHT ? 0 : -1);
}

class CodecFaults : public testing::TestWithParam<std::string> {
 protected:
    // One job on the script with the fault. False when anything is not as promised.
    bool run(int32_t mode, tally *count) {
        scripted::reset();
        scripted::use(script);
        scripted::tamper(hand_back);
        now.calls.clear();
        now.struck = false;
        int32_t err = 99;
        const auto start = std::chrono::steady_clock::now();
        TAVO_CTX *ctx = job::create(path, mode, &err);
        bool good = (err == TAVO_OK) == (ctx != nullptr);
        if (ctx == nullptr) {
            good = good && err == TAVO_ERR_HANDLE && job::last.calls == 0;
            ++count->refused;
        } else {
            good = good && tavo_analyze(ctx, 0, 0, 0) == TAVO_OK;
            const job::result result = job::wait();
            good = good && is_report(result, mode) && tavo_deinit(ctx) == TAVO_OK;
            good = good && job::last.calls == 1;
            ++(result.status == 0 ? count->complete : count->failed);
            highlight = result.hl_pos;
        }
        count->slowest_ms = std::max(count->slowest_ms, trial::ms_since(start));
        return good && scripted::live_objects() == 0 && scripted::tag_buffers_left() == 0 &&
               scripted::faults().empty();
    }

    void strike(const place &where, int64_t call, int32_t mode, tally *count) {
        for (const int64_t answer : answers_for(where.second)) {
            for (const bool ever : {false, true}) {
                if (!trial::full() && turn++ % kStep != 0) continue;
                now.where = where;
                now.call = call;
                now.answer = answer;
                now.ever = ever;
                const std::string trace = GetParam() + " " + where.first + " " + where.second +
                                          "=" + std::to_string(answer) + " at " +
                                          std::to_string(call) + (ever ? " for ever" : " once") +
                                          " in mode " + std::to_string(mode);
                trial::watch(kLongest, trace);
                tally one;
                const bool good = run(mode, &one);
                EXPECT_TRUE(good) << trace;
                if (!now.struck) continue;  // the truth, or a call that did not come
                count->answers.insert({where.second, answer});
                ++count->trials;
                count->refused += one.refused;
                count->failed += one.failed;
                count->complete += one.complete;
                count->wrong += good ? 0 : 1;
                count->slowest_ms = std::max(count->slowest_ms, one.slowest_ms);
            }
        }
    }

    std::string path = testing::TempDir() + "tavo_codec_faults_" + std::to_string(getpid());
    scripted::script script;
    int32_t highlight = 0;
    int turn = 0;
};

TEST_P(CodecFaults, AreSurvived) {
    support::song_spec plan;
    plan.rate = 8000;
    plan.channels = GetParam() == "ogg" ? 1 : 2;  // what the decoder is asked for
    plan.seconds = 15.5;
    plan.loud_at = 6.0;
    plan.tail_at = 15.0;
    script = scripted::song(support::make_song(plan).pcm, plan.channels, plan.rate, 4096);
    script.tags = true;
    script.duration += 5'000'000;  // a little more than there is: the end is reached
    byte_run head = wav_file();
    if (GetParam() != "wav") {
        const source_row &row = source_row_of(GetParam());
        head = row.file;
        if (row.tag != 0) script.codec = row.tag;
    }
    ASSERT_TRUE(support::write_bytes(path, head));

    trial::peak::start();
    std::map<std::string, tally> counts;
    for (const int32_t mode : {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH}) {
        now = fault{};
        tally whole;
        ASSERT_TRUE(run(mode, &whole));
        ASSERT_EQ(whole.complete, 1) << mode;
        EXPECT_EQ(highlight > 1000, mode != TAVO_MODE_BEATS);  // so that mode 2 seeks
        const std::map<place, int64_t> calls = now.calls;
        for (const auto &[where, times] : calls) {
            for (const int64_t call : trial::places(times, kCalls)) {
                strike(where, call, mode, &counts[where.first]);
            }
        }
    }
    alarm(0);
    scripted::reset();  // the last job's tag records
    unlink(path.c_str());
    const double mib = trial::peak::mib();
    if (!CODEC_FAULTS_SANITIZED) {  // sanitizers touch what is only reserved
        EXPECT_LT(mib, kMostMib);
    }
    std::string format = GetParam();
    std::replace(format.begin(), format.end(), ' ', '_');
    for (const auto &[function, count] : counts) {
        EXPECT_GT(count.trials, 0) << function;
        trial::figure("codec_faults", {{"format", format},
                                       {"function", function},
                                       {"answers", std::to_string(count.answers.size())},
                                       {"trials", std::to_string(count.trials)},
                                       {"refused", std::to_string(count.refused)},
                                       {"failed", std::to_string(count.failed)},
                                       {"complete", std::to_string(count.complete)},
                                       {"wrong", std::to_string(count.wrong)},
                                       {"slowest_ms", std::to_string(lround(count.slowest_ms))},
                                       {"peak_mib", std::to_string(lround(mib))}});
    }
}

INSTANTIATE_TEST_SUITE_P(Formats, CodecFaults,
                         testing::Values("wav", "aac", "flac", "mpeg", "mp4 with aac",
                                         "mp4 with mpeg", "ogg"),
                         [](const testing::TestParamInfo<std::string> &each) {
                             std::string name = each.param;
                             std::replace(name.begin(), name.end(), ' ', '_');
                             return name;
                         });

}  // namespace
