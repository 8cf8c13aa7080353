#include "pcm/resample_block.h"

#include <algorithm>
#include <cstdlib>

#include "common/alloc.h"
#include "common/lanes.h"
#include "common/worker_group.h"

pthread_mutex_t *ext_mutex_resample = nullptr;
pthread_cond_t *ext_cond_resample = nullptr;

namespace {

constexpr int32_t kParts = 4;
constexpr int32_t kExactFloats = 1 << 24;  // up to here, floats hold whole numbers exactly

// Returns the number of outputs whose blocks have exactly `whole` samples. The positions of later
// outputs are rounded in single precision.
int64_t exact_blocks(int32_t whole) {
    return whole == 3 ? kExactFloats / 3 : kExactFloats;
}

// Returns the first input sample of output `i`, at most `count`. Computed in single precision on
// purpose: the rounding determines the blocks of long signals.
int64_t block_start(float ratio, int64_t i, int64_t count) {
    const float position = ratio * static_cast<float>(i);
    const bool inside = static_cast<double>(position) < static_cast<double>(count);
    return inside ? static_cast<int64_t>(position) : count;
}

double block_mean(const int16_t *in, int64_t first, int64_t end) {
    float sum = 0.0f;
    for (int64_t k = first; k < end; ++k) sum += static_cast<float>(in[k]);
    return static_cast<double>(sum / static_cast<float>(end - first));
}

// Computes outputs `first` to `end` - 1 from blocks of any length. in[0] is sample number `base` of
// the `count` input samples.
void average_blocks(float ratio, const int16_t *in, int64_t base, int64_t count, double *out,
                    int64_t first, int64_t end) {
    for (int64_t i = first; i < end; ++i) {
        const int64_t begin = block_start(ratio, i, count);
        const int64_t next = block_start(ratio, i + 1, count);
        if (begin < next) {
            out[i] = block_mean(in, begin - base, next - base);
        } else {  // rounding left the block empty: use the sample at its start, or the last one
            out[i] = in[std::min(begin, count - 1) - base];
        }
    }
}

// Averages blocks of exactly kWhole samples. Their sums are exact in single precision, so integer
// sums give the same result. If kWhole is 4, `in` and `out` may be the same memory, because each
// step reads its input before it writes.
template <int32_t kWhole>
void average_whole(const int16_t *in, double *out, int64_t first, int64_t end) {
    constexpr int32_t kStep = 64;  // outputs per step
    int16_t block[kStep * kWhole];
    while (first < end) {
        const auto outputs = static_cast<int32_t>(std::min<int64_t>(end - first, kStep));
        memcpy(block, in + first * kWhole, static_cast<size_t>(outputs) * kWhole * sizeof *in);
        for (int32_t i = 0; i < outputs; ++i) {
            int32_t sum = 0;
            for (int32_t k = 0; k < kWhole; ++k) sum += block[i * kWhole + k];
            out[first + i] =
                static_cast<double>(static_cast<float>(sum) / static_cast<float>(kWhole));
        }
        first += outputs;
    }
}

// Averages blocks of four samples and computes four outputs at once.
void average_fours(const int16_t *in, double *out, int64_t first, int64_t end) {
    for (; first + 4 <= end; first += 4) {
        int_quad a;  // two samples in each lane
        int_quad b;
        memcpy(&a, in + first * 4, sizeof a);
        memcpy(&b, in + first * 4 + 8, sizeof b);
        const int_quad pairs_a = ((a << 16) >> 16) + (a >> 16);
        const int_quad pairs_b = ((b << 16) >> 16) + (b >> 16);
        const int_quad sums = __builtin_shufflevector(pairs_a, pairs_b, 0, 2, 4, 6) +
                              __builtin_shufflevector(pairs_a, pairs_b, 1, 3, 5, 7);
        const float_quad means = __builtin_convertvector(sums, float_quad) / 4.0f;
        const double wide[4] = {means[0], means[1], means[2], means[3]};
        memcpy(out + first, wide, sizeof wide);
    }
    average_whole<4>(in, out, first, end);
}

void average_part(void *record) {
    const auto *part = static_cast<RESAMPLE_PART *>(record);
    if (part->in_count < 1) return;
    const int32_t whole = whole_ratio(part->ratio);
    int64_t exact = part->first;  // end of the outputs whose blocks have exactly `whole` samples
    if (whole > 0 && part->first >= 0) {
        exact = std::min({part->end, exact_blocks(whole), part->in_count / whole});
        exact = std::max(exact, part->first);
    }
    if (whole == 1) average_whole<1>(part->in, part->out, part->first, exact);
    if (whole == 2) average_whole<2>(part->in, part->out, part->first, exact);
    if (whole == 3) average_whole<3>(part->in, part->out, part->first, exact);
    if (whole == 4) average_fours(part->in, part->out, part->first, exact);
    average_blocks(part->ratio, part->in, 0, part->in_count, part->out, exact, part->end);
}

// Computes outputs exact_blocks(4) to n - 1 in place at ratio 4. An output may overwrite the
// samples of a later block, so each step copies its samples first.
void average_rounded_in_place(const int16_t *in, int64_t count, double *out, int64_t n) {
    // Outputs per step. In songs of up to 72 days, the position of a step's first output is exact,
    // so a block extends at most one sample into the next step.
    constexpr int64_t kStep = 4096;
    int16_t window[4 * kStep + 1];
    for (int64_t first = exact_blocks(4); first < n; first += kStep) {
        const int64_t begin = 4 * first;
        const int64_t end = std::min(begin + 4 * kStep + 1, count);
        memcpy(window, in + begin, static_cast<size_t>(end - begin) * sizeof *in);
        average_blocks(4.0f, window, begin, count, out, first, std::min(first + kStep, n));
    }
}

}  // namespace

int32_t whole_ratio(float ratio) {
    for (int32_t whole = 1; whole <= kMaxWholeRatio; ++whole) {
        if (ratio == static_cast<float>(whole)) return whole;
    }
    return 0;
}

void resampleMT_thd_cleanup(void *part) {
    const auto *self = static_cast<RESAMPLE_PART *>(part);
    worker_group_done(self->mutex, self->cond, self->done, self->count, self->index);
}

void *_resampleMT(void *part) {
    run_worker(part, average_part, resampleMT_thd_cleanup);
}

bool average_on_threads(const int16_t *in, int64_t count, float ratio, double *out, int64_t n) {
    auto *parts = zeroed_items<RESAMPLE_PART>(kParts);
    auto *done = zeroed_items<int32_t>(kParts);
    const bool ready = parts != nullptr && done != nullptr;
    if (ready) {
        const bool in_place = static_cast<const void *>(in) == out;
        const int64_t on_threads = in_place ? std::min(n, exact_blocks(kMaxWholeRatio)) : n;
        const int64_t length = on_threads / kParts;
        worker_slot slots[kParts] = {};
        for (int32_t i = 0; i < kParts; ++i) {
            RESAMPLE_PART *part = &parts[i];
            part->index = i;
            part->in = in;
            part->out = out;
            part->ratio = ratio;
            part->first = i * length;
            part->end = i == kParts - 1 ? on_threads : (i + 1) * length;
            part->in_count = count;
            part->out_count = n;
            part->done = done;
            part->count = kParts;
            part->mutex = ext_mutex_resample;
            part->cond = ext_cond_resample;
            slots[i] = {part, &part->thread, _resampleMT, average_part};
        }
        worker_group_run(slots, kParts, ext_mutex_resample, ext_cond_resample, done);
        if (on_threads < n) average_rounded_in_place(in, count, out, n);
    }
    free(done);
    free(parts);
    return ready;
}

void resamplePcmMonoMT(const int16_t *in, int64_t count, int32_t source_rate, double *out,
                       int64_t n, int32_t ana_rate) {
    if (source_rate < 1 || ana_rate < 1) return;
    // If the function is called directly, the lock may be missing.
    const bool make_lock = ext_mutex_resample == nullptr;
    if (make_lock && worker_lock_create(&ext_mutex_resample, &ext_cond_resample) != 0) return;
    const float ratio = static_cast<float>(source_rate) / static_cast<float>(ana_rate);
    average_on_threads(in, count, ratio, out, n);
    if (make_lock) worker_lock_release(&ext_mutex_resample, &ext_cond_resample);
}
