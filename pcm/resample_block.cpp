#include <cstdlib>

#include "common/worker_group.h"
#include "pcm/resample.h"

namespace {

constexpr int32_t kParts = 4;

// First input sample of output i, at most count. Single precision on purpose: the blocks of long
// signals follow its rounding.
int64_t block_start(float ratio, int64_t i, int64_t count) {
    const float place = ratio * static_cast<float>(i);
    const bool inside = static_cast<double>(place) < static_cast<double>(count);
    return inside ? static_cast<int64_t>(place) : count;
}

double block_mean(const int16_t *in, int64_t first, int64_t end) {
    float sum = 0.0F;
    for (int64_t k = first; k < end; ++k) sum += static_cast<float>(in[k]);
    return static_cast<double>(sum / static_cast<float>(end - first));
}

void average_part(void *record) {
    const auto *part = static_cast<RESAMPLE_PART *>(record);
    if (part->in_count < 1) return;
    for (int64_t i = part->first; i < part->end; ++i) {
        const int64_t first = block_start(part->ratio, i, part->in_count);
        const int64_t end = block_start(part->ratio, i + 1, part->in_count);
        if (first < end) {
            part->out[i] = block_mean(part->in, first, end);
        } else {  // rounding left no block: the sample there, or the last one
            part->out[i] = part->in[first < part->in_count ? first : part->in_count - 1];
        }
    }
}

}  // namespace

void resampleMT_thd_cleanup(void *part) {
    const auto *self = static_cast<RESAMPLE_PART *>(part);
    worker_group_done(self->mutex, self->cond, self->done, self->count, self->index);
}

void *_resampleMT(void *part) {
    run_worker(part, average_part, resampleMT_thd_cleanup);
}

void resamplePcmMonoMT(const int16_t *in, int64_t count, int32_t source_rate, double *out,
                       int64_t n, int32_t ana_rate) {
    if (source_rate < 1 || ana_rate < 1) return;
    // A direct caller may not have made the lock that dorn_resampler_run makes.
    const bool make_lock = ext_mutex_resample == nullptr;
    if (make_lock && worker_lock_create(&ext_mutex_resample, &ext_cond_resample) != 0) return;

    auto *parts = static_cast<RESAMPLE_PART *>(calloc(kParts, sizeof(RESAMPLE_PART)));
    auto *done = static_cast<int32_t *>(calloc(kParts, sizeof(int32_t)));
    if (parts != nullptr && done != nullptr) {
        worker_slot slots[kParts] = {};
        const int64_t share = n / kParts;
        for (int32_t i = 0; i < kParts; ++i) {
            RESAMPLE_PART *part = &parts[i];
            part->index = i;
            part->in = in;
            part->out = out;
            part->ratio = static_cast<float>(source_rate) / static_cast<float>(ana_rate);
            part->first = i * share;
            part->end = i == kParts - 1 ? n : (i + 1) * share;
            part->in_count = count;
            part->out_count = n;
            part->done = done;
            part->count = kParts;
            part->mutex = ext_mutex_resample;
            part->cond = ext_cond_resample;
            slots[i] = {part, &part->thread, _resampleMT, average_part};
        }
        worker_group_run(slots, kParts, ext_mutex_resample, ext_cond_resample, done);
    }
    free(done);
    free(parts);
    if (make_lock) worker_lock_release(&ext_mutex_resample, &ext_cond_resample);
}
