// Runs jobs with a codec library that states wrong values. Either the file is refused or the job
// reports once. Nothing leaks or hangs.
#include <algorithm>
#include <random>

#include "tests/media_source/source_case.h"
#include "tests/support/job_harness.h"
#include "tests/support/song.h"

// Under a sanitizer an allocation that is too large must fail instead of ending the program.
extern "C" const char *__asan_default_options() {
    return "allocator_may_return_null=1:max_allocation_size_mb=512";
}

namespace {

constexpr int kRuns = 200;            // of each format
constexpr unsigned kMaxSeconds = 30;  // of one job
constexpr size_t kFrame = 8192;       // samples

// Replaces a value of the stream, of one frame or of that and all later frames by one near a limit.
void corrupt(fake_codec::stream_spec &stream, std::mt19937 &random) {
    constexpr int64_t kLimits[] = {
        INT64_MIN, -65'536, -1,        0,           1,         2,         3,        15,     24,
        65,        255,     305,       306,         323,       7999,      16'385,   65'536, 131'071,
        192'001,   1 << 20, 9'999'999, 160'000'000, INT32_MAX, 1LL << 40, INT64_MAX};
    const int64_t value = kLimits[random() % std::size(kLimits)];
    const auto number = static_cast<int32_t>(value);
    const auto at = stream.frames.begin() + static_cast<int>(random() % stream.frames.size());
    fake_codec::frame &frame = *at;
    int32_t *const numbers[] = {&stream.sample_rate, &stream.channels,     &stream.bits,
                                &frame.read_result,  &frame.decode_result, &frame.produced};
    std::optional<int32_t> *const sizes[] = {&stream.codec, &stream.kind_count,
                                             &stream.setup_length, &frame.bytes, &frame.read_bytes};
    const size_t field = random() % 14;
    if (field < 6) *numbers[field] = number;
    if (field >= 6 && field < 11) *sizes[field - 6] = number;
    if (field == 11) stream.duration = value;
    if (field == 12) frame.start = value;
    if (field == 13) stream.seeks.push_back({number % 2, value});
    if (random() % 2 == 0) std::fill(at, stream.frames.end(), fake_codec::frame(frame));
}

class CodecFaults : public testing::TestWithParam<std::string> {};

TEST_P(CodecFaults, JobIsRefusedOrReportsOnce) {
    const int32_t channels = GetParam() == "ogg" ? 1 : 2;  // Vorbis is decoded to mono
    const support::song song = support::make_song({8000, channels, 15.5, 120.0, 1, 6.0, 15.0});
    const source_row &row = row_of(GetParam());
    fake_codec::stream_spec good;
    good.sample_rate = 8000;
    good.channels = channels;
    if (row.tag != 0) good.codec = row.tag;
    good.duration = 160'000'000;
    for (size_t at = 0; at < song.pcm.size(); at += kFrame) {
        const auto *first = song.pcm.data() + at;
        good.frames.push_back({{first, first + std::min(kFrame, song.pcm.size() - at)}});
    }
    const support::temporary_file file{"codec_faults"};
    std::ofstream(file.path) << row.file;
    job::report_interruptions();
    std::mt19937 random;
    int refused = 0, accepted = 0;
    for (int i = 0; i < kRuns; ++i) {
        fake_codec::state = {};
        fake_codec::state.streams = {good};
        for (int faults = i % 4; faults > 0; --faults)
            corrupt(fake_codec::state.streams[0], random);
        snprintf(job::current_run, sizeof job::current_run, "%s %d\n", GetParam().c_str(), i);
        alarm(kMaxSeconds);
        int32_t err = 99;
        TAVO_CTX *ctx = job::create(file.path, i % 3, &err);
        if (ctx == nullptr) {
            ++refused;
            EXPECT_EQ(err, TAVO_ERR_HANDLE) << i;
            EXPECT_EQ(job::last.calls, 0) << i;
        } else {
            EXPECT_EQ(tavo_analyze(ctx, 0, 0, 0), TAVO_OK) << i;
            accepted += job::wait().calls;
            EXPECT_EQ(tavo_deinit(ctx), TAVO_OK) << i;
            EXPECT_EQ(job::find_inconsistency(job::last, i % 3), nullptr) << i;
        }
        EXPECT_TRUE(fake_codec::state.objects.empty() && fake_codec::tags_are_empty()) << i;
        EXPECT_TRUE(fake_codec::state.misuses.empty()) << i << fake_codec::state.misuses[0];
    }
    alarm(0);
    EXPECT_TRUE(refused > 10 && accepted > 50);
}

INSTANTIATE_TEST_SUITE_P(Formats, CodecFaults,
                         testing::Values("wav", "aac", "flac", "mpeg", "mp4 with aac",
                                         "mp4 with mpeg", "ogg"));

}  // namespace
