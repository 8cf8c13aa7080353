#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <random>

#include "pcm/resample.h"

namespace {

constexpr int32_t kTarget = 11025;
constexpr double kPi = 3.141592653589793;

std::unique_ptr<dorn_resampler_state> prepared(int32_t source, int32_t channels = 1) {
    auto state = std::make_unique<dorn_resampler_state>();
    EXPECT_EQ(dorn_resampler_prepare(state.get(), source, kTarget, channels), 0);
    return state;
}

std::vector<int16_t> random_samples(size_t count, uint32_t seed) {
    std::vector<int16_t> samples(count);
    std::mt19937 random(seed);
    for (auto &sample : samples) sample = static_cast<int16_t>(random() >> 16);
    return samples;
}

// The converter in its plainest form.
struct plain_result {
    int64_t code;
    std::vector<int16_t> out;
};
plain_result plain_convert(const dorn_resampler_state &s, const std::vector<int16_t> &in) {
    const auto len = static_cast<int64_t>(in.size());
    const float h = float(s.taps) / 2;
    const int64_t hi = int64_t(h);
    std::vector<int16_t> out;
    for (int64_t j = 0;; ++j) {
        const float pos = s.ratio * float(j);
        const auto i0 = int64_t(std::floor(pos));
        if (int64_t((h + float(i0)) * float(s.channels)) >= len) return {j * s.channels, out};
        const auto frac = float(double(pos) - (double(i0) + (s.taps % 2 == 1 ? 0.5 : 0.0)));
        if (std::fabs(frac) > 0.500001) return {-1, out};
        const auto p = int64_t(std::floor(960.0 * double(frac) + 480.0 + 0.5));
        for (int64_t c = 0; c < s.channels; ++c) {
            float acc = 0;
            for (int64_t k = 0; k <= s.taps; ++k) {
                const int64_t at = (i0 - hi + k) * s.channels + c;
                const int16_t x = at < 0 || at >= len ? int16_t{0} : in[size_t(at)];
                acc += s.coef[p][k] * float(x);
            }
            const auto value = int64_t(std::floor(double(acc) + 0.5));
            out.push_back(int16_t(uint16_t(uint64_t(value) & 0xFFFF)));
        }
    }
}

TEST(resample_sinc, filter_table) {
    // Phase, tap, coefficient, worked out from the windowed sinc's formula apart from this code in
    // the precisions that it has here; the sine may differ in its last bit.
    struct entry {
        int32_t p, k;
        double value;
    };
    const struct {
        int32_t rate, taps;
        double ratio;
        std::vector<entry> entries;
    } tables[] = {
        {48000,
         19,
         4.353741645812988,
         {{480, 9, 0.20083972811698914},
          {480, 10, 0.20083972811698914},
          {0, 9, 0.20671874284744263},
          {960, 10, 0.20671874284744263},
          {240, 0, -5.7826164265861735e-06},
          {123, 14, -0.00046699371887370944},
          {480, 4, -0.005477213766425848}}},
        {8000,
         19,
         0.725623607635498,
         {{480, 9, 0.6294412612915039},
          {0, 9, 0.9900000095367432},
          {700, 19, -9.440486792300362e-06},
          {123, 14, 0.011031177826225758},
          {480, 4, -0.012936153449118137}}},
        {88200,
         20,
         8.0,
         {{480, 10, 0.11249999701976776},  // the cut-off over pi: 0.9 / 8
          {0, 9, 0.1107882484793663},
          {700, 19, 2.1377885786932893e-05},
          {123, 14, 0.03232921287417412}}},
    };
    for (const auto &table : tables) {
        SCOPED_TRACE(table.rate);
        const auto state = prepared(table.rate);
        EXPECT_EQ(state->taps, table.taps);
        EXPECT_EQ(double(state->ratio), table.ratio);
        EXPECT_EQ(state->channels, 1);
        for (const auto &e : table.entries) {
            EXPECT_NEAR(state->coef[e.p][e.k], e.value, std::fabs(e.value) * 1.3e-7)
                << e.p << ' ' << e.k;
        }
    }
    // The centre tap of the middle phase is wc / pi.
    const auto wc = static_cast<float>(double(0.1125F) * kPi);
    EXPECT_EQ(prepared(88200)->coef[480][10], static_cast<float>(double(wc) / kPi));
}

TEST(resample_sinc, spans) {
    // 20 within 0.0001 of a whole ratio: 88,201 / 11,025 is 0.00009 off, 88,202 is 0.00018.
    EXPECT_EQ(prepared(88201)->taps, 20);
    EXPECT_EQ(prepared(88199)->taps, 20);
    EXPECT_EQ(prepared(88202)->taps, 19);
    dorn_resampler_state state = {};
    EXPECT_EQ(dorn_resampler_prepare(&state, 48000, 0, 1), -1);
    EXPECT_EQ(dorn_resampler_prepare(&state, 48000, -1, 1), -1);
    EXPECT_EQ(dorn_resampler_prepare(&state, 0, 11025, 1), -1);
    EXPECT_EQ(dorn_resampler_prepare(&state, -48000, 11025, 1), -1);
}

TEST(resample_sinc, same_as_the_plain_form) {
    for (const int32_t rate : {8000, 12000, 16000, 24000, 32000, 48000, 88200, 88201, 96000}) {
        for (const int32_t channels : {1, 2}) {
            const auto state = prepared(rate, channels);
            for (const int32_t len : {0, 1, 8, 9, 10, 11, 19, 20, 21, 22, 57, 1001, 20'000}) {
                SCOPED_TRACE(testing::Message() << rate << ' ' << channels << ' ' << len);
                const auto in = random_samples(size_t(len), uint32_t(len) + 7);
                const plain_result want = plain_convert(*state, in);
                // Loud surroundings, which must not be heard.
                std::vector<int16_t> loud(in.size() + 200, 32'767);
                std::copy(in.begin(), in.end(), loud.begin() + 100);
                std::vector<int16_t> out(want.out.size() + 8, 77);
                EXPECT_EQ(dorn_resampler_convert(state.get(), loud.data() + 100, len, out.data()),
                          want.code);
                EXPECT_TRUE(std::equal(want.out.begin(), want.out.end(), out.begin()));
                if (want.code >= 0) {  // nothing further
                    EXPECT_EQ(out[want.out.size()], 77);
                }
            }
        }
    }
}

// A filter by hand: 2 taps, coefficients a, b, c in the middle phase, ratio 1.
std::unique_ptr<dorn_resampler_state> three_taps(float a, float b, float c) {
    auto state = std::make_unique<dorn_resampler_state>();
    state->taps = 2;
    state->ratio = 1.0F;
    state->channels = 1;
    state->coef[480][0] = a;
    state->coef[480][1] = b;
    state->coef[480][2] = c;
    return state;
}

TEST(resample_sinc, arithmetic_by_hand) {
    const int16_t surrounded[] = {777, 20'000, -20'000, 30'000, 3, -3, 777};
    const int16_t *in = surrounded + 1;
    int16_t out[5] = {77, 77, 77, 77, 77};
    // Zeros before the start; stops at i0 + 1 = 5, so the last place gets nothing.
    EXPECT_EQ(dorn_resampler_convert(three_taps(1, 0, 0).get(), in, 5, out), 4);
    EXPECT_EQ(std::vector<int16_t>(out, out + 5),
              (std::vector<int16_t>{0, 20'000, -20'000, 30'000, 77}));
    // Twice: 40,000 wraps to -25,536, -40,000 to 25,536, 60,000 to -5,536.
    EXPECT_EQ(dorn_resampler_convert(three_taps(0, 2, 0).get(), in, 5, out), 4);
    EXPECT_EQ(std::vector<int16_t>(out, out + 5),
              (std::vector<int16_t>{-25'536, 25'536, -5'536, 6, 77}));
    // Halves go up: 1.5 to 2, and of the two outer ones (3 - 20,000) / 2 = -9998.5 to -9998.
    EXPECT_EQ(dorn_resampler_convert(three_taps(0, 0.5F, 0).get(), in, 5, out), 4);
    EXPECT_EQ(out[3], 2);
    EXPECT_EQ(dorn_resampler_convert(three_taps(0.5F, 0, 0.5F).get(), in, 5, out), 4);
    EXPECT_EQ(out[2], -9998);
    // The sum runs in tap order in single precision: 2^24 + 1 stays 2^24.
    const std::vector<int16_t> ones = {1, 1, 1, 1};
    const auto order = three_taps(16'777'216.0F, 1.0F, -16'777'216.0F);
    EXPECT_EQ(dorn_resampler_convert(order.get(), ones.data(), 4, out), 3);
    EXPECT_EQ(out[1], 0);
}

TEST(resample_sinc, bad_arguments_and_phases) {
    dorn_resampler_state lowest;
    EXPECT_NE(dorn_resampler_prepare(&lowest, 2, 1, 1), -1);
    EXPECT_EQ(dorn_resampler_prepare(&lowest, 2, 0, 1), -1);
    const std::vector<int16_t> in(100, 1);
    std::vector<int16_t> out(1000);
    const auto state = prepared(48000);
    EXPECT_EQ(dorn_resampler_convert(nullptr, in.data(), 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), nullptr, 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), 100, nullptr), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), 9, out.data()), 0);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), 10, out.data()), 1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), -1, out.data()), 0);
    // An even span and a ratio that is not whole: the offset is 0 or 1/2, still the last phase;
    // with a ratio of 1.25 it is 3/4 at j = 3.
    auto drifting = three_taps(0, 1, 0);
    drifting->coef[960][1] = 5.0F;
    drifting->ratio = 1.5F;
    EXPECT_EQ(dorn_resampler_convert(drifting.get(), in.data(), 100, out.data()), 66);
    EXPECT_EQ(out[1], 5);
    drifting->ratio = 1.25F;
    EXPECT_EQ(dorn_resampler_convert(drifting.get(), in.data(), 100, out.data()), -1);
}

struct run_result {
    int64_t n;
    std::vector<double> out;
};
run_result run(const std::vector<int16_t> &in, int32_t rate) {
    run_result result = {-1, {}};
    double *out = nullptr;
    EXPECT_EQ(dorn_resampler_run(in.data(), static_cast<int64_t>(in.size() * 2), rate, kTarget,
                                 &result.n, &out),
              0);
    for (int64_t i = result.n; i < result.n + 8; ++i) EXPECT_EQ(out[i], 0.0);
    result.out.assign(out, out + result.n);
    free(out);
    return result;
}

TEST(resample_run, lengths_and_tails_of_every_usual_rate) {
    // 20,000 samples of a constant: n by hand; the samples that the filter cannot reach stay 0.
    const struct {
        int32_t rate;
        int64_t n;
        int32_t reach;  // input samples beyond the position that must exist; 0: block average
    } cases[] = {
        {8000, 27'562, 9},  {11025, 20'000, 0}, {12000, 18'375, 9}, {16000, 13'781, 9},
        {22050, 10'000, 0}, {24000, 9187, 9},   {32000, 6890, 9},   {33075, 6666, 0},
        {44100, 5000, 0},   {48000, 4593, 9},   {88200, 2500, 10},  {96000, 2296, 9},
        {176400, 1250, 10}, {192000, 1148, 9},
    };
    const std::vector<int16_t> in(20'000, 10'000);
    for (const auto &each : cases) {
        SCOPED_TRACE(each.rate);
        const run_result got = run(in, each.rate);
        ASSERT_EQ(got.n, each.n);
        for (int64_t i = 0; i < each.n; ++i) {
            const double position = double(i) * each.rate / kTarget;
            const bool reached = each.reach == 0 || std::floor(position) + each.reach < 20'000;
            ASSERT_EQ(got.out[size_t(i)] != 0.0, reached) << i;
        }
    }
}

// The filter's gain at a frequency, from its table's middle phase and, for the DC gain of the
// other phases, near enough alike.
double gain_at(const dorn_resampler_state &state, double cycles_per_sample) {
    double re = 0;
    double im = 0;
    for (int32_t k = 0; k <= state.taps; ++k) {
        re += double(state.coef[480][k]) * std::cos(2 * kPi * cycles_per_sample * k);
        im += double(state.coef[480][k]) * std::sin(2 * kPi * cycles_per_sample * k);
    }
    return std::hypot(re, im);
}

double dc_gain(int32_t rate) {
    return gain_at(*prepared(rate), 0.0);
}

TEST(resample_sinc, gain_at_rest) {
    EXPECT_NEAR(dc_gain(48000), 0.975, 0.001);
    EXPECT_NEAR(dc_gain(88200), 0.775, 0.001);
    EXPECT_NEAR(dc_gain(96000), 0.707, 0.001);
    EXPECT_NEAR(dc_gain(8000), 1.0, 0.005);
}

TEST(resample_sinc, sines_keep_their_time_and_aliases_vanish) {
    for (const int32_t rate : {8000, 16000, 32000, 48000, 96000}) {
        SCOPED_TRACE(rate);
        constexpr double kHz = 440.0;
        std::vector<int16_t> in(static_cast<size_t>(rate));  // one second
        for (size_t i = 0; i < in.size(); ++i) {
            in[i] = int16_t(std::lround(10'000 * std::sin(2 * kPi * kHz * double(i) / rate)));
        }
        const double peak = 10'000 * gain_at(*prepared(rate), kHz / rate);
        EXPECT_GT(peak, 6900);
        const run_result got = run(in, rate);
        // Away from the ends, output i is the sine at i / 11025 s: the phases are 1/960 sample
        // apart and a little unlike in gain, the position single precision.
        for (int64_t i = 100; i < got.n - 100; ++i) {
            const double want = peak * std::sin(2 * kPi * kHz * double(i) / kTarget);
            ASSERT_NEAR(got.out[size_t(i)], want, 0.004 * peak) << i;
        }
    }
    // 15 kHz at 48 kHz lies far above the new half rate: less than -60 dB is left.
    std::vector<int16_t> in(48'000);
    for (size_t i = 0; i < in.size(); ++i) {
        in[i] = int16_t(std::lround(30'000 * std::sin(2 * kPi * 15'000 * double(i) / 48'000)));
    }
    const run_result got = run(in, 48'000);
    for (int64_t i = 100; i < got.n - 100; ++i) ASSERT_LT(std::fabs(got.out[size_t(i)]), 30) << i;
}

TEST(resample_run, hostile_sizes_and_rates_are_refused) {
    const int16_t sample = 1;
    for (const auto &[bytes, source] :
         {std::pair<int64_t, int32_t>{INT64_MAX, 1}, {INT64_MAX / 8192, 1}, {2, 0}, {2, -48000}}) {
        int64_t n = 5;
        double *out = reinterpret_cast<double *>(&n);
        EXPECT_EQ(dorn_resampler_run(&sample, bytes, source, kTarget, &n, &out), -2);
        EXPECT_EQ(n, 0);
        EXPECT_EQ(out, nullptr);
    }
    EXPECT_EQ(run({}, 48'000).n, 0);
    EXPECT_EQ(run({5}, 48'000).n, 0);
}

}  // namespace
