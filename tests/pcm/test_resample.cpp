#include <cmath>
#include <memory>
#include <numeric>
#include <tuple>

#include "pcm/resample.h"
#include "tests/pcm/song_plan.h"
#include "tests/support/fault_layer.h"

namespace {

using state_ptr = std::unique_ptr<dorn_resampler_state>;

state_ptr prepare(int32_t source, int32_t target = kAnalysisRate, int32_t code = 0) {
    auto state = std::make_unique<dorn_resampler_state>();
    EXPECT_EQ(dorn_resampler_prepare(state.get(), source, target, 1), code);
    return state;
}

// Returns the outputs `first` to `n` - 1 of a conversion by block averages. The input consists of
// `base` zeros and `in`.
signal_run average(int32_t source, int32_t target, int64_t first, int64_t n, const sample_run &in,
                   int64_t base = 0) {
    const int64_t count = base + int64_t(in.size());
    // Pages of zeros from calloc take no memory, so a large `base` is cheap.
    auto *input = static_cast<int16_t *>(calloc(size_t(count) + 1, sizeof(int16_t)));
    std::copy(in.begin(), in.end(), input + base);
    signal_run out(size_t(n) + 1, -1.0);
    resamplePcmMonoMT(input, count, source, out.data(), n, target);
    EXPECT_TRUE(ext_mutex_resample == nullptr && out.back() == -1.0);  // the lock was released
    free(input);
    return slice(out, first, n);
}

TEST(ResampleBlock, AveragesBlocks) {
    // An average is rounded to single precision.
    EXPECT_EQ(average(33075, 11025, 0, 2, {1, 0, 0, 32767, 32767, 32766}),
              (signal_run{0.3333333432674407958984375, 32766.666015625}));
    const sample_run in = {10, 20, 30, 40, 50};
    // A block that extends past the end is cut. A block past the end uses the last sample.
    EXPECT_EQ(average(2, 1, 0, 4, in), (signal_run{15, 35, 50, 50}));
    // An empty block, here every other one, uses the sample at its start.
    EXPECT_EQ(average(1, 2, 0, 5, in), (signal_run{10, 10, 20, 20, 30}));
    EXPECT_EQ(average(1, 1, 0, 1, {}), signal_run{-1});
    // Above 2^24, block positions are even numbers, because they have single precision.
    constexpr int64_t kEven = 16'777'216;
    const sample_run ramp = {2, 1, 2, 3, 4, 5, 6, 7};
    EXPECT_EQ(average(1, 1, kEven, kEven + 4, ramp, kEven), (signal_run{2, 1.5, 2.5, 4}));
    EXPECT_EQ(average(3, 1, kEven / 3, kEven / 3 + 3, ramp, kEven - 1),
              (signal_run{1.66666662693023681640625, 3.5, 6}));
}

// The expected values were computed separately. The last bit of the sine may differ.
TEST(ResampleSinc, TableHoldsTheWindowedSinc) {
    for (const auto &[rate, phase, tap, want] : {std::tuple{48000, 0, 9, 0.20671874284744263},
                                                 {48000, 240, 0, -5.7826164265861735e-6},
                                                 {8000, 480, 4, -0.012936153449118137},
                                                 {8000, 700, 19, -9.440486792300362e-6},
                                                 {88200, 123, 14, 0.03232921287417412},
                                                 {88200, 480, 10, 0.1125}}) {
        EXPECT_NEAR(prepare(rate)->coef[phase][tap], want, std::fabs(want) * 1.3e-7);
    }
    EXPECT_EQ(prepare(48000)->ratio, 48000.0f / 11025.0f);
    EXPECT_EQ(prepare(7, 1)->ratio, 7.0f);
    // A ratio within 0.0001 of a whole number has 20 taps, any other 19.
    for (const auto &[rate, taps] : {std::pair{88201, 20}, {88202, 19}, {-48000, 19}})
        EXPECT_EQ(prepare(rate)->taps, taps) << rate;
    for (const auto &[source, target] : {std::pair{2, 0}, {48000, -1}, {0, kAnalysisRate}})
        EXPECT_EQ(prepare(source, target, -1)->taps, 0) << source;
}

// Returns a filter whose middle phase has the coefficients a, b and c.
state_ptr three_taps(float a, float b, float c, float ratio = 1.0f) {
    auto state = std::make_unique<dorn_resampler_state>();
    state->taps = 2;
    state->ratio = ratio;
    state->channels = 1;
    std::copy_n(std::vector<float>{a, b, c}.data(), 3, state->coef[480]);
    return state;
}

// Returns the samples that a conversion writes, followed by its code.
sample_run filter(const state_ptr &state, const sample_run &in) {
    sample_run out(in.size(), 77);
    const int32_t code =
        dorn_resampler_convert(state.get(), in.data(), int32_t(in.size()), &out[0]);
    out.push_back(static_cast<int16_t>(code));
    return out;
}

// No real filter produces these sums. fuzz/stages.cpp tests real filters.
TEST(ResampleSinc, RoundsAndWrapsSums) {
    const auto filter_constant = [](int16_t sample, float a, float b, float c) {
        return slice(filter(three_taps(a, b, c), sample_run(20, sample)), 1, 18);
    };
    // Halves are rounded up.
    EXPECT_EQ(filter_constant(3, 0, 0.5f, 0), sample_run(17, 2));
    EXPECT_EQ(filter_constant(-3, 0, 0.5f, 0), sample_run(17, -1));
    // Products are added in the order of the taps and in single precision.
    EXPECT_EQ(filter_constant(1, 16'777'216.0f, 1, -16'777'214.0f), sample_run(17, 2));
    // Sums that exceed 16 bits wrap, even if they also exceed 32 bits.
    EXPECT_EQ(filter_constant(5000, 0, 1000.0f, 0), sample_run(17, 19'264));
    EXPECT_EQ(filter_constant(5000, 0, 1e6f, 0), sample_run(17, -3584));
}

TEST(ResampleSinc, RefusesBadArgumentsAndPhases) {
    const sample_run in(100, 1);
    sample_run out(100);
    const auto state = prepare(48000);
    EXPECT_EQ(dorn_resampler_convert(nullptr, in.data(), 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), nullptr, 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), 100, nullptr), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), -1, out.data()), 0);
    EXPECT_EQ(filter(prepare(-48000), in).back(), -1);
    // A phase of 1/2 is valid. At a ratio of 1.125, the sixth output has an invalid phase of 5/8.
    auto drifting = three_taps(0, 1, 0, 1.5f);
    drifting->coef[960][1] = 5.0f;
    EXPECT_EQ(filter(drifting, in)[1], 5);
    EXPECT_EQ(filter(drifting, in).back(), 66);
    drifting->ratio = 1.125f;
    EXPECT_EQ(slice(filter(drifting, in), 2, 6), (sample_run{0, 0, 5, 77}));
    EXPECT_EQ(filter(drifting, in).back(), -1);
    // Single precision rounds the last position past the end, which ends the conversion early.
    constexpr int32_t kLong = (1 << 27) + 12;
    auto *silence = static_cast<int16_t *>(calloc(kLong, sizeof(int16_t)));
    drifting->taps = 20;
    drifting->ratio = 33'554'432.0f;  // the fifth output would be at 2^27
    EXPECT_EQ(dorn_resampler_convert(drifting.get(), silence, kLong, out.data()), 4);
    free(silence);
}

TEST(ResampleRun, RefusesSizesWithoutALength) {
    const int16_t sample = 1;
    for (const auto &[bytes, source] :
         {std::pair<int64_t, int32_t>{INT64_MAX, 1}, {INT64_MAX / 8192, 1}, {2, 0}, {2, -48000}}) {
        int64_t n = 5;
        double *out = reinterpret_cast<double *>(&n);
        EXPECT_EQ(dorn_resampler_run(&sample, bytes, source, 11025, &n, &out), -2);
        EXPECT_TRUE(n == 0 && out == nullptr);
    }
}

// Converts PCM as a job does, which frees it. Returns the output as read_output does.
signal_run convert_in_place(int16_t *pcm, size_t bytes, int32_t rate) {
    int64_t n = -1;
    double *out = nullptr;
    EXPECT_EQ(convert_and_free(pcm, int64_t(bytes), rate, kAnalysisRate, &n, &out), 0);
    return read_output(out, n);
}

// The output of a job's conversion reuses the memory of the PCM.
TEST(ResampleRun, InPlaceConversionIsBitIdentical) {
    const std::string bytes = noise(40'003, 5);
    for (const int32_t rate : {8000, 11025, 33075, 44100, 48000, 96000}) {
        for (const size_t size : {40'003u, 40'002u, 36'003u, 2u, 0u}) {
            SCOPED_TRACE(testing::Message() << size << " bytes at " << rate);
            auto *pcm = static_cast<int16_t *>(malloc(size));
            memcpy(pcm, bytes.data(), size);
            EXPECT_EQ(convert_in_place(pcm, size, rate), convert_pcm(bytes.data(), size, rate));
        }
    }
    // Rounded positions above 2^24 move a block relative to its output.
    constexpr size_t kTail = 20'000, kSize = ((1 << 24) + kTail) * 8;  // outputs, bytes
    const std::string tail = noise(kTail * 8 + 160, 6);
    auto *pcm = static_cast<int16_t *>(calloc(kSize, 1));
    memcpy(pcm + (kSize - tail.size()) / 2, tail.data(), tail.size());
    const signal_run want = convert_pcm(pcm, kSize, 44100);
    EXPECT_TRUE(convert_in_place(pcm, kSize, 44100) == want);
}

}  // namespace
