#include <gtest/gtest.h>

#include "beat/onset_envelope.h"
#include "tests/beat/beat_fixture.h"

namespace {

double hann(int i) {
    return 0.5 * (1.0 - cos(6.283185307179586 * i / 511));
}

// Decibels of an impulse of height 1 at a place of the frame, above the floor of -80: its spectrum
// is flat, so each band has the square of the window there times the band's weights.
double impulse_level(const TAVO_BEAT_CTX &beat, int place, int band) {
    double weights = 0.0;
    for (int bin = 0; bin < 256; ++bin) weights += static_cast<double>(beat.mel_matrix[bin][band]);
    return 20.0 * log10(hann(place) * hann(place) * weights) + 80.0;
}

}  // namespace

// Sample 2660 lies in frame 9 at place 356 and in frame 10 at place 100.
TEST(OnsetEnvelope, Impulse) {
    std::vector<double> samples(11025);
    samples[2660] = 32767.0;
    working_context work(samples);
    _getOnsetEnvelope(&work.beat, 512, 256);

    double change[3] = {};
    for (int band = 0; band < 36; ++band) {
        const double in9 = impulse_level(work.beat, 356, band);
        const double in10 = impulse_level(work.beat, 100, band);
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

// A tone whose period divides the hop looks the same in every frame; it changes at the start of
// frame 20, which frame 19 is the first to see. A partition's seams (10, 20, 30) show nothing.
TEST(OnsetEnvelope, SwitchedTone) {
    std::vector<double> samples(11025);
    for (size_t i = 0; i < samples.size(); ++i) {
        const double cycles = static_cast<double>(i) * (i < 5120 ? 10 : 40) / 256.0;
        samples[i] = 10000.0 * sin(6.283185307179586 * cycles);
    }
    working_context work(samples);
    _getOnsetEnvelope(&work.beat, 512, 256);
    for (int k = 0; k < 42; ++k) {
        if (k == 18 || k == 19) {
            EXPECT_GT(work.beat.onset_env[k], 1.0) << k;
        } else {
            EXPECT_NEAR(work.beat.onset_env[k], 0.0, 1e-6) << k;
        }
    }
}

TEST(OnsetEnvelope, SilenceIsNotANumber) {
    working_context work(std::vector<double>(11025));
    _getOnsetEnvelope(&work.beat, 512, 256);
    for (int k = 0; k < 41; ++k) EXPECT_TRUE(std::isnan(work.beat.onset_env[k]));
    EXPECT_EQ(work.beat.onset_env[41], 0.0);
}

TEST(OnsetEnvelope, NothingWithoutTwoFramesOrWithoutTheLock) {
    {
        working_context one_frame(noise(767, 1000.0));
        _getOnsetEnvelope(&one_frame.beat, 512, 256);
        EXPECT_EQ(one_frame.beat.onset_env[0], 0.0);
    }
    working_context unlocked(noise(11025, 1000.0));
    pthread_mutex_t *mutex = feat_mutex_mt;
    feat_mutex_mt = nullptr;
    _getOnsetEnvelope(&unlocked.beat, 512, 256);
    feat_mutex_mt = mutex;
    for (int k = 0; k < 42; ++k) EXPECT_EQ(unlocked.beat.onset_env[k], 0.0);
}

// One worker by itself: its own frames and flag, nothing else.
TEST(OnsetEnvelope, WorkerKeepsToItsFrames) {
    std::vector<double> samples(512 + 3 * 256);
    samples[612] = 32767.0;  // frame 1, place 356; frame 2, place 100
    working_context work(samples);
    float spectrum[4][256];
    double mel[4][36];
    float *spectrum_rows[4];
    double *mel_rows[4];
    double window[512];
    for (int k = 0; k < 4; ++k) {
        spectrum_rows[k] = spectrum[k];
        mel_rows[k] = mel[k];
        for (float &x : spectrum[k]) x = 7.0f;
        for (double &x : mel[k]) x = 7.0;
    }
    for (int i = 0; i < 512; ++i) window[i] = hann(i);
    TAVO_FFT_CTX fft;
    tavo_fft_init(512, &fft);
    int32_t done[4] = {1, 1, 0, 1};

    TAVO_ONSET_WORKER worker = {};
    worker.id = 2;
    worker.signal = work.beat.signal;
    worker.first = 1;
    worker.last = 2;
    worker.spectrum = spectrum_rows;
    worker.frame_size = 512;
    worker.hop_size = 256;
    worker.first_sample = 256;
    worker.fft = &fft;
    worker.done_flags = done;
    worker.thread_count = 4;
    worker.mutex = feat_mutex_mt;
    worker.cond = feat_cond_mt;
    worker.band_count = 36;
    worker.mel_matrix = work.beat.mel_matrix;
    worker.mel = mel_rows;
    worker.window = window;
    ASSERT_EQ(pthread_create(&worker.thread, nullptr, _tavo_proc_onsetenv, &worker), 0);
    pthread_join(worker.thread, nullptr);
    tavo_fft_deinit(&fft);

    EXPECT_EQ(done[2], 1);
    for (int bin = 0; bin < 256; ++bin) {
        EXPECT_EQ(spectrum[0][bin], 7.0f);
        EXPECT_NEAR(spectrum[1][bin], hann(356) * hann(356), 1e-6);
        EXPECT_NEAR(spectrum[2][bin], hann(100) * hann(100), 1e-6);
        EXPECT_EQ(spectrum[3][bin], 7.0f);
    }
    for (int band = 0; band < 36; ++band) {
        EXPECT_EQ(mel[0][band], 7.0);
        EXPECT_NEAR(mel[1][band], impulse_level(work.beat, 356, band) - 80.0, 1e-5);
        EXPECT_NEAR(mel[2][band], impulse_level(work.beat, 100, band) - 80.0, 1e-5);
        EXPECT_EQ(mel[3][band], 7.0);
    }
}
