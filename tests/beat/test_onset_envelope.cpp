#include <gtest/gtest.h>

#include <algorithm>

#include "beat/frame_pair.h"
#include "beat/onset_envelope.h"
#include "dsp/matrix.h"
#include "dsp/stats.h"
#include "tests/beat/beat_fixture.h"

namespace {

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

// Songs whose workers have pairs, single frames or nothing; other sizes, which are the arguments,
// as the context's own fields are not read; silence, which is no number; samples and weights that
// are not finite or become so, for which the fast form gives way, and weights of either sign and
// none.
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
        if (round % 8 == 2) beat->mel_matrix[below(256)][below(36)] = INFINITY;
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
    for (int round = 0; round < 2000; ++round) {
        std::vector<double> samples = wild_samples(900, 50, &random);
        for (size_t i = 0; i < samples.size() && round % 2 == 0; ++i)
            samples[i] = cos(6.283185307179586 / 512 * static_cast<double>(i) * (round % 100));
        const double *first = samples.data(), *second = first + random() % 389;
        double one[36], other[36];
        ASSERT_TRUE(take_pair(tables, first, second, one, other));
        ASSERT_TRUE(same_bits(one, frame.bands(first, weights))) << round;
        ASSERT_TRUE(same_bits(other, frame.bands(second, weights))) << round;
    }
    release_pair_tables(tables);
}
