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
    // The sizes are the arguments, and there are 36 bands: the context's own fields are not read.
    work.beat.half_frame = 0;
    work.beat.band_count = 0;
    _getOnsetEnvelope(&work.beat, 512, 256);
    work.beat.half_frame = 256;  // rows to release

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

TEST(OnsetEnvelope, NothingWithoutTwoFrames) {
    working_context work(noise(767, 1000.0));
    _getOnsetEnvelope(&work.beat, 512, 256);
    EXPECT_EQ(work.beat.onset_env[0], 0.0);
}
