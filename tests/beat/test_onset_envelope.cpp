#include <cstring>

#include "beat/onset_envelope.h"
#include "dsp/matrix.h"
#include "dsp/stats.h"
#include "tests/beat/beat_fixture.h"

namespace {

// True if the values are bit-identical or both NaN.
bool is_bit_identical(const double *a, const std::vector<double> &b) {
    for (size_t i = 0; i < b.size(); ++i) {
        if (std::isnan(b[i]) ? !std::isnan(a[i]) : memcmp(&a[i], &b[i], sizeof b[i]) != 0)
            return false;
    }
    return true;
}

// Returns the powers of one analysis frame. `window` is the Hann window.
std::vector<float> frame_powers(const double *samples, const std::vector<double> &window,
                                const TAVO_FFT_CTX &fft) {
    const size_t n = window.size();
    std::vector<double> re(n), im(n);
    for (size_t i = 0; i < n; ++i) re[i] = samples[i] * window[i];
    tavo_fft_proc(re.data(), im.data(), static_cast<int16_t>(n), &fft);
    std::vector<float> powers(n / 2);
    for (size_t j = 0; j < n / 2; ++j)
        powers[j] = static_cast<float>(re[j] * re[j] + im[j] * im[j]);
    return powers;
}

// Returns the onset envelope, computed step by step with the functions of dsp/.
std::vector<double> envelope(const TAVO_BEAT_CTX &beat, int32_t size, int32_t hop) {
    const auto frames = static_cast<size_t>(beat.frame_count);
    std::vector<std::vector<float>> powers;
    std::vector<std::vector<double>> rows(frames, std::vector<double>(36));
    std::vector<const float *> from;
    std::vector<double *> to;
    std::vector<double> window;
    for (int32_t i = 0; i < size; ++i)
        window.push_back(0.5 * (1.0 - cos(6.283185307179586 * i / (size - 1))));
    TAVO_FFT_CTX fft = {};
    tavo_fft_init(static_cast<int16_t>(size), &fft);
    for (size_t k = 0; k < frames; ++k) {
        powers.push_back(frame_powers(beat.signal + static_cast<int64_t>(k) * hop, window, fft));
        from.push_back(powers[k].data());
        to.push_back(rows[k].data());
    }
    tavo_fft_deinit(&fft);
    MultiplyMtxs(static_cast<int32_t>(frames), 36, size / 2, from.data(), beat.mel_matrix,
                 to.data());
    std::vector<double> change;
    for (size_t k = 0; k < frames; ++k) {
        double sum = 0.0;
        for (size_t b = 0; b < 36; ++b) {
            rows[k][b] = 20.0 * log10(std::max(rows[k][b], 0.0001));
            const double difference = k > 0 ? rows[k][b] - rows[k - 1][b] : 0.0;
            sum += std::isnan(difference) ? 0.0 : fabs(difference);
        }
        if (k > 0) change.push_back(sum / 36);
    }
    double mean = 0.0, deviation = 0.0;
    getMeanStd(change.data(), beat.frame_count - 1, &mean, &deviation);
    for (double &x : change) x /= deviation;
    return change;
}

}  // namespace

TEST(BeatCtx, OneSecondHas42Frames) {
    analysis run(std::vector<double>(11025));
    run.ana[3] = -32768.0;
    run.ana[11024] = 16383.5;
    TAVO_BEAT_CTX beat = {};
    __beat_init(&run.ctx, &beat);
    EXPECT_EQ(beat.frame_count, 42);
    EXPECT_EQ(beat.frame_times[41], 0.02321995465f * 42.0f);
    EXPECT_EQ(beat.signal[3], -32768.0 / 32767.0);
    EXPECT_EQ(beat.signal[11024], 0.5);
    EXPECT_EQ(std::count(beat.rise_flags, beat.rise_flags + 11025, 0), 11025);
    // The lowest mel band covers eight bins: a triangle from 0 to 143 Hz with an area of 1.
    const float lowest[] = {0.0f,       0.0041836f, 0.0083671f, 0.0125507f,
                            0.0111427f, 0.0069591f, 0.0027756f, 0.0f};
    for (int bin = 0; bin < 8; ++bin) EXPECT_NEAR(beat.mel_matrix[bin][0], lowest[bin], 1e-6);
    EXPECT_TRUE(feat_mutex_mt != nullptr && feat_cond_mt != nullptr);
    __tavo_deinit(&beat);
    EXPECT_TRUE(feat_mutex_mt == nullptr && feat_cond_mt == nullptr);
}

// The input includes silence, NaN, infinities, and weights that are negative or zero.
TEST(OnsetEnvelope, EqualsTheFramesComputedOneByOne) {
    std::mt19937 random(6);
    const auto below = [&](uint32_t limit) { return static_cast<int32_t>(random() % limit); };
    for (int round = 0; round < 200; ++round) {
        SCOPED_TRACE(round);
        const int32_t size = round % 4 == 0 ? 2 << below(10) : 512;
        const int32_t hop = round % 3 == 0 ? 1 + below(700) : 256;
        working_context work(2 + below(45), size, hop);
        TAVO_BEAT_CTX *beat = &work.beat;
        const size_t n = work.signal.ana.size();
        const std::vector<double> samples = extreme_samples(n, 20 << round % 6, &random);
        std::copy(samples.begin(), samples.end(), beat->signal);
        if (round % 5 == 1) beat->signal[random() % n] = round % 2 == 0 ? NAN : INFINITY;
        if (round % 8 == 2) {  // an infinite weight, and silence in the first half
            beat->mel_matrix[below(256)][below(36)] = INFINITY;
            std::fill_n(beat->signal, n / 2, 0.0);
        }
        for (int32_t i = 0; i < size * 9 && round % 8 == 3; ++i)
            beat->mel_matrix[i / 18][below(36)] = static_cast<float>(below(3) - 1);
        beat->half_frame = beat->band_count = 0;
        _getOnsetEnvelope(beat, size, hop);
        beat->half_frame = size / 2;  // the number of rows that the destructor releases
        EXPECT_TRUE(is_bit_identical(beat->onset_env, envelope(*beat, size, hop)));
        EXPECT_EQ(beat->onset_env[beat->frame_count - 1], 0.0);
    }
}
