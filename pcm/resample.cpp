#include "pcm/resample.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "common/alloc.h"
#include "common/worker_group.h"
#include "pcm/resample_engines.h"
#include "pcm/song.h"

pthread_mutex_t *ext_mutex_resample = nullptr;
pthread_cond_t *ext_cond_resample = nullptr;

namespace {

constexpr int64_t kBytesBehind = 64;  // cleared, behind the last output

// One conversion: count samples at a rate become n at another.
struct conversion {
    int64_t count;
    int64_t n;
    int64_t size;  // bytes of the output buffer
    int32_t source_rate;
    int32_t ana_rate;
    float ratio;
};

// False for sizes or a source rate that give no length.
bool plan_conversion(int64_t bytes, int32_t source_rate, int32_t ana_rate, conversion *plan) {
    plan->count = std::max<int64_t>(bytes, 0) / kBytesPerSample;
    plan->source_rate = source_rate;
    plan->ana_rate = ana_rate;
    plan->ratio = static_cast<float>(source_rate) / static_cast<float>(ana_rate);
    return scale_size(plan->count, ana_rate, source_rate, &plan->n) &&
           array_bytes(plan->n, sizeof(double), kBytesBehind, &plan->size);
}

int32_t run_blocks(const conversion &plan, const int16_t *in, double *out) {
    const int32_t err = worker_lock_create(&ext_mutex_resample, &ext_cond_resample);
    if (err != 0) return err;
    const bool in_place = static_cast<const void *>(in) == out;
    const int64_t n = in_place ? std::min(plan.n, exact_blocks(kMaxWholeRatio)) : plan.n;
    if (!average_on_threads(in, plan.count, plan.ratio, out, n)) {
        std::fill_n(out, plan.n, 0.0);
    } else if (n < plan.n) {
        average_behind_exact(in, plan.count, out, plan.n);
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
            // The converter counts its input in 32 bits. What lies beyond them, 12 hours at 48 kHz,
            // stays 0.
            const auto in_len = static_cast<int32_t>(std::min<int64_t>(plan.count, INT32_MAX));
            convert_frames(state, in, in_len, narrow, plan.n);
        }
        for (int64_t i = 0; i < plan.n; ++i) out[i] = narrow[i];
    }
    free(narrow);
    free(state);
    return ready ? 0 : TAVO_ERR_MEMORY;
}

// out may be the memory of in where works_in_place says so.
int32_t run_conversion(const conversion &plan, const int16_t *in, double *out) {
    return whole_ratio(plan.ratio) != 0 ? run_blocks(plan, in, out) : run_sinc(plan, in, out);
}

// Whether out may be the memory of in: the interpolator has read all of its input before it writes
// there, and blocks of four samples take the room of one output.
bool works_in_place(const conversion &plan) {
    const int32_t whole = whole_ratio(plan.ratio);
    return whole == 0 || whole == kMaxWholeRatio;
}

// Converts pcm in its own memory, which becomes the output's. Returns null, with pcm as it was,
// when the memory cannot grow. *err: the code of the conversion.
double *convert_in_place(const conversion &plan, int16_t *pcm, int32_t *err) {
    const int64_t bytes = plan.count * kBytesPerSample;
    void *memory = pcm;
    if (plan.size > bytes) memory = realloc(memory, static_cast<size_t>(plan.size));
    if (memory == nullptr) return nullptr;
    advise_huge_pages(memory, plan.size);
    auto *out = static_cast<double *>(memory);
    *err = run_conversion(plan, static_cast<const int16_t *>(memory), out);
    memset(out + plan.n, 0, kBytesBehind);
    if (plan.size >= bytes) return out;
    memory = realloc(out, static_cast<size_t>(plan.size));
    return memory == nullptr ? out : static_cast<double *>(memory);
}

}  // namespace

int32_t dorn_resampler_run(const int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                           int64_t *out_len, double **out) {
    *out_len = 0;
    *out = nullptr;
    conversion plan = {};
    if (pcm == nullptr) bytes = 0;
    if (!plan_conversion(bytes, source_rate, ana_rate, &plan)) return TAVO_ERR_MEMORY;
    auto *samples = static_cast<double *>(calloc(static_cast<size_t>(plan.size), 1));
    if (samples == nullptr) return TAVO_ERR_MEMORY;
    advise_huge_pages(samples, plan.size);

    const int32_t err = run_conversion(plan, pcm, samples);
    if (err != 0) {
        free(samples);
        return err;
    }
    *out_len = plan.n;
    *out = samples;
    return 0;
}

int32_t convert_song(TAVO_CTX *ctx, int64_t off) {
    int16_t *pcm = ctx->pcm;
    const int64_t bytes = pcm == nullptr ? 0 : std::max<int64_t>(ctx->pcm_bytes - off, 0);
    const int32_t rate = ctx->fmt.sample_rate;
    ctx->pcm = nullptr;
    ctx->ana = nullptr;
    ctx->ana_len = 0;
    // To the front of the memory, where samples can be read whatever the offset.
    if (off > 0 && bytes > 0) {
        memmove(pcm, reinterpret_cast<const uint8_t *>(pcm) + off, static_cast<size_t>(bytes));
    }

    int32_t err = 0;
    conversion plan = {};
    if (pcm != nullptr && plan_conversion(bytes, rate, ctx->ana_rate, &plan) && plan.n > 0 &&
        works_in_place(plan)) {
        ctx->ana = convert_in_place(plan, pcm, &err);
    }
    if (ctx->ana == nullptr) {
        err = dorn_resampler_run(pcm, bytes, rate, ctx->ana_rate, &ctx->ana_len, &ctx->ana);
        free(pcm);
    } else if (err != 0) {
        free(ctx->ana);
        ctx->ana = nullptr;
    } else {
        ctx->ana_len = plan.n;
    }
    return err;
}
