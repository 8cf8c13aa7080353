#include "beat/power_rise.h"
#include "tests/beat/beat_fixture.h"

namespace {

constexpr size_t kBlock = 5512;

// Returns the level of each sample in dB, or -150 if it has none. The last sample of each block has
// the block's largest level, which is also stored in *block.
std::vector<double> plain_levels(const std::vector<double> &signal, std::vector<double> *block) {
    std::vector<double> db(signal.size(), -150.0);
    block->assign(signal.size() / kBlock + 1, -150.0);
    int32_t decayed = 0;
    double loudest = -150.0;
    for (size_t i = 5; i + 5 <= signal.size(); ++i) {
        double sum = 0.0;
        for (size_t k = i - 5; k < i + 5; ++k) sum += signal[k] * signal[k];
        const double mean = sum / 10.0 * 32767.0;
        const int32_t value = mean > 0.0 ? static_cast<int32_t>(std::min(mean, 32767.0)) : 0;
        const int32_t level = std::max(value, decayed);
        decayed = level - level / 1000;
        db[i] = 20.0 * std::log10(std::max(level, 1000) / 32767.0);
        loudest = std::max(loudest, db[i]);
        if (i % kBlock != 0) continue;
        db[i] = (*block)[i / kBlock] = loudest;
        loudest = -150.0;
    }
    return db;
}

std::vector<int32_t> plain_rises(const std::vector<double> &signal) {
    std::vector<int32_t> flags(signal.size());
    std::vector<double> block;
    const std::vector<double> db = plain_levels(signal, &block);
    const size_t count = block.size();
    if (count < 3) return flags;
    std::vector<double> sorted = block;
    std::sort(sorted.begin(), sorted.end());
    const double p60 = sorted[static_cast<size_t>(static_cast<double>(count) * 0.6)];
    const double p40 = sorted[static_cast<size_t>(static_cast<double>(count) * 0.4)];
    block.resize(count + 8, -150.0);
    for (size_t b = 2; b < count; ++b) {
        double mean = 0.0;
        for (size_t k = 0; k < 8; ++k) mean += block[b + k];
        mean *= 0.125;
        const double limit = std::min((p60 + p40) * 0.5, mean - 4.0);
        if (!(block[b - 2] < limit && block[b - 1] < limit)) continue;
        if (!(mean >= p60 - 3.0 && block[b] > p60 - 3.0)) continue;
        const double target = (mean + 3.0 * p60) * 0.5;
        size_t i = kBlock * (b - 1);
        while (i <= kBlock * b && !(db[i] >= target)) ++i;
        if (i > kBlock * b) continue;
        flags[i] = 1;
        b += 6;  // in addition to the loop's ++b
    }
    return flags;
}

// Returns `n` samples of noise whose loudness changes about every two seconds.
std::vector<double> changing_noise(size_t n, std::mt19937 *random) {
    std::vector<double> signal(n);
    double loudness = 0.1;
    for (double &x : signal) {
        if ((*random)() % 25000 == 0) loudness = pow(10.0, -1.5 * fabs(uniform(random)));
        x = loudness * uniform(random);
    }
    return signal;
}

}  // namespace

// The signals are noise of changing loudness or have extreme values, NaN or infinities. Half of
// them end near a block boundary. In some, the means are whole numbers, so that rounding matters.
TEST(PowerRise, EqualsThePlainSearch) {
    std::mt19937 random(7);
    int found = 0;
    for (int round = 0; round < 80; ++round) {
        const size_t n = (random() % 50) * kBlock + random() % (round % 2 == 0 ? 12 : kBlock);
        std::vector<double> signal =
            round % 4 == 0 ? extreme_samples(n, 20, &random) : changing_noise(n, &random);
        for (double &x : signal)
            if (round % 4 == 1) x = sqrt(floor(3276.7 * fabs(x)) * 10.0 / 32767.0);
        if (round % 8 == 5)  // a step from silence to full scale
            std::fill(std::fill_n(signal.begin(), n / 3, 0.0), signal.end(), -32768.0 / 32767.0);
        if (round % 8 == 3 && n > 0) signal[0] = 4.0;  // affects only the first sum
        if (round % 6 == 0 && n > 0) signal[random() % n] = round % 4 == 0 ? NAN : INFINITY;
        std::vector<int32_t> flags(n);
        found += detectPowerVariation(signal.data(), flags.data(), static_cast<int64_t>(n));
        ASSERT_TRUE(flags == plain_rises(signal)) << round;
    }
    EXPECT_GT(found, 15);
}
