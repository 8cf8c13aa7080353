#include "beat/onset_envelope.h"

#include <algorithm>
#include <cmath>

#include "common/lanes.h"
#include "dsp/stats.h"

namespace {

constexpr double kPowerFloor = 0.0001;  // -80 dB

// A worker and the samples it reads. Jobs have no scaled copy of the signal: worker.signal is null,
// and the samples come from view.
struct group_worker {
    TAVO_ONSET_WORKER worker;
    sample_view view;
};
static_assert(offsetof(group_worker, worker) == 0);  // the thread entry accepts both records

// The four workers of one envelope and their shared buffers. Zero before they are allocated.
struct onset_group {
    group_worker members[kBeatWorkers];
    int32_t done[kBeatWorkers];
    double *window;    // [N]
    TAVO_FFT_CTX fft;  // of size N
    double *decibels;  // [F][36]
    double **mel;      // [F] pointers to rows of decibels
    float *power;      // [2 * kBeatWorkers][N / 2] two rows per worker, used in turn
    float **spectrum;  // [F] pointers to rows of power
};

// A non-zero weight of the mel matrix.
struct mel_term {
    int64_t bin;
    double weight;
};

// Scratch of one worker. Lane 0 is analysis frame k, lane 1 the next one.
struct worker_scratch {
    double *samples;    // [N + H] scaled samples of both frames
    double_pair *re;    // [N], then the powers in [N / 2]
    double_pair *im;    // [N]
    mel_term *terms;    // terms of all bands, ordered by band, then bin
    int64_t *band_end;  // [bands] index past the band's last term
};

double *create_hann_window(int32_t size) {
    auto *window = zeroed_items<double>(size);
    if (window == nullptr) return nullptr;
    for (int32_t i = 0; i < size; ++i) {
        window[i] = 0.5 * (1.0 - cos(kTwoPi * i / (size - 1)));
    }
    return window;
}

sample_view samples_of(const TAVO_ONSET_WORKER *worker) {
    if (worker->signal != nullptr) return {worker->signal, 1.0};
    return reinterpret_cast<const group_worker *>(worker)->view;
}

bool allocate_scratch(const TAVO_ONSET_WORKER *worker, worker_scratch *scratch) {
    const int64_t size = worker->frame_size;
    const int64_t bands = worker->band_count;
    scratch->samples = zeroed_items<double>(size + worker->hop_size);
    scratch->re = zeroed_items<double_pair>(2 * size);
    scratch->im = scratch->re + size;
    scratch->terms = zeroed_items<mel_term>(size / 2 * bands);
    scratch->band_end = zeroed_items<int64_t>(bands);
    if (scratch->samples == nullptr || scratch->re == nullptr || scratch->terms == nullptr ||
        scratch->band_end == nullptr) {
        return false;
    }
    int64_t count = 0;
    for (int64_t band = 0; band < bands; ++band) {
        for (int64_t bin = 0; bin < size / 2; ++bin) {
            const float weight = worker->mel_matrix[bin][band];
            if (weight != 0.0f) scratch->terms[count++] = {bin, static_cast<double>(weight)};
        }
        scratch->band_end[band] = count;
    }
    return true;
}

void release_scratch(worker_scratch *scratch) {
    free(scratch->samples);
    free(scratch->re);
    free(scratch->terms);
    free(scratch->band_end);
}

// Computes the powers of the frames k and next in single precision and fills their spectrum rows.
void compute_powers(const TAVO_ONSET_WORKER *worker, int64_t k, int64_t next,
                    const worker_scratch *scratch) {
    const int64_t shift = (next - k) * worker->hop_size;
    sample_view view = samples_of(worker);
    view.samples += k * worker->hop_size;
    scale_samples(view, worker->frame_size + shift, scratch->samples);
    double_pair *re = scratch->re;
    double_pair *im = scratch->im;
    for (int64_t i = 0; i < worker->frame_size; ++i) {
        const double_pair pair = {scratch->samples[i], scratch->samples[i + shift]};
        re[i] = pair * worker->window[i];
        im[i] = double_pair{0.0, 0.0};
    }
    transform_pair(re, im, worker->frame_size, worker->fft);

    float *first_row = worker->spectrum[k];
    float *second_row = worker->spectrum[next];
    for (int64_t j = 0; j < worker->frame_size / 2; ++j) {
        const auto power = __builtin_convertvector(re[j] * re[j] + im[j] * im[j], float_pair);
        re[j] = __builtin_convertvector(power, double_pair);
        first_row[j] = power[0];
        second_row[j] = power[1];
    }
}

double decibels_of(double power) {
    return 20.0 * log10(power < kPowerFloor ? kPowerFloor : power);
}

// Fills the mel rows of the frames k and next. As in MultiplyMtxs, terms with a zero factor are
// skipped.
void compute_bands(const TAVO_ONSET_WORKER *worker, int64_t k, int64_t next,
                   const worker_scratch *scratch) {
    const double_pair zero = {0.0, 0.0};
    const mel_term *term = scratch->terms;
    for (int32_t band = 0; band < worker->band_count; ++band) {
        double_pair sum = zero;
        for (; term < scratch->terms + scratch->band_end[band]; ++term) {
            const double_pair power = scratch->re[term->bin];
            sum += power != zero ? power * term->weight : zero;
        }
        worker->mel[k][band] = decibels_of(sum[0]);
        worker->mel[next][band] = decibels_of(sum[1]);
    }
}

// Computes a worker's analysis frames, two at a time; the last of an odd number is paired with
// itself. If memory runs out, it clears the record's mel pointer, which run_group checks.
void run_onset_worker(void *record) {
    auto *worker = static_cast<TAVO_ONSET_WORKER *>(record);
    if (worker->first > worker->last) return;
    worker_scratch scratch = {};
    if (allocate_scratch(worker, &scratch)) {
        for (int64_t k = worker->first; k <= worker->last; k += 2) {
            const int64_t next = std::min(k + 1, worker->last);
            compute_powers(worker, k, next, &scratch);
            compute_bands(worker, k, next, &scratch);
        }
    } else {
        worker->mel = nullptr;
    }
    release_scratch(&scratch);
}

void release_group(onset_group *group) {
    free(group->window);
    tavo_fft_deinit(&group->fft);
    free(group->decibels);
    free(group->mel);
    free(group->power);
    free(group->spectrum);
}

bool allocate_group(int64_t frames, int32_t frame_size, onset_group *group) {
    const int64_t bins = frame_size / 2;
    tavo_fft_init(static_cast<int16_t>(frame_size), &group->fft);
    group->window = create_hann_window(frame_size);
    group->decibels = zeroed_items<double>(frames * kMelBands);
    group->mel = zeroed_items<double *>(frames);
    group->power = zeroed_items<float>(2 * kBeatWorkers * bins);
    group->spectrum = zeroed_items<float *>(frames);
    return group->fft.cos_table != nullptr && group->window != nullptr &&
           group->decibels != nullptr && group->mel != nullptr && group->power != nullptr &&
           group->spectrum != nullptr;
}

// Fills one worker's record and row pointers. A single frame is given to no worker, because it may
// extend past the end of the signal.
void fill_worker(const TAVO_BEAT_CTX *beat, int32_t id, int32_t frame_size, int32_t hop_size,
                 onset_group *group) {
    const int64_t length = beat->frame_count / kBeatWorkers;
    const int64_t end = beat->frame_count == 1 ? 0 : beat->frame_count;
    TAVO_ONSET_WORKER *worker = &group->members[id].worker;
    worker->id = id;
    worker->signal = beat->signal;
    worker->first = id * length;
    worker->last = (id == kBeatWorkers - 1 ? end : (id + 1) * length) - 1;
    worker->spectrum = group->spectrum;
    worker->frame_size = frame_size;
    worker->hop_size = hop_size;
    worker->first_sample = worker->first * hop_size;
    worker->fft = &group->fft;
    worker->done_flags = group->done;
    worker->thread_count = kBeatWorkers;
    worker->mutex = feat_mutex_mt;
    worker->cond = feat_cond_mt;
    worker->band_count = kMelBands;
    worker->mel_matrix = beat->mel_matrix;
    worker->mel = group->mel;
    worker->window = group->window;
    for (int64_t k = worker->first; k <= worker->last; ++k) {
        group->mel[k] = group->decibels + k * kMelBands;
        group->spectrum[k] = group->power + (2 * id + k % 2) * (frame_size / 2);
    }
}

// Returns true if every worker computed all of its frames.
bool run_group(onset_group *group, const side_work *side) {
    worker_slot slots[kBeatWorkers];
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        TAVO_ONSET_WORKER *worker = &group->members[id].worker;
        slots[id] = {worker, &worker->thread, _tavo_proc_onsetenv, run_onset_worker};
    }
    worker_group_run(slots, kBeatWorkers, feat_mutex_mt, feat_cond_mt, group->done, side);
    return std::all_of(group->members, group->members + kBeatWorkers,
                       [](const group_worker &member) { return member.worker.mel != nullptr; });
}

// Mean absolute difference of two rows: rises and falls both count.
double spectral_flux(const double *row, const double *next) {
    double sum = 0.0;
    for (int32_t band = 0; band < kMelBands; ++band) {
        const double difference = next[band] - row[band];
        if (!std::isnan(difference)) sum += fabs(difference);
    }
    return sum / kMelBands;
}

// Fills env[count] with the spectral flux between neighbouring rows, divided by its standard
// deviation.
void fill_envelope(double *const *mel, int64_t count, double *env) {
    for (int64_t k = 0; k < count; ++k) env[k] = spectral_flux(mel[k], mel[k + 1]);
    double mean = 0.0;
    double deviation = 0.0;
    getMeanStd(env, count, &mean, &deviation);
    for (int64_t k = 0; k < count; ++k) env[k] /= deviation;
}

}  // namespace

void _thd_cleanup(void *record) {
    const auto *worker = static_cast<const TAVO_ONSET_WORKER *>(record);
    worker_group_done(worker->mutex, worker->cond, worker->done_flags, worker->thread_count,
                      worker->id);
}

void *_tavo_proc_onsetenv(void *record) {
    run_worker(record, run_onset_worker, _thd_cleanup);
}

void _getOnsetEnvelope(TAVO_BEAT_CTX *beat, int32_t frame_size, int32_t hop_size) {
    compute_onset_envelope(beat, {beat->signal, 1.0}, frame_size, hop_size, nullptr);
}

void compute_onset_envelope(TAVO_BEAT_CTX *beat, sample_view view, int32_t frame_size,
                            int32_t hop_size, const side_work *side) {
    const bool usable = is_fft_size(frame_size) && hop_size >= 1 &&
                        (view.samples != nullptr || beat->frame_count < 2) &&
                        feat_mutex_mt != nullptr && feat_cond_mt != nullptr;
    onset_group group = {};
    if (usable && allocate_group(beat->frame_count, frame_size, &group)) {
        for (int32_t id = 0; id < kBeatWorkers; ++id) {
            fill_worker(beat, id, frame_size, hop_size, &group);
            group.members[id].view = view;
        }
        const bool complete = run_group(&group, side);
        if (complete) fill_envelope(group.mel, beat->frame_count - 1, beat->onset_env);
    } else if (side != nullptr) {
        side->run(side->arg);
    }
    release_group(&group);
}
