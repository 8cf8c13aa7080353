#include <cmath>
#include <memory>

#include "tests/pcm/signals.h"

namespace {

using sample_run = std::vector<int16_t>;
using state_ptr = std::unique_ptr<dorn_resampler_state>;

constexpr double kPi = 3.141592653589793;

state_ptr prepared(int32_t source, int32_t channels = 1) {
    auto state = std::make_unique<dorn_resampler_state>();
    EXPECT_EQ(dorn_resampler_prepare(state.get(), source, 11025, channels), 0);
    return state;
}

// The converter in its plainest form. Returns its code.
int64_t plain_convert(const dorn_resampler_state &s, const sample_run &in, sample_run *out) {
    const auto len = static_cast<int64_t>(in.size());
    const float h = float(s.taps) / 2;
    const int64_t hi = int64_t(h);
    for (int64_t j = 0;; ++j) {
        const float pos = s.ratio * float(j);
        const auto i0 = int64_t(std::floor(pos));
        if (int64_t((h + float(i0)) * float(s.channels)) >= len) return j * s.channels;
        const auto frac = float(double(pos) - (double(i0) + (s.taps % 2 == 1 ? 0.5 : 0.0)));
        if (std::fabs(frac) > 0.500001) return -1;
        const auto p = int64_t(std::floor(960.0 * double(frac) + 480.0 + 0.5));
        for (int64_t c = 0; c < s.channels; ++c) {
            float acc = 0;
            for (int64_t k = 0; k <= s.taps; ++k) {
                const int64_t at = (i0 - hi + k) * s.channels + c;
                const int16_t x = at < 0 || at >= len ? int16_t{0} : in[size_t(at)];
                acc += s.coef[p][k] * float(x);
            }
            const auto value = int64_t(std::floor(double(acc) + 0.5));
            out->push_back(int16_t(uint16_t(uint64_t(value) & 0xFFFF)));
        }
    }
}

TEST(resample_sinc, filter_table) {
    // Worked out from the windowed sinc's formula apart from this code in the precisions that it
    // has here; the sine may differ in its last bit.
    const struct {
        int32_t rate, phase, tap;
        double coefficient;
    } entries[] = {
        {48000, 480, 9, 0.20083972811698914},    {48000, 480, 10, 0.20083972811698914},
        {48000, 0, 9, 0.20671874284744263},      {48000, 960, 10, 0.20671874284744263},
        {48000, 240, 0, -5.7826164265861735e-6}, {48000, 123, 14, -0.00046699371887370944},
        {48000, 480, 4, -0.005477213766425848},  {8000, 480, 9, 0.6294412612915039},
        {8000, 0, 9, 0.9900000095367432},        {8000, 700, 19, -9.440486792300362e-6},
        {8000, 123, 14, 0.011031177826225758},   {8000, 480, 4, -0.012936153449118137},
        {88200, 0, 9, 0.1107882484793663},       {88200, 700, 19, 2.1377885786932893e-5},
        {88200, 123, 14, 0.03232921287417412},
    };
    for (const auto &each : entries) {
        EXPECT_NEAR(prepared(each.rate)->coef[each.phase][each.tap], each.coefficient,
                    std::fabs(each.coefficient) * 1.3e-7)
            << each.rate << ' ' << each.phase << ' ' << each.tap;
    }
    // The centre tap of the middle phase is the cut-off over pi: 0.9 / 8.
    const auto wc = static_cast<float>(double(0.1125F) * kPi);
    EXPECT_EQ(prepared(88200)->coef[480][10], static_cast<float>(double(wc) / kPi));
}

TEST(resample_sinc, spans_and_rates) {
    EXPECT_EQ(prepared(48000)->ratio, 48000.0F / 11025.0F);
    EXPECT_EQ(prepared(48000)->taps, 19);
    // 20 within 0.0001 of a whole ratio: 88,201 / 11,025 is 0.00009 off, 88,202 is 0.00018.
    EXPECT_EQ(prepared(88199)->taps, 20);
    EXPECT_EQ(prepared(88201)->taps, 20);
    EXPECT_EQ(prepared(88202)->taps, 19);
    const struct {
        int32_t source, target, code;
    } cases[] = {{2, 1, 0},       {2, 0, -1},     {48000, 0, -1},
                 {48000, -1, -1}, {0, 11025, -1}, {-48000, 11025, 0}};
    for (const auto &each : cases) {
        dorn_resampler_state state = {};
        EXPECT_EQ(dorn_resampler_prepare(&state, each.source, each.target, 1), each.code)
            << each.source << " to " << each.target;
    }
}

TEST(resample_sinc, same_as_the_plain_form) {
    for (const int32_t rate : {8000, 12000, 16000, 24000, 32000, 48000, 88200, 88201, 96000}) {
        for (const int32_t channels : {1, 2}) {
            const auto state = prepared(rate, channels);
            for (const int32_t len : {0, 1, 8, 9, 10, 11, 19, 20, 21, 22, 57, 1001, 20'000}) {
                SCOPED_TRACE(testing::Message() << rate << ' ' << channels << ' ' << len);
                const sample_run in = samples_of(noise(2 * len, uint32_t(len) + 7));
                sample_run want;
                const int64_t code = plain_convert(*state, in, &want);
                // Loud surroundings, which must not be heard.
                sample_run loud(in.size() + 200, 32'767);
                std::copy(in.begin(), in.end(), loud.begin() + 100);
                sample_run out(want.size() + 8, 77);
                EXPECT_EQ(dorn_resampler_convert(state.get(), loud.data() + 100, len, out.data()),
                          code);
                EXPECT_TRUE(std::equal(want.begin(), want.end(), out.begin()));
                if (code >= 0) {  // nothing further
                    EXPECT_EQ(out[want.size()], 77);
                }
            }
        }
    }
}

// A filter by hand: 2 taps, coefficients a, b, c in the middle phase, ratio 1.
state_ptr three_taps(float a, float b, float c) {
    auto state = std::make_unique<dorn_resampler_state>();
    state->taps = 2;
    state->ratio = 1.0F;
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
    EXPECT_EQ(filtered(0, 0.5F, 0)[3], 2);
    EXPECT_EQ(filtered(0.5F, 0, 0.5F)[2], -9998);
    // The sum runs in tap order in single precision: 2^24 + 1 stays 2^24.
    const sample_run ones(4, 1);
    sample_run out(4);
    const auto order = three_taps(16'777'216.0F, 1.0F, -16'777'216.0F);
    EXPECT_EQ(dorn_resampler_convert(order.get(), ones.data(), 4, out.data()), 3);
    EXPECT_EQ(out[1], 0);
}

TEST(resample_sinc, bad_arguments_and_phases) {
    const sample_run in(100, 1);
    sample_run out(1000);
    const auto state = prepared(48000);
    EXPECT_EQ(dorn_resampler_convert(nullptr, in.data(), 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), nullptr, 100, out.data()), -1);
    EXPECT_EQ(dorn_resampler_convert(state.get(), in.data(), 100, nullptr), -1);
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

TEST(resample_run, lengths_and_tails_of_every_usual_rate) {
    // 20,000 samples of a constant: n by hand; the samples that the filter cannot reach stay 0.
    const struct {
        int32_t rate;
        size_t n;
        int32_t reach;  // input samples beyond the position that must exist; 0: block average
    } cases[] = {
        {8000, 27'562, 9},  {11025, 20'000, 0}, {12000, 18'375, 9}, {16000, 13'781, 9},
        {22050, 10'000, 0}, {24000, 9187, 9},   {32000, 6890, 9},   {33075, 6666, 0},
        {44100, 5000, 0},   {48000, 4593, 9},   {88200, 2500, 10},  {96000, 2296, 9},
        {176400, 1250, 10}, {192000, 1148, 9},
    };
    const sample_run in(20'000, 10'000);
    for (const auto &each : cases) {
        SCOPED_TRACE(each.rate);
        const std::vector<double> got = converted(in, each.rate);
        ASSERT_EQ(got.size(), each.n);
        for (size_t i = 0; i < each.n; ++i) {
            const double position = double(i) * each.rate / 11025;
            const bool reached = each.reach == 0 || std::floor(position) + each.reach < 20'000;
            ASSERT_EQ(got[i] != 0.0, reached) << i;
        }
    }
}

TEST(resample_run, hostile_sizes_and_rates_are_refused) {
    const int16_t sample = 1;
    for (const auto &[bytes, source] :
         {std::pair<int64_t, int32_t>{INT64_MAX, 1}, {INT64_MAX / 8192, 1}, {2, 0}, {2, -48000}}) {
        int64_t n = 5;
        double *out = reinterpret_cast<double *>(&n);
        EXPECT_EQ(dorn_resampler_run(&sample, bytes, source, 11025, &n, &out), -2);
        EXPECT_EQ(n, 0);
        EXPECT_EQ(out, nullptr);
    }
    EXPECT_TRUE(converted({5}, 48'000).empty());
}

}  // namespace
