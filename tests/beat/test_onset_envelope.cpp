#include <gtest/gtest.h>

#include <algorithm>

#include "beat/frame_pair.h"
#include "beat/onset_envelope.h"
#include "dsp/matrix.h"
#include "dsp/stats.h"
#include "tests/beat/beat_fixture.h"

namespace {

template <typename T>
struct grid {
    std::vector<T> values;
    std::vector<T *> rows;
    grid(size_t count, size_t columns) : values(count * columns) {
        for (size_t i = 0; i < count; ++i) rows.push_back(values.data() + i * columns);
    }
};

// What a frame and some bands need, with the plain forms.
struct transform {
    TAVO_FFT_CTX fft = {};
    size_t size, bands;
    std::vector<double> window;
    grid<float> weights;

    explicit transform(size_t samples = 512, size_t band_count = 36)
        : size(samples), bands(band_count), weights(samples / 2, band_count) {
        const auto n = static_cast<int16_t>(size);
        tavo_fft_init(n, &fft);
        for (size_t i = 0; i < size; ++i)
            window.push_back(0.5 *
                             (1.0 - cos(6.283185307179586 * static_cast<double>(i) / (n - 1))));
        if (bands == 36) fft2melmtx(11025, n, 5512, 36, weights.rows.data());
    }
    transform(const transform &) = delete;
    ~transform() { tavo_fft_deinit(&fft); }

    pair_tables *tables() const {
        return make_pair_tables(window.data(), &fft, weights.rows.data(),
                                static_cast<int32_t>(bands));
    }
    std::vector<double> powers(const double *samples) const {
        std::vector<double> re(size), im(size), row(bands);
        for (size_t i = 0; i < size; ++i) re[i] = samples[i] * window[i];
        tavo_fft_proc(re.data(), im.data(), static_cast<int16_t>(size), &fft);
        std::vector<float> power;
        for (size_t j = 0; j < size / 2; ++j)
            power.push_back(static_cast<float>(re[j] * re[j] + im[j] * im[j]));
        const float *spectrum = power.data();
        double *out = row.data();
        MultiplyMtxs(1, static_cast<int32_t>(bands), static_cast<int32_t>(size / 2), &spectrum,
                     weights.rows.data(), &out);
        return row;
    }
    std::vector<double> decibels(const double *samples) const {
        std::vector<double> row = powers(samples);
        for (double &x : row) x = 20.0 * log10(std::max(x, 0.0001));
        return row;
    }
    // Frames in steps of hop.
    std::vector<double> envelope(const double *samples, int32_t frames, int32_t hop) const {
        std::vector<double> change;
        for (int32_t k = 0; k + 1 < frames; ++k) {
            const std::vector<double> now = decibels(samples + k * hop);
            const std::vector<double> next = decibels(samples + (k + 1) * hop);
            double sum = 0.0;
            for (size_t b = 0; b < 36; ++b) {
                const double step = fabs(next[b] - now[b]);
                if (!std::isnan(step)) sum += step;
            }
            change.push_back(sum / 36);
        }
        double mean = 0.0, deviation = 0.0;
        getMeanStd(change.data(), frames - 1, &mean, &deviation);
        for (double &x : change) x /= deviation;
        return change;
    }
};

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

// Songs whose workers have pairs, single frames, nothing, and frames that do not go in pairs; other
// sizes, which are the arguments, as the context's own fields are not read; silence, which is no
// number; what is not finite anywhere, for which the fast form gives way. A worker of a caller's
// own fills all of its rows.
TEST(OnsetEnvelope, HasTheBitsOfItsFramesOneByOne) {
    std::mt19937 random(6);
    const struct {
        int32_t frames, size, hop;
    } cases[] = {{2, 512, 256},  {3, 512, 256},  {4, 512, 256},  {7, 512, 100},  {8, 512, 600},
                 {9, 512, 256},  {10, 512, 256}, {42, 512, 256}, {43, 512, 256}, {44, 512, 256},
                 {13, 256, 100}, {9, 1024, 7},   {6, 2, 3}};
    for (const auto &c : cases) {
        working_context work(c.frames, c.size, c.hop);
        TAVO_BEAT_CTX *beat = &work.beat;
        const std::vector<double> samples = wild_samples(work.of.ana.size(), 30, &random);
        if (c.frames < 44) std::copy(samples.begin(), samples.end(), beat->signal);
        if (c.frames == 8 || c.frames == 42) beat->signal[5 * c.hop + 1] = INFINITY;
        if (c.frames == 9 || c.frames == 43) beat->signal[5 * c.hop + 1] = NAN;
        const transform of(static_cast<size_t>(c.size));
        if (c.frames == 10) {  // nothing but in the last half frame
            beat->mel_matrix[7][3] = of.weights.rows[7][3] = INFINITY;
            std::fill_n(beat->signal, 2560, 0.0);
            beat->signal[2700] = 1.0;
        }
        beat->half_frame = beat->band_count = 0;
        _getOnsetEnvelope(beat, c.size, c.hop);
        beat->half_frame = c.size / 2;  // rows to release
        const std::vector<double> expected = of.envelope(beat->signal, c.frames, c.hop);
        EXPECT_TRUE(same_bits(beat->onset_env, expected)) << c.frames << " of " << c.size;
        EXPECT_TRUE(c.frames < 44 || std::isnan(beat->onset_env[0]));
        EXPECT_EQ(beat->onset_env[c.frames - 1], 0.0);

        const auto rows = static_cast<size_t>(c.frames);
        grid<float> spectrum(rows, of.size / 2);
        grid<double> mel(rows, 36);
        int32_t done[4] = {1, 0, 1, 1};
        TAVO_ONSET_WORKER worker = {};
        worker.id = 1;
        worker.signal = beat->signal;
        worker.last = c.frames - 1;
        worker.spectrum = spectrum.rows.data();
        worker.frame_size = c.size;
        worker.hop_size = c.hop;
        worker.fft = &of.fft;
        worker.done_flags = done;
        worker.thread_count = 4;
        worker.mutex = feat_mutex_mt;
        worker.cond = feat_cond_mt;
        worker.band_count = 36;
        worker.mel_matrix = beat->mel_matrix;
        worker.mel = mel.rows.data();
        worker.window = of.window.data();
        ASSERT_EQ(pthread_create(&worker.thread, nullptr, _tavo_proc_onsetenv, &worker), 0);
        pthread_join(worker.thread, nullptr);
        EXPECT_EQ(done[1], 1);
        for (size_t k = 0; k < rows; ++k)
            EXPECT_TRUE(same_bits(mel.rows[k], of.decibels(beat->signal + worker.hop_size * k)));
    }
}

// Three bands that are none, with zeros between the weights and some below 0, and no window: a tone
// of a whole number of periods then leaves rounding errors alone in all other bins.
TEST(FramePair, HasTheBitsOfEachFrameAlone) {
    std::mt19937 random(5);
    for (const size_t bands : {size_t{36}, size_t{3}}) {
        transform of(512, bands);
        if (bands == 3) of.window.assign(512, 1.0);
        for (float &w : of.weights.values) {
            if (bands == 3) w = random() % 4 == 0 ? 0.0f : static_cast<float>(uniform(&random));
        }
        pair_tables *tables = of.tables();
        ASSERT_NE(tables, nullptr);
        for (int round = 0; round < 2000; ++round) {
            std::vector<double> samples = wild_samples(900, 50, &random);
            for (size_t i = 0; i < samples.size() && round % 2 == 0; ++i) {
                samples[i] = cos(6.283185307179586 / 512 * static_cast<double>(i) * (round % 100));
            }
            const double *at = samples.data();
            const size_t hop = round % 4 < 2 ? 256 : random() % 389;
            double first[36], second[36];
            ASSERT_TRUE(take_pair(tables, at, at + hop, first, second));
            ASSERT_TRUE(same_bits(first, of.powers(at))) << round;
            ASSERT_TRUE(same_bits(second, of.powers(at + hop))) << round;
        }
        release_pair_tables(tables);
    }
}

// Products that the fast form leaves out matter only for values that are not finite: it hands those
// back, wherever they lie or arise.
TEST(FramePair, RefusesWhatIsNotFinite) {
    pair_tables *tables = transform().tables();
    std::vector<double> samples(768, 1.0);
    double first[36], second[36];
    for (const double odd : {1.0, double{INFINITY}, double{NAN}, 1e308, 1e30}) {
        for (size_t i = 1; i + 1 < samples.size(); i += 5) {  // the window's ends are 0
            samples[i] = odd;
            EXPECT_EQ(take_pair(tables, samples.data(), samples.data() + 256, first, second),
                      odd == 1.0)
                << odd << " at " << i;
            samples[i] = 1.0;
        }
    }
    release_pair_tables(tables);
}
