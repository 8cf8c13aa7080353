// Curves and PCM of constant levels, written as pairs of a count and a value. The largest point of
// each curve (2 s per point) is 1, so the values are normalised.
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

// Returns 10 log10(mean square + 1) of `window` samples, with full scale 1.
float plain_power(const int16_t *pcm, int64_t window) {
    double sum = 0.0;
    for (int64_t i = 0; i < window; ++i) sum += (pcm[i] / 32767.0) * (pcm[i] / 32767.0);
    return 10.0f * std::log10(static_cast<float>(sum / static_cast<double>(window)) + 1.0f);
}

using indexes = std::vector<int32_t>;

constexpr int32_t kSlow = 100;  // Hz; the curve does not depend on the rate
constexpr int32_t kRate = 8000;

std::vector<float> expand(const std::string &pairs) {
    std::vector<float> power;
    std::istringstream in(pairs);
    float value = 0.0f;
    for (size_t count = 0; in >> count >> value;) power.insert(power.end(), count, value);
    return power;
}

// Returns PCM with alternating signs and `unit` samples per point. Each value is approximately the
// mean square, with full scale 1.
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

// Returns the valleys of 50 points, which have the value `depth` at `dips` and 1 elsewhere.
indexes find_valleys(const indexes &dips, float depth = 0.0f, float mean = 0.5f,
                     float std = 0.125f) {
    std::vector<float> values(50, 1.0f);
    for (const int32_t at : dips) values[static_cast<size_t>(at)] = depth;
    indexes out(15);
    const int32_t count = tavo_find_valley(values.data(), 50, out.data(), mean, std, 2.0f);
    out.resize(static_cast<size_t>(count));
    return out;
}

// Returns the tuned start of PCM in steps of 0.4 s, the first 3 s before the coarse start.
uint32_t tune(const std::string &steps, int32_t rate = kRate, uint32_t start_ms = 3000,
              uint32_t duration_s = 60) {
    std::vector<int16_t> pcm = make_pcm(steps, rate * 2 / 5);
    pcm.insert(pcm.begin(), (start_ms - 3000) * static_cast<size_t>(rate) / 1000, int16_t{0});
    return _tune_HL_simple(pcm.data(), rate, start_ms, duration_s);
}

// Returns the start found in a song whose buffer ends with the PCM. A second search replaces the
// curve.
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

// Tests a song at full power, and a window of equal parts of silence, quarter and full power.
TEST(PowerEnvelope, IsTenLogOfMeanSquarePlusOne) {
    EXPECT_EQ(compute_curve(make_pcm("800 1", 1)), std::vector<float>(2, 10.0f * log10f(2.0f)));
    EXPECT_NEAR(compute_curve(make_pcm("1 0 1 .25 1 1", 200))[0], 10.0 * log10(1.0 + 1.25 / 3.0),
                1e-4);
}

// With odd and even numbers of windows, the two sections share one window or none.
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

// If the mean is above 0.5, a dip must be 1.5 deviations below it, otherwise one: below 0.375 in
// both cases.
TEST(Valleys, AreTheEndsOfQuietStretches) {
    EXPECT_EQ(find_valleys({5}, 0.375f, 0.75f, 0.25f), indexes{});
    EXPECT_EQ(find_valleys({5}, 0.34375f, 0.75f, 0.25f), indexes{5});
    EXPECT_EQ(find_valleys({5}, 0.34375f), indexes{5});
    EXPECT_EQ(find_valleys({}), indexes{});
    EXPECT_EQ(find_valleys({0}), indexes{0});
    EXPECT_EQ(find_valleys({0, 10}), indexes{10});
    EXPECT_EQ(find_valleys({0, 1, 5, 6, 12}), (indexes{1, 6, 12}));
    EXPECT_EQ(find_valleys({4, 6, 9}), (indexes{6, 9}));
    indexes many;
    for (int32_t at = 1; at < 50; at += 3) many.push_back(at);
    EXPECT_EQ(find_valleys(many), indexes(many.begin(), many.begin() + 15));
}

// In songs of 90 s and more, edges count from point 9 on and are scored up to 25 points before the
// end; in shorter songs from 0 on and up to 10.
TEST(Search, ReturnsTheBestEdge) {
    const struct {
        const char *curve;
        int32_t duration_s;
        uint32_t ms;
    } cases[] = {
        {"20 0.4 10 0.9 1 1 19 0.9 10 0.4", 120, 38000},  // into the loud passage
        // The edge at 28 has a smaller step than the edge at 14, but its average rises more, so its
        // score is higher.
        {"3 0.1 1 1 11 0.1 6 0.45 7 0.1 1 0.35 12 0.65 19 0.1", 120, 56000},
        // The edges at 13 and 30 have equal scores, so the one with the larger step wins.
        {"3 0.125 1 1 9 0.125 1 0.375 7 0.8125 10 0.25 10 0.75 19 0.25", 120, 60000},
        // The step from 0.6 to 0.9 is not scored, because the average falls from 0.8 to 0.75. The
        // answer is the point after the only edge. With equal averages of 0.75 the step is scored.
        {"5 0.25 10 1 1 0.6 1 0.9 20 0.6 23 0.25", 120, 32000},
        {"5 0.25 10 1 1 0.5 1 0.875 20 0.625 23 0.25", 120, 30000},
        // Four loud points after an edge are a passage, three are not, even if values at the mean
        // of 0.25 follow, because they are not above it.
        {"20 0.5 4 1 36 0.5", 120, 38000},
        {"20 0.5 3 1 37 0.5", 120, 40000},
        {"20 0 3 1 4 0.25 10 0 16 0.25 7 1", 120, 40000},
        // The opening counts only in short songs.
        {"5 0.25 10 1 16 0.25 10 0.75 19 0.25", 90, 60000},
        {"5 0.25 10 1 16 0.25 10 0.75 19 0.25", 89, 8000},
        // One edge, at 5, inside the loud passage that starts at 0; the later rise has no strict
        // maximum. Without a segment the answer would be the point after the edge.
        {"6 0.75 24 1 11 0.25 1 0.5 1 0.75 8 0.875 9 0.25", 80, 10000},
        // At the last scored point the answer is the edge itself. One point later it is the point
        // after the edge, because no other edge qualifies; but an earlier edge does.
        {"36 0.25 10 1 14 0.25", 90, 70000},
        {"37 0.25 10 1 13 0.25", 90, 74000},
        {"20 0.25 1 0.9 14 0.25 1 1 24 0.25", 90, 40000},
        {"51 0.25 5 1 4 0.25", 89, 100000},
        {"52 0.25 5 1 3 0.25", 89, 104000},
        // Bursts of two points are too short to be scored, so the answer is the point after the
        // first edge that is not followed closely by a valley. Dips below 0.336 are low points, and
        // the valley is the last of them: at 23, 3 after the edge at 20, or at 24.
        {"20 0.5 1 1 1 0.9 1 0.3 1 0.1 1 0.4 5 0.5 2 0.85 28 0.5", 120, 60000},
        {"20 0.5 1 1 1 0.9 1 0.5 1 0.3 1 0.1 1 0.4 4 0.5 2 0.85 28 0.5", 120, 40000},
        // An edge must rise above the 60th percentile, which is 0.8. The largest step, at 29, only
        // reaches it, and the next one, at 41, exceeds it.
        {"9 1 20 0.5 1 0.1 1 0.8 10 0.5 1 0.2 1 0.81 28 0.5 29 1", 204, 84000},
        {"30 1 30 0.5", 120, 0},  // no rising edge
        {"60 0", 120, 0},
        // Nine points are skipped, and the remaining four are too few. With one point more there
        // are enough, but the only edge, at 11, is not scored.
        {"11 0.25 2 1", 100, 0},
        {"12 0.25 2 1", 100, 24000},
    };
    for (const auto &c : cases) EXPECT_EQ(search(c.curve, c.duration_s), c.ms) << c.curve;
}

// Only the ten largest edges count: with nine bursts before a passage the passage wins, with ten
// the first burst. Of thirty passages the last one, which is the loudest, wins.
TEST(Search, ComparesTenEdgesAndThirtyPassages) {
    std::string bursts = "12 0.25", passages;
    for (int k = 0; k < 9; ++k) bursts += " 1 0." + std::to_string(99 - k) + " 4 0.25";
    EXPECT_EQ(search(bursts + " 10 0.6 30 0.25", 210), 2000u * 56);
    EXPECT_EQ(search(bursts + " 1 1 4 0.25 10 0.6 30 0.25", 210), 2000u * 57);
    for (int k = 0; k < 29; ++k) passages += "4 0.25 6 0.75 ";
    EXPECT_EQ(search(passages + "4 0.25 6 1 30 0.25", 660), 2000u * 293u);
}

TEST(Search, RequestedLengthMovesTheStart) {
    // Segments (9, 13) and (29, 49), no valleys. The edge at 29 is chosen, and the region ends at
    // 49, 20 points later.
    const char *plain = "10 0.25 4 0.75 16 0.25 20 1 10 0.25";
    // A region that would exceed the song starts at the first segment or the first valley,
    // whichever is earlier. The dips to 0.1 are valleys.
    const char *valley_first = "20 0.5 1 0.1 9 0.5 20 1 5 0.5 1 0.1 4 0.5";
    const char *segment_first = "10 0.5 20 1 9 0.5 1 0.1 20 0.5";
    const char *valley_only = "20 0.5 1 1 10 0.5 1 0.1 28 0.5";
    // A single loud point is not a segment, but two are: (19, 21). The region ends at 27.
    const char *one = "20 0.5 1 1 39 0.5", *two = "20 0.5 2 1 38 0.5";
    const struct {
        const char *curve;
        int32_t hl_param;
        uint32_t ms;
    } cases[] = {
        {plain, 0, 58000},
        {plain, -30, 58000},
        {plain, 44, 58000},           // 22 points need a lead of 2, too short to move the start
        {plain, 46, 58000},           // ideal start 26: 29 is the nearest boundary
        {plain, 60, 26000},           // ideal start 19: 13 is the nearest boundary
        {plain, 102, 18000},          // 9 + 51 reaches the end: the first segment
        {plain, 104, 18000},          // 9 + 52 exceeds it: the first segment
        {valley_first, 80, 40000},    // 20 + 40; the segment is at 29
        {segment_first, 102, 18000},  // 9 + 51; the valley is at 39
        {valley_only, 58, 62000},     // 31 + 29
        {one, 30, 24000},             // 15 points, 8 of them before 20
        {one, 31, 24000},
        {two, 30, 38000},
    };
    for (const auto &c : cases) {
        EXPECT_EQ(search(c.curve, 120, c.hl_param), c.ms) << c.curve << ", " << c.hl_param;
    }
}

// The mean is 0.5.
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
        {"the next valley is the end", loud, 40, 15, {34, 50}, {}, 34},
        {"2 points back are not worth it", loud, 40, 12, {34, 50}, {}, 40},
        {"34 is 3 off: the ideal start itself", loud, 40, 13, {34, 50}, {}, 37},
        {"25 points on", loud, 40, 30, {65}, {}, 35},
        {"26 are too far, and no end is found", loud, 40, 30, {66}, {}, 10},
        // The ideal start is 35.
        {"the valley before", loud, 40, 15, {37, 50}, {}, 37},
        {"3 off", loud, 40, 15, {38, 50}, {}, 35},
        {"at chosen itself: none before", loud, 40, 15, {34, 40, 50}, {}, 35},
        {"back while nearer to 31", loud, 40, 19, {20, 30, 34, 39, 50}, {}, 30},
        {"not the song's first point", loud, 6, 9, {0, 10}, {}, 1},
        {"equally near: the valley", loud, 40, 15, {38, 50}, {32, 60}, 38},
        {"a segment's boundary", loud, 40, 15, {38, 50}, {33, 60}, 33},
        {"also as the last boundary", loud, 40, 15, {38, 50}, {20, 33}, 33},
        {"which needs a valley", loud, 40, 15, {50}, {20, 33}, 35},
        {"another follows", loud, 40, 15, {50}, {20, 33, 60, 70}, 33},
        {"60 is farther", loud, 40, 15, {50}, {20, 60}, 20},
        {"0 is no boundary", loud, 40, 15, {50}, {0, 90}, 35},
        // Without a valley the end is searched from 14 s to 48 s after chosen: points 47 to 64.
        {"a fall of one deviation ends it at 50", falls, 40, 15, {}, {}, 35},
        {"reached at 50 exactly", falls, 40, 15, {}, {}, 35, 0.625f},
        {"the deepest of the falls, 55", falls, 40, 20, {}, {}, 35, 0.875f},
        {"a fall at 64", "64 1 4 .25 52 1", 40, 28, {}, {}, 36},
        {"none at 65", "65 1 4 .25 51 1", 40, 28, {}, {}, 12},
        {"50 is at the mean, 52 lowest", "50 1 1 .5 1 1 2 .375 66 1", 40, 15, {}, {}, 37},
        {"no fall that lasts: the lowest, 54", dip, 40, 19, {}, {}, 35},
        {"a segment around chosen: its end, 60", dip, 40, 25, {}, {30, 60}, 30},
        {"40 is not inside (10, 40)", dip, 40, 19, {}, {10, 40, 60, 70}, 40},
        {"46 is too early, 48 lowest", "46 1 1 .25 1 1 2 .25", 40, 15, {}, {}, 33},
        {"nothing low: the last point, 49", "50 1", 40, 14, {}, {}, 35},
        {"46 falls: its followers are there", "46 1 1 .25 1 1 2 .25", 39, 9, {}, {30, 45}, 39},
        {"47 does not: the segment's end", "47 1 1 .25 1 1 1 .25", 40, 8, {}, {30, 45}, 30},
        {"ends at 100 exactly", hundred, 90, 10, {98}, {30, 99}, 90},
        {"too long: the earlier of 99 and 30", hundred, 90, 11, {99}, {30, 99}, 30},
        {"no segment reads 0", hundred, 90, 11, {99}, {}, 0},
        {"neither fits", hundred, 90, 11, {99}, {95, 99}, 0},
        {"the valley is earlier", hundred, 98, 3, {20}, {30, 99}, 20},
        {"endless", hundred, 90, INT32_MAX, {}, {}, 0},
        {"after the song", loud, 120, 15, {50}, {}, 0},
        {"before it", loud, -1, 15, {50}, {}, 0},
    };
    for (const auto &c : cases) {
        std::vector<float> norm = expand(c.curve);
        const auto n = static_cast<int32_t>(norm.size());
        norm.resize(norm.size() + 3);  // low values after the song, which must be ignored
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
    for (const int32_t rate : {-8000, 0, 2}) {  // 2: the hop has no sample
        EXPECT_EQ(_tune_HL_simple(nullptr, rate, 20000, 60), 20000u) << rate;
    }
}

// Window k covers the steps k to k + 2, so a louder step s is a rise at window s - 3. The average
// rise of five windows must exceed 0.13 dB. The start moves to the smallest change between windows
// after the rise, the first of two equal ones.
TEST(Tune, MovesToTheSharpestRise) {
    // Mean squares from window 10 on: 0, 0.2, 0.3, 0.3, 0.2, 0.3, 0.3, 0.2, 0. The largest rise is
    // at 10, and the only fall in its five steps is from 13 to 14.
    const char *song = "13 0 1 .6 1 .3 1 0 1 .3 1 .6 12 0";
    for (const int32_t rate : {8000, 11025, 22051, 44100})
        EXPECT_EQ(tune(song, rate, 20000), 22200u) << rate;
    EXPECT_EQ(tune(song, kRate, 3000, 12), 5200u);  // exactly 9 s left
    EXPECT_EQ(tune(song, kRate, 3000, 11), 3000u);
    EXPECT_EQ(tune("13 0 17 .0382"), 5200u);  // a rise of 0.1305
    EXPECT_EQ(tune("13 0 17 .0378"), 3000u);  // a rise of 0.1292
    EXPECT_EQ(tune("30 .5"), 3000u);
    EXPECT_EQ(tune("13 0 5 .039 12 0"), 5200u);  // all five windows must count
    EXPECT_EQ(tune("3 0 27 .5"), 1200u);         // from the first window
    EXPECT_EQ(tune("24 0 6 .5"), 9600u);         // from the sixth-to-last window
    // The first of equal rises, at window 3; the step from 6 to 7 is level.
    EXPECT_EQ(tune("6 0 5 .5 7 0 5 .5 7 0"), 2400u);
}

// The song is 120 s long and loud from 60 s to 100 s. The window at 54 s is the last without the
// loud part, so the coarse start is 54 s. Tuning moves it to 60.2 s, the start of the first window
// that is completely loud.
TEST(Position, ReturnsTheTunedStart) {
    EXPECT_EQ(find_position(make_pcm("60 .04 40 .64 20 .04", kRate), 120, 58), 60200u);
    EXPECT_EQ(find_position({}, 120, 0), 0u);
    EXPECT_EQ(find_position(make_pcm("47999 .5", 1), 5, 0), 0u);
    EXPECT_EQ(find_position(std::vector<int16_t>(120 * kRate), 120, 58), 0u);
    clearHighlgihtCtx(nullptr);
}

// The coarse start is 112 s, and tuning it needs audio up to 120.6 s. The first PCM ends at 120 s,
// so the start is left as it is, although the stated duration is longer. The second PCM has enough
// audio, and the start moves to 116.2 s.
TEST(Position, TuningDoesNotReadPastThePcm) {
    EXPECT_EQ(find_position(make_pcm("116 .04 2 .64 2 .04", kRate), 200, 58), 112000u);
    EXPECT_EQ(find_position(make_pcm("1160 .04 20 .64 26 .04", kRate / 10), 200, 58), 116200u);
}
