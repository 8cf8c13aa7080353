#include "pcm/resample.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "common/alloc.h"
#include "common/worker_group.h"

namespace {

constexpr int64_t kTailBytes = 64;  // zero bytes after the last output

// One conversion of `count` samples at source_rate to `n` samples at ana_rate.
struct conversion {
    int64_t count;
    int64_t n;
    int64_t size;  // size of the output buffer in bytes
    int32_t source_rate;
    int32_t ana_rate;
    float ratio;
};

// Computes the sizes of a conversion. Returns false if a rate is not valid or a size overflows.
bool plan_conversion(int64_t bytes, int32_t source_rate, int32_t ana_rate, conversion *plan) {
    plan->count = std::max<int64_t>(bytes, 0) / kBytesPerSample;
    plan->source_rate = source_rate;
    plan->ana_rate = ana_rate;
    plan->ratio = static_cast<float>(source_rate) / static_cast<float>(ana_rate);
    return scale_size(plan->count, ana_rate, source_rate, &plan->n) &&
           array_bytes(plan->n, sizeof(double), kTailBytes, &plan->size);
}

int32_t run_blocks(const conversion &plan, const int16_t *in, double *out) {
    const int32_t err = worker_lock_create(&ext_mutex_resample, &ext_cond_resample);
    if (err != 0) return err;
    if (!average_on_threads(in, plan.count, plan.ratio, out, plan.n)) {
        std::fill_n(out, plan.n, 0.0);
    }
    worker_lock_release(&ext_mutex_resample, &ext_cond_resample);
    return 0;
}

int32_t run_sinc(const conversion &plan, const int16_t *in, double *out) {
    auto *state = zeroed_items<dorn_resampler_state>(1);
    auto *narrow = zeroed_items<int16_t>(plan.n);
    const bool ready = state != nullptr && narrow != nullptr;
    if (ready) {
        advise_huge_pages(narrow, plan.n * kBytesPerSample);
        if (dorn_resampler_prepare(state, plan.source_rate, plan.ana_rate, 1) == 0) {
            // The interpolator counts its input in 32 bits. Input past that limit (12 hours at 48
            // kHz) is ignored, and the output for it stays 0.
            const auto in_len = static_cast<int32_t>(std::min<int64_t>(plan.count, INT32_MAX));
            convert_frames(state, in, in_len, narrow, plan.n);
        }
        for (int64_t i = 0; i < plan.n; ++i) out[i] = narrow[i];
    }
    free(narrow);
    free(state);
    return ready ? 0 : TAVO_ERR_MEMORY;
}

// True if the output may overwrite the input. The interpolator reads all of its input before the
// output is written. At ratio 4, the four samples of a block occupy as many bytes as their mean.
bool works_in_place(const conversion &plan) {
    const int32_t whole = whole_ratio(plan.ratio);
    return plan.n > 0 && (whole == 0 || whole == kMaxWholeRatio);
}

// Returns a heap block that is large enough for the output, or null if memory runs out. If *owned
// is not null and the conversion works in place, the block is *owned, which may be enlarged and
// moved. Otherwise the block is new and zeroed.
double *allocate_output(const conversion &plan, int16_t **owned) {
    void *memory = nullptr;
    if (*owned != nullptr && works_in_place(plan)) {
        memory = *owned;
        if (plan.size > plan.count * kBytesPerSample) {
            memory = realloc(memory, static_cast<size_t>(plan.size));
        }
        if (memory != nullptr) *owned = static_cast<int16_t *>(memory);
    }
    if (memory == nullptr) memory = calloc(static_cast<size_t>(plan.size), 1);
    advise_huge_pages(memory, plan.size);
    return static_cast<double *>(memory);
}

// Frees the memory past the end of the output.
double *shrink_output(const conversion &plan, double *out) {
    if (plan.size >= plan.count * kBytesPerSample) return out;
    void *smaller = realloc(out, static_cast<size_t>(plan.size));
    return smaller == nullptr ? out : static_cast<double *>(smaller);
}

// Converts `pcm`. `owned` is `pcm` if this function must free or reuse its memory, otherwise null.
int32_t convert(const int16_t *pcm, int16_t *owned, int64_t bytes, int32_t source_rate,
                int32_t ana_rate, int64_t *out_len, double **out) {
    *out_len = 0;
    *out = nullptr;
    conversion plan = {};
    double *samples = nullptr;
    if (plan_conversion(pcm == nullptr ? 0 : bytes, source_rate, ana_rate, &plan)) {
        samples = allocate_output(plan, &owned);
        if (owned != nullptr) pcm = owned;
    }
    int32_t err = TAVO_ERR_MEMORY;
    if (samples != nullptr) {
        err = whole_ratio(plan.ratio) != 0 ? run_blocks(plan, pcm, samples)
                                           : run_sinc(plan, pcm, samples);
    }
    const bool in_place = samples != nullptr && static_cast<void *>(samples) == owned;
    if (!in_place) free(owned);
    if (err != 0) {
        free(samples);
        return err;
    }
    if (in_place) {
        memset(samples + plan.n, 0, kTailBytes);
        samples = shrink_output(plan, samples);
    }
    *out_len = plan.n;
    *out = samples;
    return 0;
}

}  // namespace

int32_t dorn_resampler_run(const int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                           int64_t *out_len, double **out) {
    return convert(pcm, nullptr, bytes, source_rate, ana_rate, out_len, out);
}

int32_t convert_and_free(int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                         int64_t *out_len, double **out) {
    return convert(pcm, pcm, bytes, source_rate, ana_rate, out_len, out);
}
