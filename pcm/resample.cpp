#include "pcm/resample.h"

#include <algorithm>
#include <cstdlib>

#include "common/alloc.h"
#include "common/worker_group.h"
#include "core/tavo.h"
#include "pcm/resample_sinc.h"

pthread_mutex_t *ext_mutex_resample = nullptr;
pthread_cond_t *ext_cond_resample = nullptr;

namespace {

constexpr int64_t kBytesBehind = 64;  // cleared, behind the last sample

bool is_block_ratio(float ratio) {
    return ratio == 4.0F || ratio == 3.0F || ratio == 1.0F || ratio == 2.0F;
}

int32_t run_blocks(const int16_t *pcm, int64_t count, int32_t source_rate, int32_t ana_rate,
                   double *out, int64_t n) {
    const int32_t err = worker_lock_create(&ext_mutex_resample, &ext_cond_resample);
    if (err != 0) return err;
    resamplePcmMonoMT(pcm, count, source_rate, out, n, ana_rate);
    worker_lock_release(&ext_mutex_resample, &ext_cond_resample);
    return 0;
}

int32_t run_sinc(const int16_t *pcm, int64_t count, int32_t source_rate, int32_t ana_rate,
                 double *out, int64_t n) {
    auto *state = static_cast<dorn_resampler_state *>(calloc(1, sizeof(dorn_resampler_state)));
    // One more than n: an empty request may be answered by null.
    auto *narrow = static_cast<int16_t *>(calloc(static_cast<size_t>(n) + 1, sizeof(int16_t)));
    const bool ready = state != nullptr && narrow != nullptr;
    if (ready && dorn_resampler_prepare(state, source_rate, ana_rate, 1) == 0) {
        // The converter counts its input in 32 bits: what lies beyond (12 hours at 48 kHz) stays 0.
        const auto in_len = static_cast<int32_t>(std::min<int64_t>(count, INT32_MAX));
        convert_frames(state, pcm, in_len, narrow, n);
    }
    if (ready) {
        for (int64_t i = 0; i < n; ++i) out[i] = narrow[i];
    }
    free(narrow);
    free(state);
    return ready ? 0 : TAVO_ERR_MEMORY;
}

}  // namespace

int32_t dorn_resampler_run(const int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                           int64_t *out_len, double **out) {
    *out_len = 0;
    *out = nullptr;
    const int64_t count = pcm == nullptr ? 0 : std::max<int64_t>(bytes, 0) / kBytesPerSample;
    int64_t n = 0;
    int64_t size = 0;
    if (!scale_size(count, ana_rate, source_rate, &n)) return TAVO_ERR_MEMORY;
    if (!array_bytes(n, sizeof(double), kBytesBehind, &size)) return TAVO_ERR_MEMORY;
    auto *samples = static_cast<double *>(calloc(static_cast<size_t>(size), 1));
    if (samples == nullptr) return TAVO_ERR_MEMORY;

    const float ratio = static_cast<float>(source_rate) / static_cast<float>(ana_rate);
    const int32_t err = is_block_ratio(ratio)
                            ? run_blocks(pcm, count, source_rate, ana_rate, samples, n)
                            : run_sinc(pcm, count, source_rate, ana_rate, samples, n);
    if (err != 0) {
        free(samples);
        return err;
    }
    *out_len = n;
    *out = samples;
    return 0;
}
