#include "tests/desktop/codec_test.h"
#include "tests/support/song.h"

namespace codec_test {
namespace {

constexpr size_t kFormat = 12;  // offsets in a plain header: of the format
constexpr size_t kData = 36;    // of the data

samples numbers(size_t count) {
    samples pcm(count);
    for (size_t i = 0; i < count; ++i) pcm[i] = static_cast<int16_t>(i * 7919);
    return pcm;
}

// The file with another number of so many bytes at an offset.
bytes patched(bytes file, size_t at, uint64_t value, size_t size = 2) {
    for (size_t i = 0; i < size; ++i) file[at + i] = static_cast<uint8_t>(value >> 8 * i);
    return file;
}

TEST(Wav, ReadsEveryShapeOfHeader) {
    using support::wav_data_size;
    using support::wav_spec;
    const samples pcm = numbers(60000);
    const auto wav = [&](auto change) {
        wav_spec plan;
        change(plan);
        return support::wav_bytes(pcm, plan);
    };
    const bytes plain = support::wav_bytes(pcm, {});
    const struct {
        const char *name;
        bytes contents;
        size_t channels, frames;
    } shapes[] = {
        {"plain", plain, 2, 30000},
        {"mono", wav([](wav_spec &s) { s.channels = 1; }), 1, 60000},
        {"six", wav([](wav_spec &s) { s.channels = 6; }), 6, 10000},
        {"extensible", wav([](wav_spec &s) { s.extensible = true; }), 2, 30000},
        {"odd", wav([](wav_spec &s) { s.other_chunks = true; }), 2, 30000},
        {"zero", wav([](wav_spec &s) { s.data_size = wav_data_size::zero; }), 2, 30000},
        {"ones", wav([](wav_spec &s) { s.data_size = wav_data_size::all_ones; }), 2, 30000},
        {"large", wav([](wav_spec &s) { s.data_size = wav_data_size::too_large; }), 2, 30000},
        {"cut", wav([](wav_spec &s) { s.cut_bytes = 5; }), 2, 29998},
    };
    for (const auto &each : shapes) {
        SCOPED_TRACE(each.name);
        const std::string path = save("shape.wav", each.contents);
        const opened file(path);
        ASSERT_NE(file.source, nullptr);
        EXPECT_EQ(static_cast<size_t>(file.format.channels), each.channels);
        EXPECT_EQ(static_cast<size_t>(file.format.duration * 44100 / kUnits), each.frames);
        samples first(each.frames);
        for (size_t i = 0; i < each.frames; ++i) first[i] = pcm[i * each.channels];
        expect_same(read_all(path), first);
    }
}

// Where the header says anything, an unusable format is told from unusable data.
TEST(Wav, RefusesWhatTheSourceCannotUse) {
    const bytes file = support::wav_bytes(numbers(2000), {});
    const auto coded = [&](uint64_t tag, uint64_t bits) {
        return patched(patched(file, kFormat + 8, tag), kFormat + 22, bits);
    };
    const struct {
        bytes contents;
        int32_t error;
    } refusals[] = {
        {coded(1, 8), -3},
        {coded(1, 24), -3},
        {coded(3, 32), -3},    // float
        {coded(7, 8), -3},     // mu-law
        {coded(300, 16), -3},  // the interface's own code for linear PCM
        {part(file, 0, kData), -7},
        {patched(file, kFormat + 10, 0), -3},     // no channels
        {patched(file, kFormat + 12, 0, 4), -3},  // no rate
        {part(file, 0, kFormat + 20), -3},
    };
    for (const auto &each : refusals) {
        EXPECT_EQ(opened(save("refused.wav", each.contents)).error, each.error) << &each - refusals;
    }
}

TEST(Wav, SeeksToWholeSeconds) {
    const samples pcm = numbers(22051);  // one sample beyond 2 s
    support::wav_spec plan;
    plan.rate = 11025;
    plan.channels = 1;
    const opened file(save("seek.wav", support::wav_bytes(pcm, plan)));
    ASSERT_NE(file.source, nullptr);
    const struct {
        int64_t units, sample;
    } landings[] = {{19'999'999, 11025}, {0, 0},          {20'000'000, 22050}, {30'000'000, 22051},
                    {INT64_MAX, 22051},  {-50'000'000, 0}};
    for (const auto &each : landings) {
        SCOPED_TRACE(each.units);
        int64_t reached = -1;
        ASSERT_EQ(mtsrc_seekstream(file.source, each.units, &reached), 0);
        EXPECT_EQ(reached * 11025 / kUnits, each.sample);
        expect_same(read(file.source, SIZE_MAX), {pcm.begin() + each.sample, pcm.end()});
    }
}

}  // namespace
}  // namespace codec_test
