#include <cmath>
#include <memory>
#include <numeric>

#include "pcm/resample.h"
#include "pcm/song.h"
#include "tests/pcm/song_plan.h"

namespace {

// Counts down to the failing request; 0: none fails. Set on the thread under test.
thread_local int failing_allocation = 0;

bool allocation_fails() {
    return failing_allocation > 0 && --failing_allocation == 0;
}

}  // namespace

extern "C" {
void *__real_malloc(size_t size);
void *__real_calloc(size_t count, size_t size);
void *__real_realloc(void *block, size_t size);

void *__wrap_malloc(size_t size) {
    return allocation_fails() ? nullptr : __real_malloc(size);
}
void *__wrap_calloc(size_t count, size_t size) {
    return allocation_fails() ? nullptr : __real_calloc(count, size);
}
void *__wrap_realloc(void *block, size_t size) {
    return allocation_fails() ? nullptr : __real_realloc(block, size);
}
}

namespace {

using signal = std::vector<double>;
using state_ptr = std::unique_ptr<dorn_resampler_state>;

signal taken(double *out, int64_t n) {
    for (int64_t i = n; i < n + 8; ++i) EXPECT_EQ(out[i], 0.0);  // 64 cleared bytes follow
    const signal result(out, out + n);
    free(out);
    return result;
}

// The analysis signal of samples at a rate.
signal converted(const sample_run &samples, int32_t rate) {
    int64_t n = -1;
    double *out = nullptr;
    const auto bytes = static_cast<int64_t>(samples.size() * 2);
    EXPECT_EQ(dorn_resampler_run(samples.data(), bytes, rate, kAnalysisRate, &n, &out), 0);
    EXPECT_TRUE(ext_mutex_resample == nullptr && ext_cond_resample == nullptr);
    return taken(out, n);
}

// Outputs first to end of one block-average thread. The input is silent before sample base.
signal averaged(float ratio, int64_t first, int64_t end, const sample_run &in, int64_t base = 0) {
    const int64_t count = base + static_cast<int64_t>(in.size());
    // Only the pages in use are ever touched.
    auto *all = static_cast<int16_t *>(calloc(static_cast<size_t>(count) + 1, sizeof(int16_t)));
    auto *out = static_cast<double *>(calloc(static_cast<size_t>(end) + 8, sizeof(double)));
    std::copy(in.begin(), in.end(), all + base);
    pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
    pthread_cond_t cond = PTHREAD_COND_INITIALIZER;
    int32_t done = 0;
    RESAMPLE_PART part = {0, all, out, ratio, first, end, count, end, {}, &done, 1, &mutex, &cond};
    EXPECT_EQ(pthread_create(&part.thread, nullptr, _resampleMT, &part), 0);
    pthread_join(part.thread, nullptr);
    EXPECT_EQ(done, 1);
    free(all);
    signal result = taken(out, end);
    result.erase(result.begin(), result.begin() + first);
    return result;
}

TEST(resample_block, whole_blocks_are_summed_in_single_precision) {
    const sample_run in = samples_of(noise(4000, 1));
    for (const int32_t ratio : {1, 2, 3, 4}) {
        const auto n = static_cast<int64_t>(in.size()) / ratio;
        for (const int64_t first : {0, 1, 2, 3}) {
            for (const int64_t end : {first, first + 1, first + 5, first + 64, first + 67, n}) {
                signal want;
                for (int64_t i = first; i < end; ++i) {
                    float sum = 0.0f;
                    for (int64_t k = i * ratio; k < (i + 1) * ratio; ++k) sum += in[size_t(k)];
                    want.push_back(double{sum / static_cast<float>(ratio)});
                }
                EXPECT_EQ(averaged(static_cast<float>(ratio), first, end, in), want) << ratio;
            }
        }
    }
}

TEST(resample_block, by_hand) {
    // 32766.666015625: the spacing is 1/512 here.
    EXPECT_EQ(converted({1, 0, 0, 32767, 32767, 32766}, 33075),
              (signal{0.3333333432674407958984375, 32766.666015625}));
    const sample_run in = {10, 20, 30, 40, 50};
    // [4, 6) is cut to the last sample; [6, 8) lies beyond the end and takes it too.
    EXPECT_EQ(averaged(2.0f, 0, 4, in), (signal{15, 35, 50, 50}));
    // Blocks [0, 0) [0, 1) [1, 1) [1, 2) [2, 2): an empty one is the sample that it names.
    EXPECT_EQ(averaged(0.5f, 0, 5, in), (signal{10, 10, 20, 20, 30}));
    EXPECT_EQ(averaged(1.0f, 0, 1, {}), signal{0});
    // Beyond 2^24, floats are even and ties go to the multiple of 4.
    constexpr int64_t kEven = 16'777'216;
    const sample_run ramp = {0, 1, 2, 3, 4, 5, 6, 7};
    // Places + 0, 0, 2, 4, 4: [0, 0) empty, [0, 2), [2, 4), [4, 4) empty.
    EXPECT_EQ(averaged(1.0f, kEven, kEven + 4, ramp, kEven), (signal{0, 0.5, 2.5, 4}));
    // Places 2^24 - 1, + 2, + 4 (of + 5), + 8: one of 3 samples, one of 2, one of 4.
    EXPECT_EQ(averaged(3.0f, kEven / 3, kEven / 3 + 3, ramp, kEven - 1), (signal{1, 3.5, 6}));
}

TEST(resample_block, direct_call_makes_its_own_lock) {
    const sample_run in = {1, 3, 5, 7, 9, 11, 13, 15, 17, 19, 21};
    signal out(6, -1.0);
    resamplePcmMonoMT(in.data(), 11, 22050, out.data(), 5, 11025);  // 1, 1, 1 and 2 outputs
    EXPECT_EQ(out, (signal{2, 6, 10, 14, 18, -1}));
    EXPECT_EQ(ext_mutex_resample, nullptr);
}

state_ptr prepared(int32_t source, int32_t channels = 1) {
    auto state = std::make_unique<dorn_resampler_state>();
    EXPECT_EQ(dorn_resampler_prepare(state.get(), source, 11025, channels), 0);
    return state;
}

TEST(resample_sinc, filter_table) {
    // Worked out from the windowed sinc's formula apart from this code in the precisions that it
    // has here; the sine may differ in its last bit.
    const struct {
        int32_t rate, phase, tap;
        double coefficient;
    } entries[] = {
        {48000, 480, 9, 0.20083972811698914},    {48000, 0, 9, 0.20671874284744263},
        {48000, 240, 0, -5.7826164265861735e-6}, {8000, 480, 4, -0.012936153449118137},
        {8000, 700, 19, -9.440486792300362e-6},  {88200, 123, 14, 0.03232921287417412},
    };
    for (const auto &each : entries) {
        EXPECT_NEAR(prepared(each.rate)->coef[each.phase][each.tap], each.coefficient,
                    std::fabs(each.coefficient) * 1.3e-7);
    }
    // The centre tap of the middle phase is the cut-off over pi: 0.9 / 8.
    const auto wc = static_cast<float>(double{0.1125f} * 3.141592653589793);
    EXPECT_EQ(prepared(88200)->coef[480][10], static_cast<float>(double{wc} / 3.141592653589793));
    EXPECT_EQ(prepared(48000)->ratio, 48000.0f / 11025.0f);
    const struct {
        int32_t source, target, code, taps;
    } rates[] = {
        // 88,201 / 11,025 is 0.00009 off a whole ratio, 88,202 is 0.00018.
        {48000, 11025, 0, 19},  {88199, 11025, 0, 20}, {88201, 11025, 0, 20}, {88202, 11025, 0, 19},
        {-48000, 11025, 0, 19}, {2, 0, -1, 0},         {48000, -1, -1, 0},    {0, 11025, -1, 0},
    };
    for (const auto &each : rates) {
        const auto state = std::make_unique<dorn_resampler_state>();
        EXPECT_EQ(dorn_resampler_prepare(state.get(), each.source, each.target, 1), each.code);
        EXPECT_EQ(state->taps, each.taps) << each.source << " to " << each.target;
    }
}

// A filter by hand: 2 taps, coefficients a, b, c in the middle phase, ratio 1.
state_ptr three_taps(float a, float b, float c) {
    auto state = std::make_unique<dorn_resampler_state>();
    state->taps = 2;
    state->ratio = 1.0f;
    state->channels = 1;
    std::copy_n(std::vector<float>{a, b, c}.data(), 3, state->coef[480]);
    return state;
}

TEST(resample_sinc, arithmetic_by_hand) {
    const int16_t surrounded[] = {777, 20'000, -20'000, 30'000, 3, -3, 777};
    // Stops at i0 + 1 = 5, so the last place gets nothing.
    const auto filtered = [&](float a, float b, float c) {
        sample_run out(5, 77);
        EXPECT_EQ(dorn_resampler_convert(three_taps(a, b, c).get(), surrounded + 1, 5, out.data()),
                  4);
        return out;
    };
    // Zeros before the start.
    EXPECT_EQ(filtered(1, 0, 0), (sample_run{0, 20'000, -20'000, 30'000, 77}));
    // 40,000 wraps to -25,536, -40,000 to 25,536, 60,000 to -5,536.
    EXPECT_EQ(filtered(0, 2, 0), (sample_run{-25'536, 25'536, -5'536, 6, 77}));
    // Halves go up: 1.5 to 2, and of the two outer ones (3 - 20,000) / 2 = -9998.5 to -9998.
    EXPECT_EQ(filtered(0, 0.5f, 0)[3], 2);
    EXPECT_EQ(filtered(0.5f, 0, 0.5f)[2], -9998);
    // The sum runs in tap order in single precision: 2^24 + 1 stays 2^24.
    const sample_run ones(20, 1);
    sample_run out(20);
    const auto order = three_taps(16'777'216.0f, 1.0f, -16'777'216.0f);
    EXPECT_EQ(dorn_resampler_convert(order.get(), ones.data(), 20, out.data()), 19);
    EXPECT_EQ(sample_run(out.begin() + 1, out.begin() + 18), sample_run(17, 0));
    // 5,000,000 is 76 * 65,536 + 19,264, and a thousand times as much 76,294 * 65,536 - 3584.
    const sample_run loud(20, 5000);
    dorn_resampler_convert(three_taps(0, 1000.0f, 0).get(), loud.data(), 20, out.data());
    EXPECT_EQ(sample_run(out.begin(), out.begin() + 19), sample_run(19, 19'264));
    dorn_resampler_convert(three_taps(0, 1e6f, 0).get(), loud.data(), 20, out.data());
    EXPECT_EQ(sample_run(out.begin(), out.begin() + 19), sample_run(19, -3584));
}

TEST(resample_sinc, bad_arguments_and_phases) {
    const sample_run in(100, 1);
    sample_run out(1000);
    const auto state = prepared(48000);
    EXPECT_EQ(dorn_resampler_convert(nullptr, in.data(), 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), nullptr, 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), 100, nullptr), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), -1, out.data()), 0);
    EXPECT_EQ(dorn_resampler_convert(prepared(-48000).get(), in.data(), 100, out.data()), -1);
    // An even span and a ratio that is not whole: the offset is 0 or 1/2, still the last phase;
    // with a ratio of 1.125 it is 5/8 at j = 5.
    auto drifting = three_taps(0, 1, 0);
    drifting->coef[960][1] = 5.0f;
    drifting->ratio = 1.5f;
    EXPECT_EQ(dorn_resampler_convert(drifting.get(), in.data(), 100, out.data()), 66);
    EXPECT_EQ(out[1], 5);
    drifting->ratio = 1.125f;
    std::fill(out.begin(), out.end(), 77);
    EXPECT_EQ(dorn_resampler_convert(drifting.get(), in.data(), 100, out.data()), -1);
    EXPECT_EQ(sample_run(out.begin() + 2, out.begin() + 6), (sample_run{0, 0, 5, 77}));
    // The end is tested in single precision: 2^27 + 10 counts as 2^27 + 16, beyond the input.
    constexpr int32_t kLong = (1 << 27) + 12;
    auto *silence = static_cast<int16_t *>(calloc(kLong, sizeof(int16_t)));
    drifting->taps = 20;
    drifting->ratio = 33'554'432.0f;  // a quarter of 2^27
    EXPECT_EQ(dorn_resampler_convert(drifting.get(), silence, kLong, out.data()), 4);
    free(silence);
}

TEST(resample_sinc, four_side_by_side_have_the_bits_of_one) {
    std::vector<int32_t> lengths(120);
    std::iota(lengths.begin(), lengths.end(), 9);
    lengths.push_back(20'000);
    for (const int32_t rate : {8000, 48000, 88200, 88201, 192'000}) {
        const auto mono = prepared(rate);
        const auto stereo = prepared(rate, 2);
        for (const int32_t len : lengths) {
            SCOPED_TRACE(testing::Message() << rate << ' ' << len);
            const sample_run in = samples_of(noise(2 * len, uint32_t(len) + 7));
            // Two channels are filtered frame by frame.
            sample_run twice;
            for (const int16_t sample : in) twice.insert(twice.end(), {sample, sample});
            sample_run want(in.size() * 4, 77);
            const int32_t code =
                dorn_resampler_convert(stereo.get(), twice.data(), 2 * len, want.data());
            // Loud surroundings, which must not be heard.
            sample_run loud(in.size() + 200, 32'767);
            std::copy(in.begin(), in.end(), loud.begin() + 100);
            sample_run out(in.size() * 2, 77);
            EXPECT_EQ(dorn_resampler_convert(mono.get(), &loud[100], len, out.data()),
                      code < 0 ? code : code / 2);
            for (size_t i = 0; i < out.size(); ++i) ASSERT_EQ(out[i], want[2 * i]) << i;
        }
    }
}

TEST(resample_run, lengths_and_tails) {
    // 20,000 samples of a constant: n by hand; the samples that the filter cannot reach stay 0.
    const struct {
        int32_t rate;
        size_t n;
        int32_t reach;  // input samples beyond the position that must exist; 0: block average
    } cases[] = {{8000, 27'562, 9}, {11025, 20'000, 0}, {22050, 10'000, 0}, {33075, 6666, 0},
                 {44100, 5000, 0},  {48000, 4593, 9},   {88200, 2500, 10},  {192000, 1148, 9}};
    for (const auto &each : cases) {
        SCOPED_TRACE(each.rate);
        const signal got = converted(sample_run(20'000, 10'000), each.rate);
        ASSERT_EQ(got.size(), each.n);
        for (size_t i = 0; i < each.n; ++i) {
            const double position = double(i) * each.rate / 11025;
            const bool reached = each.reach == 0 || std::floor(position) + each.reach < 20'000;
            ASSERT_EQ(got[i] != 0.0, reached) << i;
        }
    }
    EXPECT_TRUE(converted({}, 44100).empty());
    EXPECT_TRUE(converted({1, 2, 3}, 44100).empty());
    const int16_t sample = 1;
    for (const auto &[bytes, source] :
         {std::pair<int64_t, int32_t>{INT64_MAX, 1}, {INT64_MAX / 8192, 1}, {2, 0}, {2, -48000}}) {
        int64_t n = 5;
        double *out = reinterpret_cast<double *>(&n);
        EXPECT_EQ(dorn_resampler_run(&sample, bytes, source, 11025, &n, &out), -2);
        EXPECT_TRUE(n == 0 && out == nullptr);
    }
}

// A job's conversion gives up the PCM, may use its memory, and has the bits of the other.
TEST(resample_run, song_becomes_the_same_signal) {
    const byte_run bytes = noise(40'003, 5);
    for (const int32_t rate : {8000, 11025, 33075, 44100, 48000, 96000}) {
        for (const int64_t off : {0, 1, 4000, 40'001, 40'003}) {
            SCOPED_TRACE(testing::Message() << rate << " from " << off);
            TAVO_CTX ctx = {};
            ctx.pcm_bytes = static_cast<int64_t>(bytes.size());
            ctx.pcm = static_cast<int16_t *>(malloc(bytes.size()));
            memcpy(ctx.pcm, bytes.data(), bytes.size());
            ctx.fmt.sample_rate = rate;
            ctx.ana_rate = kAnalysisRate;
            EXPECT_EQ(convert_song(&ctx, off), 0);
            EXPECT_EQ(ctx.pcm, nullptr);
            EXPECT_EQ(taken(ctx.ana, ctx.ana_len),
                      converted(samples_of(slice(bytes, off, ctx.pcm_bytes)), rate));
        }
    }
}

// Where single precision rounds the places, a block may be elsewhere than its output.
TEST(resample_run, song_too_long_for_its_own_memory) {
    constexpr int64_t kOutputs = (1 << 24) + 8;
    TAVO_CTX ctx = {};
    ctx.pcm_bytes = kOutputs * 8;
    ctx.pcm = static_cast<int16_t *>(calloc(kOutputs, 8));
    for (int16_t i = 0; i < 80; ++i) ctx.pcm[kOutputs * 4 - 80 + i] = i;
    ctx.fmt.sample_rate = 44100;
    ctx.ana_rate = kAnalysisRate;
    int64_t n = 0;
    double *out = nullptr;
    EXPECT_EQ(dorn_resampler_run(ctx.pcm, ctx.pcm_bytes, 44100, kAnalysisRate, &n, &out), 0);
    const signal want(out + n - 20, out + n);
    free(out);
    EXPECT_EQ(convert_song(&ctx, 0), 0);
    EXPECT_EQ(signal(ctx.ana + n - 20, ctx.ana + n), want);
    free(ctx.ana);
}

using resample_faults = song_plan;

TEST_F(resample_faults, each_allocation_fails_in_turn) {
    const struct {
        int32_t rate;
        bool job;
        std::string outcomes;  // of the first, second .. failing: e error, s silence, . none
    } cases[] = {
        {48000, false, "eee..."},  // output, state, 16-bit samples
        {44100, false, "eeess."},  // output, lock, condition; without parts or flags silence
        {48000, true, "ee...."},   // state, 16-bit samples; memory not taken back is no error
        {8000, true, ".ee..."},    // memory that cannot grow: the output has its own
        {44100, true, ".eess."},  {22050, true, "eeess."},
    };
    for (const auto &each : cases) {
        for (size_t nth = 1; nth <= 6; ++nth) {
            SCOPED_TRACE(testing::Message() << each.rate << each.job << ", allocation " << nth);
            ctx.pcm_bytes = 8000;
            ctx.pcm = static_cast<int16_t *>(malloc(8000));
            std::fill_n(ctx.pcm, 4000, 1000);
            ctx.fmt.sample_rate = each.rate;
            ctx.ana_rate = kAnalysisRate;
            failing_allocation = static_cast<int>(nth);
            const int32_t code = each.job
                                     ? convert_song(&ctx, 0)
                                     : dorn_resampler_run(ctx.pcm, 8000, each.rate, kAnalysisRate,
                                                          &ctx.ana_len, &ctx.ana);
            failing_allocation = 0;
            const char outcome = each.outcomes[nth - 1];
            EXPECT_EQ(code, outcome == 'e' ? -2 : 0);
            EXPECT_EQ(ctx.ana == nullptr, code != 0);
            EXPECT_EQ(ctx.ana_len, code != 0 ? 0 : 4000LL * kAnalysisRate / each.rate);
            EXPECT_EQ(code == 0 && ctx.ana[100] == 0.0, outcome == 's');
            EXPECT_EQ(ctx.pcm == nullptr, each.job);
            EXPECT_EQ(ext_mutex_resample, nullptr);
            release();
        }
    }
}

}  // namespace
