// The sample-rate converter.
//
// Input: rates, then samples. Guaranteed by the callers: rates of a stream (1 to 192,000 Hz; the
// sources refuse others), an analysis rate above 0, bytes that lie there.
#include <cmath>

#include "fuzz/fuzz.h"
#include "pcm/resample.h"

namespace {

constexpr int32_t kAnalysisRate = 11025;
constexpr int32_t kMostOutput = 1 << 16;  // samples
constexpr int32_t kRates[16] = {8000,  11025, 11024, 11026, 12000, 16000, 22050, 24000,
                                32000, 33075, 44100, 44099, 48000, 88200, 96000, 192000};

int32_t take_rate(fuzz::input *in) {
    const uint8_t which = in->take<uint8_t>();
    return which < 224 ? kRates[which % 16] : in->take_from(1, 192'000);
}

// The whole conversion, as a job runs it.
void convert_song(fuzz::input *in, const int16_t *pcm, int64_t bytes) {
    const int32_t source = take_rate(in);
    const int32_t target = (in->take<uint8_t>() & 3) != 0 ? kAnalysisRate : take_rate(in);
    const int64_t expected = bytes / 2 * target / source;
    if (expected > kMostOutput) return;
    int64_t length = -1;
    double *out = nullptr;
    const int32_t code = dorn_resampler_run(pcm, bytes, source, target, &length, &out);
    fuzz::must(code == 0 && out != nullptr && length == expected, "a conversion has its length");
    for (int64_t i = 0; i < length; ++i) {
        fuzz::must(std::fabs(out[i]) <= 32'768.0, "a converted sample has 16 bits");
    }
    for (int64_t i = 0; i < 8; ++i) fuzz::must(out[length + i] == 0.0, "64 cleared bytes follow");
    free(out);
}

// The interpolator alone, with channels and lengths that need not fit each other.
void interpolate(fuzz::input *in, const int16_t *pcm, int32_t count) {
    auto *state = static_cast<dorn_resampler_state *>(calloc(1, sizeof(dorn_resampler_state)));
    const int32_t source = take_rate(in);
    const int32_t target = take_rate(in);
    const int32_t channels = in->take_from(1, 9);
    const int64_t most = (static_cast<int64_t>(count) * target / source + 64) * channels;
    auto *out = static_cast<int16_t *>(calloc(static_cast<size_t>(most), sizeof(int16_t)));
    fuzz::must(dorn_resampler_prepare(state, source, target, channels) == 0, "rates are prepared");
    const int32_t written = most > kMostOutput ? 0 : dorn_resampler_convert(state, pcm, count, out);
    // -1: at odd ratios a single-precision place may round to a phase beyond the table.
    fuzz::must(written == -1 || (written >= 0 && written <= most && written % channels == 0),
               "a conversion writes whole frames");
    free(out);
    free(state);
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    constexpr size_t kHead = 24;  // bytes of rates and choices, at most
    if (size < kHead) return 0;
    fuzz::input in = {data, kHead};
    const uint8_t what = in.take<uint8_t>();
    const size_t bytes = size - kHead;
    // A copy of its own, so that a read behind it is seen; its bytes may be odd.
    auto *pcm = static_cast<int16_t *>(malloc(bytes + 1));
    memcpy(pcm, data + kHead, bytes);
    if (what % 4 != 0) {
        convert_song(&in, pcm, static_cast<int64_t>(bytes));
    } else {
        interpolate(&in, pcm, static_cast<int32_t>(bytes / 2));
    }
    free(pcm);
    return 0;
}
