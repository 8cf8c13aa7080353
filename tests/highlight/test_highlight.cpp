// Strings describe curves (2 s per point) and PCM as pairs of a count and a value. The largest
// value of each curve is 1, so the search does not need to scale it.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "highlight/position.h"
#include "highlight/power_envelope.h"
#include "highlight/region.h"
#include "highlight/search.h"
#include "highlight/tune.h"
#include "highlight/valleys.h"

namespace {

// Returns the level of `window` samples: 10 log10(mean square + 1), where full scale is 1.
float plain_power(const int16_t *pcm, int64_t window) {
    double sum = 0.0;
    for (int64_t i = 0; i < window; ++i) sum += (pcm[i] / 32767.0) * (pcm[i] / 32767.0);
    return 10.0f * std::log10(static_cast<float>(sum / static_cast<double>(window)) + 1.0f);
}

using indexes = std::vector<int32_t>;

constexpr int32_t kSlow = 100;  // Hz; a low rate keeps the PCM short
constexpr int32_t kRate = 8000;

std::vector<float> expand(const std::string &pairs) {
    std::vector<float> power;
    std::istringstream in(pairs);
    float value = 0.0f;
    for (size_t count = 0; in >> count >> value;) power.insert(power.end(), count, value);
    return power;
}

// Returns PCM with alternating signs. Each value is the mean square of `unit` samples.
std::vector<int16_t> make_pcm(const std::string &pairs, int64_t unit) {
    std::vector<int16_t> pcm;
    for (const float square : expand(pairs)) {
        const double peak = std::round(32767.0 * std::sqrt(static_cast<double>(square)));
        for (int64_t i = 0; i < unit; ++i)
            pcm.push_back(static_cast<int16_t>(i % 2 == 0 ? peak : -peak));
    }
    return pcm;
}

std::vector<float> compute_curve(const std::vector<int16_t> &pcm) {
    TAVO_HL_CTX hl = {0, nullptr, 77, 0};
    const auto samples = static_cast<int64_t>(pcm.size());
    const int32_t count = _calc_power_level(pcm.data(), samples, kSlow, &hl);
    EXPECT_EQ(hl.power_count, count);
    EXPECT_EQ(hl.power == nullptr, count == 0);
    const std::vector<float> values(hl.power, hl.power + count);
    free(hl.power);
    return values;
}

uint32_t search(const std::string &curve, int32_t duration_s, int32_t hl_param = 0) {
    std::vector<float> power = expand(curve);
    TAVO_HL_CTX hl = {hl_param, power.data(), static_cast<int32_t>(power.size()), 0};
    return _get_HL_simple(&hl, duration_s);
}

// Returns the valleys of a curve of 50 points, which is `depth` at the dips and 1 elsewhere.
indexes find_valleys(const indexes &dips, float depth = 0.0f, float mean = 0.5f,
                     float std = 0.125f) {
    std::vector<float> values(50, 1.0f);
    for (const int32_t at : dips) values[static_cast<size_t>(at)] = depth;
    indexes out(15);
    const int32_t count = tavo_find_valley(values.data(), 50, out.data(), mean, std, 2.0f);
    out.resize(static_cast<size_t>(count));
    return out;
}

// Returns the tuned start. The steps of 0.4 s begin 3 s before the coarse start.
uint32_t tune(const std::string &steps, int32_t rate = kRate, uint32_t start_ms = 3000,
              uint32_t duration_s = 60) {
    std::vector<int16_t> pcm = make_pcm(steps, rate * 2 / 5);
    pcm.insert(pcm.begin(), (start_ms - 3000) * static_cast<size_t>(rate) / 1000, int16_t{0});
    return _tune_HL_simple(pcm.data(), rate, start_ms, duration_s);
}

// Returns the start found in a song. A second search must find the same start.
uint32_t find_position(std::vector<int16_t> pcm, int64_t duration_s, int32_t count) {
    pcm.shrink_to_fit();
    TAVO_CTX ctx = {};
    ctx.pcm = pcm.data();
    ctx.pcm_bytes = static_cast<int64_t>(pcm.size() * sizeof(int16_t));
    ctx.fmt.sample_rate = kRate;
    ctx.duration = duration_s * kUnitsPerSecond;
    ctx.hl = static_cast<TAVO_HL_CTX *>(calloc(1, sizeof(TAVO_HL_CTX)));
    ctx.hl->hl_pos = 12345;
    const uint32_t start = getHLPosition(&ctx);
    EXPECT_EQ(ctx.hl->hl_pos, start);
    EXPECT_EQ(ctx.hl->power_count, count);
    EXPECT_EQ(getHLPosition(&ctx), start);
    clearHighlgihtCtx(ctx.hl);
    return start;
}

}  // namespace

TEST(PowerEnvelope, HasOneValueEveryTwoSeconds) {
    for (const auto &[samples, count] : std::vector<std::pair<size_t, size_t>>{
             {0, 0}, {599, 0}, {600, 1}, {799, 1}, {800, 2}, {18000, 88}})
        EXPECT_EQ(compute_curve(std::vector<int16_t>(samples)), std::vector<float>(count))
            << samples;
    TAVO_HL_CTX hl = {};
    for (const int32_t rate : {0, -1, INT32_MIN, INT32_MAX})
        EXPECT_EQ(_calc_power_level(nullptr, 1000, rate, &hl), 0) << rate;
    EXPECT_EQ(_calc_power_level(nullptr, INT64_MIN / 2, kSlow, &hl), 0);
    EXPECT_EQ(_calc_power_level(nullptr, INT64_MAX, 1, &hl), 0);
    EXPECT_EQ(hl.power, nullptr);
}

// The curve is computed in two halves, which share a window if the number of windows is odd.
TEST(PowerEnvelope, EqualsEachWindowSummedSeparately) {
    std::mt19937 random(11);
    for (int64_t windows = 1; windows <= 9; ++windows) {
        const int64_t samples = (windows + 2) * 2 * kSlow + windows * 13 % (2 * kSlow);
        std::vector<int16_t> pcm(static_cast<size_t>(samples));
        for (int16_t &x : pcm) x = static_cast<int16_t>(random());
        const std::vector<float> values = compute_curve(pcm);
        ASSERT_EQ(values.size(), static_cast<size_t>(windows));
        for (size_t k = 0; k < values.size(); ++k) {
            EXPECT_EQ(values[k], plain_power(pcm.data() + 2 * kSlow * k, 6 * kSlow)) << k;
        }
    }
    for (int32_t x = INT16_MIN; x <= INT16_MAX; ++x) {
        ASSERT_EQ(x * kInverseHead + x * kInverseTail, x / 32767.0) << x;
    }
}

// A point is low if it is more than one standard deviation below the mean (1.5 if the mean exceeds
// 0.5). A valley is the last point of a low stretch.
TEST(Valleys, AreTheEndsOfQuietStretches) {
    EXPECT_EQ(find_valleys({5}, 0.375f, 0.75f, 0.25f), indexes{});
    EXPECT_EQ(find_valleys({5}, 0.34375f, 0.75f, 0.25f), indexes{5});
    EXPECT_EQ(find_valleys({5}, 0.34375f), indexes{5});
    EXPECT_EQ(find_valleys({0}), indexes{0});
    EXPECT_EQ(find_valleys({0, 10}), indexes{10});
    EXPECT_EQ(find_valleys({4, 6, 9}), (indexes{6, 9}));
    indexes many;
    for (int32_t at = 1; at < 50; at += 3) many.push_back(at);
    EXPECT_EQ(find_valleys(many), indexes(many.begin(), many.begin() + 15));
}

// Edges are steep rises. Those in the first 18 s and the last 50 s of a song are ignored. In a song
// shorter than 90 s, only those in the last 20 s are ignored.
TEST(Search, ReturnsTheBestEdge) {
    // This curve has two loud passages. The second one, of 20 points, is chosen.
    const char *plain = "10 0.25 4 0.75 16 0.25 20 1 10 0.25";
    // A region that would extend past the song starts at the first passage or valley instead.
    const char *segment_first = "10 0.5 20 1 9 0.5 1 0.1 20 0.5";
    const char *valley_only = "20 0.5 1 1 10 0.5 1 0.1 28 0.5";
    const struct {
        const char *curve;
        int32_t duration_s;
        uint32_t ms;
        int32_t requested_s = 0;  // length of the highlight
    } cases[] = {
        {"20 0.4 10 0.9 1 1 19 0.9 10 0.4", 120, 38000},
        // Of two edges with equal scores the larger step wins.
        {"3 0.125 1 1 9 0.125 1 0.375 7 0.8125 10 0.25 10 0.75 19 0.25", 120, 60000},
        // An edge where the average falls is not scored. If no edge is scored, the first one wins.
        {"5 0.25 10 1 1 0.6 1 0.9 20 0.6 23 0.25", 120, 32000},
        {"5 0.25 10 1 1 0.5 1 0.875 20 0.625 23 0.25", 120, 30000},
        // An edge is scored if four loud points follow it. Loud points are above the mean.
        {"20 0.5 4 1 36 0.5", 120, 38000},
        {"20 0 3 1 4 0.25 10 0 16 0.25 7 1", 120, 40000},
        // An edge near the start counts only in a short song.
        {"5 0.25 10 1 16 0.25 10 0.75 19 0.25", 90, 60000},
        {"5 0.25 10 1 16 0.25 10 0.75 19 0.25", 89, 8000},
        // The edge in the first row is as late as allowed. The edge in the second row is too late.
        // In the third row, an earlier edge is chosen.
        {"36 0.25 10 1 14 0.25", 90, 70000},
        {"37 0.25 10 1 13 0.25", 90, 74000},
        {"20 0.25 1 0.9 14 0.25 1 1 24 0.25", 90, 40000},
        {"51 0.25 5 1 4 0.25", 89, 100000},
        {"52 0.25 5 1 3 0.25", 89, 104000},
        // No edge is scored, so the result is the first edge without a valley soon after it.
        {"20 0.5 1 1 1 0.9 1 0.3 1 0.1 1 0.4 5 0.5 2 0.85 28 0.5", 120, 60000},
        {"20 0.5 1 1 1 0.9 1 0.5 1 0.3 1 0.1 1 0.4 4 0.5 2 0.85 28 0.5", 120, 40000},
        // An edge must rise above the 60th percentile, not only to it.
        {"9 1 20 0.5 1 0.1 1 0.8 10 0.5 1 0.2 1 0.81 28 0.5 29 1", 204, 84000},
        {"30 1 30 0.5", 120, 0},  // no rising edge
        {"60 0", 120, 0},
        // After the opening there must be at least five points.
        {"11 0.25 2 1", 100, 0},
        {"12 0.25 2 1", 100, 24000},
        // A requested length moves the start.
        {plain, 120, 58000, 46},  // the start is still the nearest boundary
        {plain, 120, 26000, 60},  // the nearest boundary is the end of the first passage
        {plain, 120, 18000, 104},
        {segment_first, 120, 18000, 102},
        {valley_only, 120, 62000, 58},
        // A passage consists of at least two loud points.
        {"20 0.5 1 1 39 0.5", 120, 24000, 30},
        {"20 0.5 2 1 38 0.5", 120, 38000, 30},
    };
    for (const auto &c : cases) {
        EXPECT_EQ(search(c.curve, c.duration_s, c.requested_s), c.ms) << c.curve;
    }
}

// Only the ten largest edges are compared, so a passage after nine bursts is found, but one after
// ten is not. Of thirty passages, the last one is found, because it is the loudest.
TEST(Search, ComparesTenEdgesAndThirtyPassages) {
    std::string bursts = "12 0.25", passages;
    for (int k = 0; k < 9; ++k) bursts += " 1 0." + std::to_string(99 - k) + " 4 0.25";
    EXPECT_EQ(search(bursts + " 10 0.6 30 0.25", 210), 2000u * 56);
    EXPECT_EQ(search(bursts + " 1 1 4 0.25 10 0.6 30 0.25", 210), 2000u * 57);
    for (int k = 0; k < 29; ++k) passages += "4 0.25 6 0.75 ";
    EXPECT_EQ(search(passages + "4 0.25 6 1 30 0.25", 660), 2000u * 293u);
}

// The ideal start is the requested length before the end of the region. The mean is 0.5.
TEST(Region, EndsAtAValleyOrAFall) {
    const char *loud = "120 1", *hundred = "100 1", *dip = "50 1 1 .375 3 1 1 .25 65 1";
    const char *falls = "50 1 4 .375 1 1 1 .25 1 1 2 .375 1 1 1 .375 1 1 2 .375 56 1";
    const struct {
        const char *name, *curve;
        int32_t chosen, len_pts;
        indexes valleys, pairs;
        uint32_t start;
        float std = 0.25f;
    } cases[] = {
        {"a valley near the ideal start", loud, 40, 15, {37, 50}, {}, 37},
        {"no valley near it", loud, 40, 13, {34, 50}, {}, 37},
        {"a valley at the chosen point", loud, 40, 15, {34, 40, 50}, {}, 35},
        {"a valley at the start of the song", loud, 6, 9, {0, 10}, {}, 1},
        {"a segment as near as the valley", loud, 40, 15, {38, 50}, {32, 60}, 38},
        {"a segment nearer than the valley", loud, 40, 15, {38, 50}, {33, 60}, 33},
        {"the last segment, without a valley", loud, 40, 15, {50}, {20, 33}, 35},
        {"a segment at the start of the song", loud, 40, 15, {50}, {0, 90}, 35},
        {"the valley at the end is 25 points on", loud, 40, 30, {65}, {}, 35},
        {"the valley at the end is too far", loud, 40, 30, {66}, {}, 10},
        // Without a valley, the search for the end covers 14 s to 48 s after the chosen point.
        {"a fall by exactly one deviation", falls, 40, 15, {}, {}, 35, 0.625f},
        {"the deepest of smaller falls", falls, 40, 20, {}, {}, 35, 0.875f},
        {"the latest fall", "64 1 4 .25 52 1", 40, 28, {}, {}, 36},
        {"a fall that is too late", "65 1 4 .25 51 1", 40, 28, {}, {}, 12},
        {"a fall to the mean", "50 1 1 .5 1 1 2 .375 66 1", 40, 15, {}, {}, 37},
        {"no fall that lasts: the lowest point", dip, 40, 19, {}, {}, 35},
        {"a segment that ends at the chosen point", dip, 40, 19, {}, {10, 40, 60, 70}, 40},
        {"no low point: the last point", "50 1", 40, 14, {}, {}, 35},
        {"a fall before the last three points", "46 1 1 .25 1 1 2 .25", 39, 9, {}, {30, 45}, 39},
        {"a fall in the last three points", "47 1 1 .25 1 1 1 .25", 40, 8, {}, {30, 45}, 30},
        // A region that extends past the song starts at the first valley or segment, or at 0.
        {"a region that ends with the song", hundred, 90, 10, {98}, {30, 99}, 90},
        {"too long, with an early segment", hundred, 90, 11, {99}, {30, 99}, 30},
        {"too long, without a segment", hundred, 90, 11, {99}, {}, 0},
        {"too long from every point", hundred, 90, 11, {99}, {95, 99}, 0},
        {"endless", hundred, 90, INT32_MAX, {}, {}, 0},
        {"chosen after the song", loud, 120, 15, {50}, {}, 0},
        {"chosen before the song", loud, -1, 15, {50}, {}, 0},
    };
    for (const auto &c : cases) {
        std::vector<float> norm = expand(c.curve);
        const auto n = static_cast<int32_t>(norm.size());
        norm.resize(norm.size() + 3);  // low values past the song, which must be ignored
        indexes found = c.valleys;
        found.resize(15);
        const auto nv = static_cast<int32_t>(c.valleys.size());
        const auto nseg = static_cast<int32_t>(c.pairs.size() / 2);
        EXPECT_EQ(tavo_select_highlight_region(norm.data(), n, c.len_pts, c.chosen, nv,
                                               found.data(), c.pairs.data(), nseg, 0.5f, c.std),
                  c.start)
            << c.name;
    }
}

TEST(Tune, StartNearTheEndsOfTheSongIsReturnedUnchanged) {
    for (const uint32_t start : {0u, 2000u, 51001u, 52000u, 70000u}) {
        EXPECT_EQ(_tune_HL_simple(nullptr, kRate, start, 60), start);
    }
    for (const int32_t rate : {-8000, 0, 2}) {  // at 2 Hz a hop has no sample
        EXPECT_EQ(_tune_HL_simple(nullptr, rate, 20000, 60), 20000u) << rate;
    }
}

// A rise is the excess of the average of five windows over the window before them. The start moves
// to the largest rise above 0.13 dB and from there to the smallest change between two windows.
TEST(Tune, MovesToTheSharpestRise) {
    // Of the five steps after the largest rise only the fourth is a fall.
    const char *song = "13 0 1 .6 1 .3 1 0 1 .3 1 .6 12 0";
    for (const int32_t rate : {8000, 11025, 22051, 44100})
        EXPECT_EQ(tune(song, rate, 20000), 22200u) << rate;
    EXPECT_EQ(tune(song, kRate, 3000, 12), 5200u);  // 9 s are left, which is just enough
    EXPECT_EQ(tune(song, kRate, 3000, 11), 3000u);
    EXPECT_EQ(tune("13 0 17 .0382"), 5200u);  // a rise of 0.1305
    EXPECT_EQ(tune("13 0 17 .0378"), 3000u);  // a rise of 0.1292
    EXPECT_EQ(tune("30 .5"), 3000u);
    EXPECT_EQ(tune("13 0 5 .039 12 0"), 5200u);  // needs all five windows
    EXPECT_EQ(tune("3 0 27 .5"), 1200u);         // the earliest and the latest possible rise
    EXPECT_EQ(tune("24 0 6 .5"), 9600u);
    EXPECT_EQ(tune("6 0 5 .5 7 0 5 .5 7 0"), 2400u);  // the first of two equal rises
}

// Tuning moves the coarse start to the first window that is completely loud, unless the PCM ends
// too early, as in the third song.
TEST(Position, IsTheTunedStart) {
    EXPECT_EQ(find_position(make_pcm("60 .04 40 .64 20 .04", kRate), 120, 58), 60200u);
    EXPECT_EQ(find_position(make_pcm("1160 .04 20 .64 26 .04", kRate / 10), 200, 58), 116200u);
    EXPECT_EQ(find_position(make_pcm("116 .04 2 .64 2 .04", kRate), 200, 58), 112000u);
    EXPECT_EQ(find_position({}, 120, 0), 0u);
    EXPECT_EQ(find_position(make_pcm("47999 .5", 1), 5, 0), 0u);
    EXPECT_EQ(find_position(std::vector<int16_t>(120 * kRate), 120, 58), 0u);
    clearHighlgihtCtx(nullptr);
}
