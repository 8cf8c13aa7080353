// The fast forms of the analysis have the bits of the plain ones, on whatever samples reach them.
#include <gtest/gtest.h>

#include <algorithm>
#include <limits>

#include "beat/frame_pair.h"
#include "beat/onset_envelope.h"
#include "beat/power_rise.h"
#include "dsp/matrix.h"
#include "tests/beat/beat_fixture.h"

namespace {

constexpr int32_t kBlock = 5512;  // samples

using random_source = std::mt19937;

double uniform(random_source *random) {
    return static_cast<double>((*random)()) / 2147483648.0 - 1.0;
}

// Between -1 and 1, now and then of any size up to 2^highest, nothing at all, or tiny.
std::vector<double> wild_samples(size_t n, int highest, random_source *random) {
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

struct transform {
    TAVO_FFT_CTX fft = {};
    std::vector<double> window = std::vector<double>(512);
    std::vector<float> weights;
    std::vector<float *> rows;

    explicit transform(size_t bands) : weights(256 * bands) {
        tavo_fft_init(512, &fft);
        for (size_t i = 0; i < 512; ++i) {
            window[i] = 0.5 * (1.0 - cos(6.283185307179586 * static_cast<double>(i) / 511));
        }
        for (size_t bin = 0; bin < 256; ++bin) rows.push_back(weights.data() + bin * bands);
    }
    transform(const transform &) = delete;
    ~transform() { tavo_fft_deinit(&fft); }

    // One frame by itself.
    std::vector<double> plain_bands(const double *samples, size_t bands) const {
        std::vector<double> re(512), im(512), row(bands);
        for (size_t i = 0; i < 512; ++i) re[i] = samples[i] * window[i];
        tavo_fft_proc(re.data(), im.data(), 512, &fft);
        std::vector<float> power(256);
        for (size_t j = 0; j < 256; ++j) {
            power[j] = static_cast<float>(re[j] * re[j] + im[j] * im[j]);
        }
        const float *spectrum = power.data();
        double *out = row.data();
        MultiplyMtxs(1, static_cast<int32_t>(bands), 256, &spectrum, rows.data(), &out);
        return row;
    }
};

bool same_bits(const std::vector<double> &a, const std::vector<double> &b) {
    return a.size() == b.size() && memcmp(a.data(), b.data(), a.size() * sizeof(double)) == 0;
}

}  // namespace

TEST(FramePair, HasTheBitsOfEachFrameAlone) {
    random_source random(5);
    for (const size_t bands : {size_t{36}, size_t{3}}) {
        transform of(bands);
        if (bands == 36) fft2melmtx(11025, 512, 5512, 36, of.rows.data());
        if (bands == 3) {  // no bands at all: zeros between the weights, and some below 0
            for (float &w : of.weights) {
                w = random() % 4 == 0 ? 0.0f : static_cast<float>(uniform(&random));
            }
        }
        const auto count = static_cast<int32_t>(bands);
        pair_tables *tables = make_pair_tables(of.window.data(), &of.fft, of.rows.data(), count);
        ASSERT_NE(tables, nullptr);
        for (int round = 0; round < 3000; ++round) {
            const std::vector<double> samples = wild_samples(900, 50, &random);
            const size_t hop = random() % 2 == 0 ? 256 : random() % 389;
            std::vector<double> first(bands), second(bands);
            const double *at = samples.data();
            ASSERT_TRUE(take_pair(tables, at, at + hop, first.data(), second.data()));
            ASSERT_TRUE(same_bits(first, of.plain_bands(at, bands))) << round;
            ASSERT_TRUE(same_bits(second, of.plain_bands(at + hop, bands))) << round;
        }
        release_pair_tables(tables);
    }
}

// Products that the fast form leaves out matter only for values that are not finite: it hands those
// back, wherever they lie or arise.
TEST(FramePair, RefusesWhatIsNotFinite) {
    transform of(36);
    fft2melmtx(11025, 512, 5512, 36, of.rows.data());
    pair_tables *tables = make_pair_tables(of.window.data(), &of.fft, of.rows.data(), 36);
    const double infinity = std::numeric_limits<double>::infinity();
    std::vector<double> bands(72);
    const auto accepted = [&](const std::vector<double> &samples) {
        return take_pair(tables, samples.data(), samples.data() + 256, bands.data(),
                         bands.data() + 36);
    };
    std::vector<double> samples(768, 1.0);
    EXPECT_TRUE(accepted(samples));
    for (const double odd : {infinity, -infinity, double{NAN}, 1e308, 1e30}) {
        for (size_t i = 1; i + 1 < samples.size(); i += 5) {  // the window's ends are 0
            samples[i] = odd;
            EXPECT_FALSE(accepted(samples)) << odd << " at " << i;
            samples[i] = 1.0;
        }
    }
    release_pair_tables(tables);

    of.rows[7][3] = static_cast<float>(infinity);
    EXPECT_EQ(make_pair_tables(of.window.data(), &of.fft, of.rows.data(), 36), nullptr);
}

// Records as any caller fills them, one frame at a time, against the whole envelope.
TEST(OnsetEnvelope, HasTheBitsOfItsWorkersFrameByFrame) {
    random_source random(6);
    const double infinity = std::numeric_limits<double>::infinity();
    for (const int64_t frames : {2, 3, 4, 7, 8, 9, 42, 43}) {
        working_context work(frames);
        TAVO_BEAT_CTX *beat = &work.beat;
        const size_t n = work.of.ana.size();
        const std::vector<double> samples = wild_samples(n, 30, &random);
        std::copy(samples.begin(), samples.end(), beat->signal);
        if (frames > 7) beat->signal[5 * 256] = frames % 2 == 0 ? infinity : NAN;

        transform of(36);
        std::vector<std::vector<float>> spectrum(static_cast<size_t>(frames));
        std::vector<std::vector<double>> mel(static_cast<size_t>(frames));
        std::vector<float *> spectrum_rows;
        std::vector<double *> mel_rows;
        for (auto &row : spectrum) spectrum_rows.push_back((row.resize(256), row.data()));
        for (auto &row : mel) mel_rows.push_back((row.resize(36), row.data()));
        int32_t done[4] = {1, 0, 1, 1};
        TAVO_ONSET_WORKER worker = {};
        worker.id = 1;
        worker.signal = beat->signal;
        worker.last = frames - 1;
        worker.spectrum = spectrum_rows.data();
        worker.frame_size = 512;
        worker.hop_size = 256;
        worker.fft = &of.fft;
        worker.done_flags = done;
        worker.thread_count = 4;
        worker.mutex = feat_mutex_mt;
        worker.cond = feat_cond_mt;
        worker.band_count = 36;
        worker.mel_matrix = beat->mel_matrix;
        worker.mel = mel_rows.data();
        worker.window = of.window.data();
        ASSERT_EQ(pthread_create(&worker.thread, nullptr, _tavo_proc_onsetenv, &worker), 0);
        pthread_join(worker.thread, nullptr);
        EXPECT_EQ(done[1], 1);

        std::vector<double> change;
        double sum = 0.0;
        for (size_t k = 0; k + 1 < mel.size(); ++k) {
            double flux = 0.0;
            for (size_t b = 0; b < 36; ++b) {
                const double step = fabs(mel[k + 1][b] - mel[k][b]);
                if (!std::isnan(step)) flux += step;
            }
            change.push_back(flux / 36);
            sum += change.back();
        }
        const double mean = sum / static_cast<double>(change.size());
        double squares = 0.0;
        for (const double c : change) squares += (c - mean) * (c - mean);
        const double deviation = sqrt(squares / static_cast<double>(change.size()));

        _getOnsetEnvelope(beat, 512, 256);
        for (size_t k = 0; k < change.size(); ++k) {
            const double expected = change[k] / deviation;
            if (std::isnan(expected)) {
                ASSERT_TRUE(std::isnan(beat->onset_env[k])) << frames << " " << k;
            } else {
                ASSERT_EQ(beat->onset_env[k], expected) << frames << " " << k;
            }
        }
    }
}

namespace {

// The rises of signal[n] and, in *levels, those of its blocks, sample by sample.
std::vector<int64_t> plain_rises(const std::vector<double> &signal, std::vector<double> *levels) {
    const auto n = static_cast<int64_t>(signal.size());
    const auto at = [&](int64_t i) { return signal[static_cast<size_t>(i)]; };
    std::vector<double> db(signal.size() + kBlock, 20.0 * log10(1000 / 32767.0));
    std::vector<double> block(signal.size() / kBlock + 9, -150.0);
    double largest = -150.0;
    int32_t held = 0;
    for (int64_t i = 5; i <= n - 5; ++i) {
        double power = at(i - 5) * at(i - 5);
        for (int64_t k = i - 4; k <= i + 4; ++k) power += at(k) * at(k);
        const double mean = power / 10.0 * 32767.0;
        int32_t level = mean > 0.0 ? static_cast<int32_t>(std::min(mean, 32767.0)) : 0;
        level = std::max(level, held);
        held = level - level / 1000;
        double &here = db[static_cast<size_t>(i)];
        here = 20.0 * log10(std::max(level, 1000) / 32767.0);
        largest = std::max(largest, here);
        if (i % kBlock == 0) block[static_cast<size_t>(i / kBlock)] = here = largest;
        if (i % kBlock == 0) largest = -150.0;
    }

    const size_t blocks = signal.size() / kBlock + 1;
    std::vector<int64_t> rises;
    *levels = {block.begin(), block.begin() + static_cast<long>(blocks)};
    if (blocks < 3) return rises;
    std::vector<double> sorted = *levels;
    std::sort(sorted.begin(), sorted.end());
    const double p60 = sorted[static_cast<size_t>(static_cast<double>(blocks) * 0.6)];
    const double p40 = sorted[static_cast<size_t>(static_cast<double>(blocks) * 0.4)];
    for (size_t b = 2; b < blocks; ++b) {
        double mean8 = 0.0;
        for (size_t k = 0; k < 8; ++k) mean8 += block[b + k];
        mean8 *= 0.125;
        const double limit = std::min((p60 + p40) * 0.5, mean8 - 4.0);
        if (!(block[b - 2] < limit && block[b - 1] < limit)) continue;
        if (!(mean8 >= p60 - 3.0 && block[b] > p60 - 3.0)) continue;
        const auto begin = db.begin() + static_cast<long>(b - 1) * kBlock;
        const double target = (mean8 + 3.0 * p60) * 0.5;
        const auto found =
            std::find_if(begin, begin + kBlock + 1, [=](double level) { return level >= target; });
        if (found == begin + kBlock + 1) continue;
        rises.push_back(found - db.begin());
        b += 6;
    }
    return rises;
}

}  // namespace

// Loud and quiet by turns, at all lengths around a block's: noise, wild values, and samples whose
// tens measure whole levels, so that a rounding more or less decides.
TEST(PowerRise, HasTheBitsOfTheLevelsOneByOne) {
    random_source random(7);
    size_t found = 0;
    for (int round = 0; round < 80; ++round) {
        const size_t n = (random() % 50) * kBlock + random() % (round % 2 == 0 ? 12 : kBlock);
        std::vector<double> signal = round % 4 == 0 ? wild_samples(n, 20, &random)
                                                    : noise(n, 1.0, static_cast<uint32_t>(round));
        double loudness = 0.1;
        for (size_t i = 0; i < n; ++i) {
            if (random() % 25000 == 0) loudness = pow(10.0, -1.5 * fabs(uniform(&random)));
            signal[i] *= loudness;
            if (round % 4 == 1) signal[i] = sqrt(floor(3276.7 * fabs(signal[i])) * 10.0 / 32767.0);
        }
        if (round % 6 == 0 && n > 0) signal[random() % n] = round % 4 == 0 ? NAN : INFINITY;

        std::vector<double> levels;
        const std::vector<int64_t> expected = plain_rises(signal, &levels);
        std::vector<double> measured(levels.size());
        measure_block_levels({signal.data(), 1.0}, static_cast<int64_t>(n), measured.data());
        ASSERT_TRUE(same_bits(measured, levels)) << round;
        std::vector<int32_t> flags(n);
        EXPECT_EQ(detectPowerVariation(signal.data(), flags.data(), static_cast<int64_t>(n)),
                  static_cast<int32_t>(expected.size()));
        std::vector<int64_t> rises;
        for (size_t i = 0; i < n; ++i) {
            if (flags[i] != 0) rises.push_back(static_cast<int64_t>(i));
        }
        ASSERT_EQ(rises, expected) << round;
        found += rises.size();
    }
    EXPECT_GT(found, 15u);
}
