#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>

#include "beat/frame_pair.h"
#include "beat/onset_envelope.h"
#include "beat/power_rise.h"
#include "dsp/matrix.h"
#include "dsp/stats.h"
#include "tests/beat/beat_fixture.h"
#include "tests/support/reference.h"

namespace {

// Between -1 and 1; or of any size up to 2^highest; or mostly, or but for its signs, nothing; or
// too small to have its full precision.
std::vector<double> wild_samples(size_t n, int highest, std::mt19937 *random) {
    std::vector<double> samples(n);
    const auto kind = (*random)() % 5;
    for (double &x : samples) {
        x = uniform(random);
        if (kind == 1) x = std::ldexp(x, static_cast<int>((*random)() % 200) - 200 + highest);
        if (kind == 2) x = (*random)() % 3 == 0 ? x : 0.0;
        if (kind == 3) x = std::ldexp(x, -1074 + static_cast<int>((*random)() % 60));
        if (kind == 4) x = (*random)() % 2 == 0 ? 0.0 : -0.0;
    }
    return samples;
}

// The same bits, or both no numbers.
bool same_bits(const double *a, const std::vector<double> &b) {
    for (size_t i = 0; i < b.size(); ++i) {
        if (std::isnan(b[i]) ? !std::isnan(a[i]) : memcmp(&a[i], &b[i], sizeof b[i]) != 0)
            return false;
    }
    return true;
}

// One frame by the plain form.
struct plain_frame {
    TAVO_FFT_CTX fft = {};
    std::vector<double> window;

    explicit plain_frame(int32_t size) {
        tavo_fft_init(static_cast<int16_t>(size), &fft);
        for (int32_t i = 0; i < size; ++i)
            window.push_back(0.5 * (1.0 - cos(6.283185307179586 * i / (size - 1))));
    }
    plain_frame(const plain_frame &) = delete;
    ~plain_frame() { tavo_fft_deinit(&fft); }

    std::vector<double> bands(const double *samples, const float *const *weights) const {
        const size_t size = window.size();
        std::vector<double> re(size), im(size), row(36);
        for (size_t i = 0; i < size; ++i) re[i] = samples[i] * window[i];
        tavo_fft_proc(re.data(), im.data(), static_cast<int16_t>(size), &fft);
        std::vector<float> power;
        for (size_t j = 0; j < size / 2; ++j)
            power.push_back(static_cast<float>(re[j] * re[j] + im[j] * im[j]));
        const float *spectrum = power.data();
        double *out = row.data();
        MultiplyMtxs(1, 36, static_cast<int32_t>(size / 2), &spectrum, weights, &out);
        return row;
    }
    std::vector<double> decibels(const double *samples, const float *const *weights) const {
        std::vector<double> row = bands(samples, weights);
        for (double &x : row) x = 20.0 * log10(std::max(x, 0.0001));
        return row;
    }
};

// Frames in steps of hop.
std::vector<double> envelope(const TAVO_BEAT_CTX &beat, int32_t size, int32_t hop) {
    const plain_frame frame(size);
    std::vector<double> change, next, now = frame.decibels(beat.signal, beat.mel_matrix);
    for (int64_t k = 1; k < beat.frame_count; ++k, now = next) {
        next = frame.decibels(beat.signal + k * hop, beat.mel_matrix);
        double sum = 0.0;
        for (size_t b = 0; b < 36; ++b)
            sum += std::isnan(next[b] - now[b]) ? 0.0 : fabs(next[b] - now[b]);
        change.push_back(sum / 36);
    }
    double mean = 0.0, deviation = 0.0;
    getMeanStd(change.data(), beat.frame_count - 1, &mean, &deviation);
    for (double &x : change) x /= deviation;
    return change;
}

constexpr size_t kBlock = 5512;

// Constant samples that give the follower's level, 16-bit scale.
double sample_of_level(double level) {
    return sqrt((level + 0.5) / 32767.0);
}

}  // namespace

TEST(BeatCtx, OneSecond) {
    analysis of(std::vector<double>(11025));
    of.ana[3] = -32768.0;
    of.ana[11024] = 16383.5;
    TAVO_BEAT_CTX beat = {};
    __beat_init(&of.ctx, &beat);
    EXPECT_EQ(beat.frame_count, 42);  // (11025 - 512) / 256 + 1
    EXPECT_EQ(beat.frame_times[41], 0.02321995465f * 42.0f);
    EXPECT_EQ(beat.signal[3], -32768.0 / 32767.0);
    EXPECT_EQ(beat.signal[11024], 0.5);
    EXPECT_EQ(std::count(beat.rise_flags, beat.rise_flags + 11025, 0), 11025);
    // 39.817379 mel in 37 steps of 71.743 Hz below 1 kHz; bins 21.533 Hz apart; a top of 2 /
    // 143.486.
    const float lowest[] = {0.0f,       0.0041836f, 0.0083671f, 0.0125507f,
                            0.0111427f, 0.0069591f, 0.0027756f, 0.0f};
    for (int bin = 0; bin < 8; ++bin) EXPECT_NEAR(beat.mel_matrix[bin][0], lowest[bin], 1e-6);
    EXPECT_TRUE(feat_mutex_mt != nullptr && feat_cond_mt != nullptr);
    __tavo_deinit(&beat);
    EXPECT_TRUE(feat_mutex_mt == nullptr && feat_cond_mt == nullptr);
}

// Workers with pairs, single frames or nothing; sizes, which are the arguments, not the context's;
// silence, which is no number; samples and weights not finite; weights of either sign and none.
TEST(OnsetEnvelope, HasTheBitsOfItsFramesOneByOne) {
    std::mt19937 random(6);
    const auto below = [&](uint32_t limit) { return static_cast<int32_t>(random() % limit); };
    for (int round = 0; round < 200; ++round) {
        SCOPED_TRACE(round);
        const int32_t size = round % 4 == 0 ? 2 << below(10) : 512;
        const int32_t hop = round % 3 == 0 ? 1 + below(700) : 256;
        working_context work(2 + below(45), size, hop);
        TAVO_BEAT_CTX *beat = &work.beat;
        const size_t n = work.of.ana.size();
        const std::vector<double> samples = wild_samples(n, 20 << round % 6, &random);
        std::copy(samples.begin(), samples.end(), beat->signal);
        if (round % 5 == 1) beat->signal[random() % n] = round % 2 == 0 ? NAN : INFINITY;
        if (round % 8 == 2) {  // what it weighs is nothing at first, and left out
            beat->mel_matrix[below(256)][below(36)] = INFINITY;
            std::fill_n(beat->signal, n / 2, 0.0);
        }
        for (int32_t i = 0; i < size * 9 && round % 8 == 3; ++i)
            beat->mel_matrix[i / 18][below(36)] = static_cast<float>(below(3) - 1);
        beat->half_frame = beat->band_count = 0;
        _getOnsetEnvelope(beat, size, hop);
        beat->half_frame = size / 2;  // rows to release
        EXPECT_TRUE(same_bits(beat->onset_env, envelope(*beat, size, hop)));
        EXPECT_EQ(beat->onset_env[beat->frame_count - 1], 0.0);
    }
}

// A worker of a caller's own fills all of its rows.
TEST(OnsetEnvelope, AWorkersRows) {
    std::mt19937 random(7);
    const plain_frame frame(512);
    const working_context work(2);
    float *const *weights = work.beat.mel_matrix;
    const std::vector<double> samples = wild_samples(768, 20, &random);
    float spectrum[2][256], *spectrum_rows[] = {spectrum[0], spectrum[1]};
    double mel[2][36], *mel_rows[] = {mel[0], mel[1]};
    int32_t done[4] = {0, 1, 1, 1};
    TAVO_ONSET_WORKER worker = {};
    worker.signal = samples.data();
    worker.last = 1;
    worker.spectrum = spectrum_rows;
    worker.frame_size = 512;
    worker.hop_size = 256;
    worker.fft = &frame.fft;
    worker.done_flags = done;
    worker.thread_count = 4;
    worker.mutex = feat_mutex_mt;
    worker.cond = feat_cond_mt;
    worker.band_count = 36;
    worker.mel_matrix = work.beat.mel_matrix;
    worker.mel = mel_rows;
    worker.window = frame.window.data();
    ASSERT_EQ(pthread_create(&worker.thread, nullptr, _tavo_proc_onsetenv, &worker), 0);
    pthread_join(worker.thread, nullptr);
    EXPECT_EQ(done[0], 1);
    EXPECT_TRUE(same_bits(mel[0], frame.decibels(samples.data(), weights)));
    EXPECT_TRUE(same_bits(mel[1], frame.decibels(samples.data() + 256, weights)));
}

// Without a window, a tone of a whole number of periods leaves rounding errors alone in all other
// bins: powers, which are rounded to single precision, hide them elsewhere.
TEST(FramePair, HasTheBitsOfEachFrameAlone) {
    std::mt19937 random(5);
    plain_frame frame(512);
    frame.window.assign(512, 1.0);
    const working_context work(2);
    float *const *weights = work.beat.mel_matrix;
    pair_tables *tables = make_pair_tables(frame.window.data(), &frame.fft, weights, 36);
    double one[36], other[36];
    for (int round = 0; round < 2000; ++round) {
        std::vector<double> samples = wild_samples(900, 50, &random);
        for (size_t i = 0; i < samples.size() && round % 2 == 0; ++i)
            samples[i] = cos(6.283185307179586 / 512 * static_cast<double>(i) * (round % 100));
        const double *first = samples.data(), *second = first + random() % 389;
        ASSERT_TRUE(take_pair(tables, first, second, one, other));
        ASSERT_TRUE(same_bits(one, frame.bands(first, weights))) << round;
        ASSERT_TRUE(same_bits(other, frame.bands(second, weights))) << round;
    }
    std::vector<double> samples(768, 1.0);
    for (const size_t at : {767u, 0u}) {  // not finite in the second frame alone, then in both
        samples[at] = INFINITY;
        EXPECT_FALSE(take_pair(tables, &samples[0], &samples[256], one, other));
    }
    release_pair_tables(tables);
}

// Silence is at the floor of -30.31 dB, sample 0.5 at level 8191, -12.04 dB. P60 is -12.04, the
// target twice that, level 2048: three of the ten samples around i, each 819 of the mean, must be
// loud. 20 blocks are measured, block b over samples 5512 (b - 1) + 1 to 5512 b.
TEST(PowerRise, Steps) {
    constexpr size_t kBegin = 10 * kBlock;
    const struct {
        size_t start;
        double sample;
        size_t rise;  // 0: none
    } cases[] = {
        {kBegin + 2000, 0.5, kBegin + 1998},
        {kBegin + 3, 0.5, kBegin + 1},
        {kBlock + 2000, 0.5, kBlock + 1998},  // block 0 is never measured and counts as quiet
        // Below level 1000 is the floor. A step to -28.03 dB (level 1300) is too low, its limit
        // being -32.03; one to -24.29 dB (2000) is not, and its target lies below the floor.
        {kBegin + 2000, sample_of_level(1300), 0},
        {kBegin + 2000, sample_of_level(2000), kBegin},
        // Ten samples of -32768 have a mean of 32769, beyond 16 bits. The target is the top, 0 dB,
        // which only ten loud samples reach.
        {kBegin + 2000, -32768.0 / 32767.0, kBegin + 2005},
        {kBegin + kBlock - 5, -32768.0 / 32767.0, kBegin + kBlock},  // at the block's last sample
    };
    for (const auto &c : cases) {
        std::vector<double> signal(20 * kBlock + 100, c.sample);
        std::fill_n(signal.begin(), c.start, 0.0);
        std::vector<int32_t> flags(signal.size()), expected(signal.size());
        if (c.rise > 0) expected[c.rise] = 1;
        EXPECT_EQ(
            detectPowerVariation(signal.data(), flags.data(), static_cast<int64_t>(signal.size())),
            c.rise > 0 ? 1 : 0);
        EXPECT_TRUE(flags == expected) << c.start << " " << c.sample;
    }
}

// Loud and quiet by turns, at all lengths around a block's: noise, wild values, and samples whose
// tens measure whole levels, so that a rounding more or less decides.
TEST(PowerRise, HasTheBitsOfTheLevelsOneByOne) {
    std::mt19937 random(7);
    int found = 0;
    for (int round = 0; round < 80; ++round) {
        const size_t n = (random() % 50) * kBlock + random() % (round % 2 == 0 ? 12 : kBlock);
        std::vector<double> signal = wild_samples(n, 20, &random);
        double loudness = 0.1;
        for (double &x : signal) {
            if (random() % 25000 == 0) loudness = pow(10.0, -1.5 * fabs(uniform(&random)));
            if (round % 4 != 0) x = loudness * uniform(&random);
            if (round % 4 == 1) x = sqrt(floor(3276.7 * fabs(x)) * 10.0 / 32767.0);
        }
        if (round % 8 == 3 && n > 0) signal[0] = 4.0;  // in the first sum alone
        if (round % 6 == 0 && n > 0) signal[random() % n] = round % 4 == 0 ? NAN : INFINITY;

        std::vector<double> levels(n / kBlock + 1), db;
        measure_block_levels({signal.data(), 1.0}, static_cast<int64_t>(n), levels.data());
        ASSERT_TRUE(same_bits(levels.data(), reference::block_levels(signal, &db))) << round;
        std::vector<int32_t> flags(n);
        found += detectPowerVariation(signal.data(), flags.data(), static_cast<int64_t>(n));
        ASSERT_TRUE(flags == reference::rises(signal)) << round;
    }
    EXPECT_GT(found, 15);
}
