#include <gtest/gtest.h>

#include <algorithm>

#include "beat/frame_pair.h"
#include "beat/onset_envelope.h"
#include "dsp/matrix.h"
#include "dsp/stats.h"
#include "tests/beat/beat_fixture.h"

namespace {

double hann(size_t i) {
    return 0.5 * (1.0 - cos(6.283185307179586 * static_cast<double>(i) / 511));
}

// What a frame of 512 samples and some bands need, with the plain form of its powers.
struct transform {
    TAVO_FFT_CTX fft = {};
    std::vector<double> window;
    std::vector<float> weights;
    std::vector<float *> rows;
    size_t bands;

    explicit transform(size_t band_count = 36) : weights(256 * band_count), bands(band_count) {
        tavo_fft_init(512, &fft);
        for (size_t i = 0; i < 512; ++i) window.push_back(hann(i));
        for (size_t bin = 0; bin < 256; ++bin) rows.push_back(weights.data() + bin * bands);
        if (bands == 36) fft2melmtx(11025, 512, 5512, 36, rows.data());
    }
    transform(const transform &) = delete;
    ~transform() { tavo_fft_deinit(&fft); }

    pair_tables *tables() const {
        return make_pair_tables(window.data(), &fft, rows.data(), static_cast<int32_t>(bands));
    }
    std::vector<double> plain_bands(const double *samples) const {
        std::vector<double> re(512), im(512), row(bands);
        for (size_t i = 0; i < 512; ++i) re[i] = samples[i] * window[i];
        tavo_fft_proc(re.data(), im.data(), 512, &fft);
        std::vector<float> power(256);
        for (size_t j = 0; j < 256; ++j)
            power[j] = static_cast<float>(re[j] * re[j] + im[j] * im[j]);
        const float *spectrum = power.data();
        double *out = row.data();
        MultiplyMtxs(1, static_cast<int32_t>(bands), 256, &spectrum, rows.data(), &out);
        return row;
    }
};

// The envelope from the rows that a caller's own worker fills, for all frames of the context.
std::vector<double> envelope_of_rows(const TAVO_BEAT_CTX *beat) {
    const transform of;
    const auto frames = static_cast<size_t>(beat->frame_count);
    std::vector<std::vector<float>> spectrum(frames, std::vector<float>(256));
    std::vector<std::vector<double>> mel(frames, std::vector<double>(36));
    std::vector<float *> spectrum_rows;
    std::vector<double *> mel_rows;
    for (auto &row : spectrum) spectrum_rows.push_back(row.data());
    for (auto &row : mel) mel_rows.push_back(row.data());
    int32_t done[4] = {1, 0, 1, 1};
    TAVO_ONSET_WORKER worker = {1,
                                {},
                                beat->signal,
                                0,
                                beat->frame_count - 1,
                                spectrum_rows.data(),
                                512,
                                256,
                                0,
                                &of.fft,
                                done,
                                4,
                                feat_mutex_mt,
                                feat_cond_mt,
                                36,
                                beat->mel_matrix,
                                mel_rows.data(),
                                of.window.data()};
    EXPECT_EQ(pthread_create(&worker.thread, nullptr, _tavo_proc_onsetenv, &worker), 0);
    pthread_join(worker.thread, nullptr);
    EXPECT_EQ(done[1], 1);

    std::vector<double> change(frames - 1);
    for (size_t k = 0; k + 1 < frames; ++k) {
        for (size_t b = 0; b < 36; ++b) {
            const double step = fabs(mel[k + 1][b] - mel[k][b]);
            if (!std::isnan(step)) change[k] += step;
        }
        change[k] /= 36;
    }
    double mean = 0.0, deviation = 0.0;
    getMeanStd(change.data(), beat->frame_count - 1, &mean, &deviation);
    for (double &c : change) c /= deviation;
    return change;
}

}  // namespace

TEST(BeatCtx, OneSecond) {
    std::vector<double> samples(11025, 0.0);
    samples[3] = -32768.0;
    samples[11024] = 16383.5;
    working_context work(samples);
    const TAVO_BEAT_CTX &beat = work.beat;
    EXPECT_EQ(beat.frame_count, 42);  // (11025 - 512) / 256 + 1
    EXPECT_EQ(beat.frame_times[41], 0.02321995465f * 42.0f);
    EXPECT_EQ(beat.signal[3], -32768.0 / 32767.0);
    EXPECT_EQ(beat.signal[11024], 0.5);
    EXPECT_EQ(std::count(beat.rise_flags, beat.rise_flags + 11025, 0), 11025);
    EXPECT_TRUE(feat_mutex_mt != nullptr && feat_cond_mt != nullptr);
    __tavo_deinit(&work.beat);
    EXPECT_TRUE(feat_mutex_mt == nullptr && feat_cond_mt == nullptr);
    EXPECT_TRUE(beat.mel_matrix == nullptr && beat.signal == nullptr && beat.rise_flags == nullptr);
}

// 39.817379 mel in 37 steps of 71.743 Hz below 1 kHz; bins 21.533 Hz apart; a top of 2 / 143.486.
TEST(BeatCtx, MelTriangles) {
    const transform of;
    const float lowest[] = {0.0f,       0.0041836f, 0.0083671f, 0.0125507f,
                            0.0111427f, 0.0069591f, 0.0027756f, 0.0f};
    for (size_t bin = 0; bin < 8; ++bin) EXPECT_NEAR(of.rows[bin][0], lowest[bin], 1e-6) << bin;
    for (size_t band = 0; band < 36; ++band) {
        double area = 0.0;
        for (const float *row : of.rows) area += static_cast<double>(row[band]) * 11025.0 / 512.0;
        EXPECT_NEAR(area, 1.0, 0.03) << band;
    }
}

// An impulse of height 1 at sample 2660 lies in frame 9 at place 356 and in frame 10 at place 100.
// Its spectrum is flat, so each band has the square of the window there times the band's weights,
// in decibels above the floor of -80. The sizes are the arguments, and there are 36 bands: the
// context's own fields are not read.
TEST(OnsetEnvelope, Impulse) {
    std::vector<double> samples(11025);
    samples[2660] = 32767.0;
    working_context work(samples);
    work.beat.half_frame = work.beat.band_count = 0;
    _getOnsetEnvelope(&work.beat, 512, 256);
    work.beat.half_frame = 256;  // rows to release

    double change[3] = {};
    for (int band = 0; band < 36; ++band) {
        double weights = 0.0;
        for (int bin = 0; bin < 256; ++bin)
            weights += static_cast<double>(work.beat.mel_matrix[bin][band]);
        const double in9 = 20.0 * log10(hann(356) * hann(356) * weights) + 80.0;
        const double in10 = 20.0 * log10(hann(100) * hann(100) * weights) + 80.0;
        change[0] += fabs(in9) / 36;
        change[1] += fabs(in10 - in9) / 36;
        change[2] += fabs(in10) / 36;
    }
    const double sum = change[0] + change[1] + change[2];
    const double squares = change[0] * change[0] + change[1] * change[1] + change[2] * change[2];
    const double deviation = sqrt(squares / 41 - sum / 41 * (sum / 41));
    for (int k = 0; k < 42; ++k) {
        const double expected = k >= 8 && k <= 10 ? change[k - 8] / deviation : 0.0;
        EXPECT_NEAR(work.beat.onset_env[k], expected, 1e-6) << k;
    }
}

TEST(OnsetEnvelope, SilenceIsNotANumber) {
    working_context work(int64_t{42});
    _getOnsetEnvelope(&work.beat, 512, 256);
    for (int k = 0; k < 41; ++k) EXPECT_TRUE(std::isnan(work.beat.onset_env[k]));
    EXPECT_EQ(work.beat.onset_env[41], 0.0);
}

// Songs whose workers have pairs, single frames, nothing, and frames that do not go in pairs.
TEST(OnsetEnvelope, HasTheBitsOfItsFramesOneByOne) {
    std::mt19937 random(6);
    for (const int64_t frames : {2, 3, 4, 7, 8, 9, 42, 43}) {
        working_context work(frames);
        const std::vector<double> samples = wild_samples(work.of.ana.size(), 30, &random);
        std::copy(samples.begin(), samples.end(), work.beat.signal);
        if (frames > 7) work.beat.signal[5 * 256] = frames % 2 == 0 ? INFINITY : NAN;
        const std::vector<double> expected = envelope_of_rows(&work.beat);
        _getOnsetEnvelope(&work.beat, 512, 256);
        for (size_t k = 0; k < expected.size(); ++k) {
            const double found = work.beat.onset_env[k];
            ASSERT_TRUE(found == expected[k] || (std::isnan(found) && std::isnan(expected[k])))
                << frames << " " << k;
        }
    }
}

// Three bands that are none, with zeros between the weights and some below 0, and no window: a tone
// of a whole number of periods then leaves rounding errors alone in all other bins.
TEST(FramePair, HasTheBitsOfEachFrameAlone) {
    std::mt19937 random(5);
    for (const size_t bands : {size_t{36}, size_t{3}}) {
        transform of(bands);
        if (bands == 3) of.window.assign(512, 1.0);
        for (float &w : of.weights) {
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
            std::vector<double> first(bands), second(bands);
            ASSERT_TRUE(take_pair(tables, at, at + hop, first.data(), second.data()));
            ASSERT_TRUE(same_bits(first, of.plain_bands(at))) << round;
            ASSERT_TRUE(same_bits(second, of.plain_bands(at + hop))) << round;
        }
        release_pair_tables(tables);
    }
}

// Products that the fast form leaves out matter only for values that are not finite: it hands those
// back, wherever they lie or arise.
TEST(FramePair, RefusesWhatIsNotFinite) {
    transform of;
    pair_tables *tables = of.tables();
    std::vector<double> samples(768, 1.0), bands(72);
    for (const double odd : {1.0, double{INFINITY}, -double{INFINITY}, double{NAN}, 1e308, 1e30}) {
        for (size_t i = 1; i + 1 < samples.size(); i += 5) {  // the window's ends are 0
            samples[i] = odd;
            EXPECT_EQ(take_pair(tables, samples.data(), samples.data() + 256, bands.data(),
                                bands.data() + 36),
                      odd == 1.0)
                << odd << " at " << i;
            samples[i] = 1.0;
        }
    }
    release_pair_tables(tables);
    of.rows[7][3] = static_cast<float>(INFINITY);
    EXPECT_EQ(of.tables(), nullptr);
}
