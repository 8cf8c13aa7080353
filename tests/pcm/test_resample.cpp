#include <cmath>
#include <memory>
#include <numeric>
#include <tuple>

#include "pcm/resample.h"
#include "pcm/song.h"
#include "tests/pcm/song_plan.h"
#include "tests/support/fault_layer.h"
#include "tests/support/reference.h"

namespace {

using state_ptr = std::unique_ptr<dorn_resampler_state>;

state_ptr prepared(int32_t source, int32_t target = kAnalysisRate, int32_t code = 0) {
    auto state = std::make_unique<dorn_resampler_state>();
    EXPECT_EQ(dorn_resampler_prepare(state.get(), source, target, 1), code);
    return state;
}

TEST(resample, fast_forms_have_the_bits_of_the_plain_ones) {
    std::vector<size_t> lengths(130);
    std::iota(lengths.begin(), lengths.end(), 0);
    lengths.insert(lengths.end(), {2047, 60'000});
    for (const int32_t rate : {8000, 11025, 22050, 33075, 44100, 48000, 88200, 88201, 192'000}) {
        const auto state = prepared(rate);
        const size_t whole = rate % kAnalysisRate == 0 && rate <= 44100 ? size_t(rate) / 11025 : 0;
        for (const size_t length : lengths) {
            const sample_run in = samples_of(noise(int64_t(length) * 2, uint32_t(length)));
            sample_run samples;
            if (whole == 0) reference::convert(*state, in, &samples);
            signal_run want(samples.begin(), samples.end());
            for (size_t i = 0; whole != 0 && i < length / whole; ++i) {
                float sum = 0.0f;
                for (size_t k = i * whole; k < (i + 1) * whole; ++k) sum += in[k];
                want.push_back(double{sum / static_cast<float>(whole)});
            }
            want.resize(length * 11025 / size_t(rate));  // what the filter cannot reach is 0
            sample_run loud(length + 200, 32'767);       // surroundings, which must not be heard
            std::copy(in.begin(), in.end(), loud.begin() + 100);
            ASSERT_EQ(converted(&loud[100], length, rate), want) << rate << ' ' << length;
        }
    }
}

// Outputs first to n - 1 of a block average. The input is silent before sample base.
signal_run averaged(int32_t source, int32_t target, int64_t first, int64_t n, const sample_run &in,
                    int64_t base = 0) {
    const int64_t count = base + int64_t(in.size());
    // Only the pages in use are ever touched.
    auto *all = static_cast<int16_t *>(calloc(size_t(count) + 1, sizeof(int16_t)));
    std::copy(in.begin(), in.end(), all + base);
    signal_run out(size_t(n) + 1, -1.0);
    resamplePcmMonoMT(all, count, source, out.data(), n, target);
    EXPECT_TRUE(ext_mutex_resample == nullptr && out.back() == -1.0);  // the lock is the call's own
    free(all);
    return slice(out, first, n);
}

TEST(resample_block, by_hand) {
    // 32766.666015625: the spacing is 1/512 here.
    EXPECT_EQ(averaged(33075, 11025, 0, 2, {1, 0, 0, 32767, 32767, 32766}),
              (signal_run{0.3333333432674407958984375, 32766.666015625}));
    const sample_run in = {10, 20, 30, 40, 50};
    // [4, 6) is cut to the last sample; [6, 8) lies beyond the end and takes it too.
    EXPECT_EQ(averaged(2, 1, 0, 4, in), (signal_run{15, 35, 50, 50}));
    // Blocks [0, 0) [0, 1) [1, 1) [1, 2) [2, 2): an empty one is the sample that it names.
    EXPECT_EQ(averaged(1, 2, 0, 5, in), (signal_run{10, 10, 20, 20, 30}));
    EXPECT_EQ(averaged(1, 1, 0, 1, {}), signal_run{-1});
    // Beyond 2^24, floats are even and ties go to the multiple of 4.
    constexpr int64_t kEven = 16'777'216;
    const sample_run ramp = {2, 1, 2, 3, 4, 5, 6, 7};
    // Places + 0, 0, 2, 4, 4: [0, 0) empty, [0, 2), [2, 4), [4, 4) empty.
    EXPECT_EQ(averaged(1, 1, kEven, kEven + 4, ramp, kEven), (signal_run{2, 1.5, 2.5, 4}));
    // Places 2^24 - 1, + 2, + 4 (of + 5), + 8: one of 3 samples, one of 2, one of 4.
    EXPECT_EQ(averaged(3, 1, kEven / 3, kEven / 3 + 3, ramp, kEven - 1),
              (signal_run{1.66666662693023681640625, 3.5, 6}));
}

TEST(resample_sinc, filter_table) {
    // Worked out from the windowed sinc's formula apart from this code in the precisions that it
    // has here; the sine may differ in its last bit.
    for (const auto &[rate, phase, tap, want] :
         {std::tuple{48000, 480, 9, 0.20083972811698914},
          {48000, 0, 9, 0.20671874284744263},
          {48000, 240, 0, -5.7826164265861735e-6},
          {8000, 480, 4, -0.012936153449118137},
          {8000, 700, 19, -9.440486792300362e-6},
          {88200, 123, 14, 0.03232921287417412},
          {88200, 480, 10, 0.1125}}) {  // in the centre, the cut-off over pi: 0.9 / 8
        EXPECT_NEAR(prepared(rate)->coef[phase][tap], want, std::fabs(want) * 1.3e-7);
    }
    EXPECT_EQ(prepared(48000)->ratio, 48000.0f / 11025.0f);
    // 88,201 / 11,025 is 0.00009 off a whole ratio, 88,202 is 0.00018.
    for (const auto &[rate, taps] : {std::pair{88199, 20}, {88201, 20}, {88202, 19}, {-48000, 19}})
        EXPECT_EQ(prepared(rate)->taps, taps) << rate;
    for (const auto &[source, target] : {std::pair{2, 0}, {48000, -1}, {0, kAnalysisRate}})
        EXPECT_EQ(prepared(source, target, -1)->taps, 0) << source;
}

// A filter by hand: 2 taps, coefficients a, b, c in the middle phase.
state_ptr three_taps(float a, float b, float c, float ratio = 1.0f, int32_t channels = 1) {
    auto state = std::make_unique<dorn_resampler_state>();
    state->taps = 2;
    state->ratio = ratio;
    state->channels = channels;
    std::copy_n(std::vector<float>{a, b, c}.data(), 3, state->coef[480]);
    return state;
}

// What a conversion writes, and its code.
sample_run filtered(const state_ptr &state, const sample_run &in) {
    sample_run out(in.size(), 77);
    const int32_t code =
        dorn_resampler_convert(state.get(), in.data(), int32_t(in.size()), &out[0]);
    out.push_back(static_cast<int16_t>(code));
    return out;
}

TEST(resample_sinc, arithmetic_by_hand) {
    const sample_run in = {20'000, -20'000, 30'000, 3, -3};
    // Stops at i0 + 1 = 5, so the last place gets nothing. Zeros before the start.
    EXPECT_EQ(filtered(three_taps(1, 0, 0), in), (sample_run{0, 20'000, -20'000, 30'000, 77, 4}));
    // 40,000 wraps to -25,536, -40,000 to 25,536, 60,000 to -5,536.
    EXPECT_EQ(filtered(three_taps(0, 2, 0), in), (sample_run{-25'536, 25'536, -5'536, 6, 77, 4}));
    // Halves go up: 1.5 to 2, and of the two outer ones (3 - 20,000) / 2 = -9998.5 to -9998.
    EXPECT_EQ(filtered(three_taps(0, 0.5f, 0), in)[3], 2);
    EXPECT_EQ(filtered(three_taps(0.5f, 0, 0.5f), in)[2], -9998);
    // Two channels: each adds its last sample, up to (11 + 1) * 2 = 24.
    sample_run pairs(24);
    std::iota(pairs.begin(), pairs.end(), int16_t{0});
    const sample_run sums = filtered(three_taps(1, 1, 0, 1.0f, 2), pairs);
    EXPECT_EQ(slice(sums, 0, 6), (sample_run{0, 1, 2, 4, 6, 8}));
    EXPECT_EQ(slice(sums, 20, 25), (sample_run{38, 40, 77, 77, 22}));
    const auto wide = [](int16_t sample, float a, float b, float c) {
        return slice(filtered(three_taps(a, b, c), sample_run(20, sample)), 1, 18);
    };
    // In tap order and in single precision, 2^24 + 1 stays 2^24.
    EXPECT_EQ(wide(1, 16'777'216.0f, 1, -16'777'216.0f), sample_run(17, 0));
    // 5,000,000 is 76 * 65,536 + 19,264, and a thousand times as much 76,294 * 65,536 - 3584.
    EXPECT_EQ(wide(5000, 0, 1000.0f, 0), sample_run(17, 19'264));
    EXPECT_EQ(wide(5000, 0, 1e6f, 0), sample_run(17, -3584));
}

TEST(resample_sinc, bad_arguments_and_phases) {
    const sample_run in(100, 1);
    sample_run out(100);
    const auto state = prepared(48000);
    EXPECT_EQ(dorn_resampler_convert(nullptr, in.data(), 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), nullptr, 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), 100, nullptr), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), -1, out.data()), 0);
    EXPECT_EQ(dorn_resampler_convert(prepared(-48000).get(), in.data(), 100, out.data()), -1);
    // An even span and a ratio that is not whole: the offset is 0 or 1/2, still the last phase;
    // with a ratio of 1.125 it is 5/8 at j = 5.
    auto drifting = three_taps(0, 1, 0, 1.5f);
    drifting->coef[960][1] = 5.0f;
    EXPECT_EQ(filtered(drifting, in)[1], 5);
    EXPECT_EQ(filtered(drifting, in).back(), 66);
    drifting->ratio = 1.125f;
    EXPECT_EQ(slice(filtered(drifting, in), 2, 6), (sample_run{0, 0, 5, 77}));
    EXPECT_EQ(filtered(drifting, in).back(), -1);
    // The end is tested in single precision: 2^27 + 10 counts as 2^27 + 16, beyond the input.
    constexpr int32_t kLong = (1 << 27) + 12;
    auto *silence = static_cast<int16_t *>(calloc(kLong, sizeof(int16_t)));
    drifting->taps = 20;
    drifting->ratio = 33'554'432.0f;  // a quarter of 2^27
    EXPECT_EQ(dorn_resampler_convert(drifting.get(), silence, kLong, out.data()), 4);
    free(silence);
}

TEST(resample_run, sizes_that_give_no_length) {
    const int16_t sample = 1;
    for (const auto &[bytes, source] :
         {std::pair<int64_t, int32_t>{INT64_MAX, 1}, {INT64_MAX / 8192, 1}, {2, 0}, {2, -48000}}) {
        int64_t n = 5;
        double *out = reinterpret_cast<double *>(&n);
        EXPECT_EQ(dorn_resampler_run(&sample, bytes, source, 11025, &n, &out), -2);
        EXPECT_TRUE(n == 0 && out == nullptr);
    }
}

// An instance with so many bytes of PCM, cleared.
TAVO_CTX with_pcm(int64_t bytes, int32_t rate) {
    TAVO_CTX ctx = {};
    ctx.pcm_bytes = bytes;
    ctx.pcm = static_cast<int16_t *>(calloc(static_cast<size_t>(bytes), 1));
    ctx.fmt.sample_rate = rate;
    ctx.ana_rate = kAnalysisRate;
    return ctx;
}

// A job's conversion gives up the PCM, may use its memory, and has the bits of the other.
TEST(resample_run, song_becomes_the_same_signal) {
    const byte_run bytes = noise(40'003, 5);
    for (const int32_t rate : {8000, 11025, 33075, 44100, 48000, 96000}) {
        for (const int64_t off : {0, 1, 4000, 40'001, 40'003}) {
            SCOPED_TRACE(testing::Message() << rate << " from " << off);
            TAVO_CTX ctx = with_pcm(40'003, rate);
            memcpy(ctx.pcm, bytes.data(), bytes.size());
            EXPECT_EQ(convert_song(&ctx, off), 0);
            EXPECT_EQ(ctx.pcm, nullptr);
            const sample_run rest = samples_of(slice(bytes, off, 40'003));
            EXPECT_EQ(taken(ctx.ana, ctx.ana_len), converted(rest.data(), rest.size(), rate));
        }
    }
    // Where single precision rounds the places, a block may be elsewhere than its output.
    constexpr int64_t kTail = 20'000;  // outputs
    constexpr int64_t kOutputs = (1 << 24) + kTail;
    TAVO_CTX ctx = with_pcm(kOutputs * 8, 44100);
    memcpy(ctx.pcm + (kOutputs - kTail) * 4 - 80, noise(kTail * 8 + 160, 6).data(),
           kTail * 8 + 160);
    const signal_run want = converted(ctx.pcm, kOutputs * 4, 44100);
    EXPECT_EQ(convert_song(&ctx, 0), 0);
    EXPECT_TRUE(std::equal(want.end() - kTail - 20, want.end(), ctx.ana + kOutputs - kTail - 20));
    free(ctx.ana);
}

TEST(resample_run, each_allocation_fails_in_turn) {
    // Of the first, second .. failing: e error, s silence, . none.
    for (const auto &[rate, job, outcomes] :
         {std::tuple{48000, false, "eee..."},  // output, state, 16-bit samples
          {44100, false, "eeess."},            // output, lock, condition; parts, flags
          {48000, true, "ee...."},             // memory that is not taken back is no error
          {8000, true, ".ee..."},              // memory that cannot grow: the output has its own
          {44100, true, ".eess."},
          {22050, true, "eeess."}}) {
        std::string found;
        for (int64_t nth = 0; nth < 6; ++nth) {
            TAVO_CTX ctx = with_pcm(8000, rate);
            std::fill_n(ctx.pcm, 4000, 1000);
            fault::arm({fault::kMemory, nth});
            const int32_t code = job ? convert_song(&ctx, 0)
                                     : dorn_resampler_run(ctx.pcm, 8000, rate, kAnalysisRate,
                                                          &ctx.ana_len, &ctx.ana);
            fault::disarm();
            found += code == -2 ? 'e' : ctx.ana[100] == 0.0 ? 's' : '.';
            EXPECT_EQ(ctx.ana == nullptr, code != 0);
            EXPECT_EQ(ctx.ana_len, code != 0 ? 0 : 4000LL * kAnalysisRate / rate);
            EXPECT_TRUE((ctx.pcm == nullptr) == job && ext_mutex_resample == nullptr);
            free(ctx.pcm);
            free(ctx.ana);
        }
        EXPECT_EQ(found, outcomes) << rate << job;
    }
}

}  // namespace
