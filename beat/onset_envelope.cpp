#include "beat/onset_envelope.h"

#include <algorithm>
#include <cmath>

#include "common/lanes.h"
#include "dsp/stats.h"

namespace {

constexpr double kPowerFloor = 0.0001;  // -80 dB

constexpr int64_t kRows = 3;  // mel rows that a worker keeps: the current two and the previous one

typedef double mel_row[kMelBands];

// A worker of compute_onset_envelope. It reads the samples through `view` and keeps only the last
// few mel rows, so the signal, spectrum and mel pointers of `worker` are null.
struct group_worker {
    TAVO_ONSET_WORKER worker;
    sample_view view;
    double *flux;         // [F - 1] shared; this worker fills entries first to last - 1
    mel_row rows[kRows];  // row k % kRows holds the decibels of analysis frame k
    mel_row first_row;    // decibels of the worker's first analysis frame
    bool is_complete;
};
static_assert(offsetof(group_worker, worker) == 0);  // the thread entry accepts both records

// The four workers of one envelope and their shared buffers. All fields start as zero.
struct onset_group {
    group_worker members[kBeatWorkers];
    int32_t done[kBeatWorkers];
    double *window;    // [N] Hann window
    TAVO_FFT_CTX fft;  // tables for size N
    double *flux;      // [F - 1] spectral flux
};

// A non-zero weight of the mel matrix.
struct mel_term {
    double_pair weight;
    const double_pair *power;  // power of the weight's bin
};

// Scratch memory of one worker. In each double_pair, lane 0 belongs to analysis frame k and lane 1
// to the next one.
struct worker_scratch {
    double *samples;         // [N + H] scaled samples of both frames
    double_pair *transform;  // [2 N]
    double_pair *powers;     // [N / 2] bin powers of both frames
    mel_term *terms;         // terms of all bands, ordered by band and then by bin
    int64_t *band_end;       // [bands] index after the band's last term
};

double *create_hann_window(int32_t size) {
    auto *window = zeroed_items<double>(size);
    if (window == nullptr) return nullptr;
    for (int32_t i = 0; i < size; ++i) {
        window[i] = 0.5 * (1.0 - cos(kTwoPi * i / (size - 1)));
    }
    return window;
}

// Returns the group_worker that contains the record, or null if a direct caller passed the record.
group_worker *group_record(TAVO_ONSET_WORKER *worker) {
    return worker->signal == nullptr ? reinterpret_cast<group_worker *>(worker) : nullptr;
}

bool allocate_scratch(const TAVO_ONSET_WORKER *worker, worker_scratch *scratch) {
    const int64_t size = worker->frame_size;
    const int64_t bands = worker->band_count;
    scratch->samples = zeroed_items<double>(size + worker->hop_size);
    scratch->transform = zeroed_items<double_pair>(2 * size);
    scratch->powers = zeroed_items<double_pair>(size / 2);
    scratch->terms = zeroed_items<mel_term>(size / 2 * bands);
    scratch->band_end = zeroed_items<int64_t>(bands);
    if (scratch->samples == nullptr || scratch->transform == nullptr ||
        scratch->powers == nullptr || scratch->terms == nullptr || scratch->band_end == nullptr) {
        return false;
    }
    int64_t count = 0;
    for (int64_t band = 0; band < bands; ++band) {
        for (int64_t bin = 0; bin < size / 2; ++bin) {
            const auto weight = static_cast<double>(worker->mel_matrix[bin][band]);
            if (weight == 0.0) continue;
            scratch->terms[count++] = {double_pair{weight, weight}, scratch->powers + bin};
        }
        scratch->band_end[band] = count;
    }
    return true;
}

void release_scratch(worker_scratch *scratch) {
    free(scratch->samples);
    free(scratch->transform);
    free(scratch->powers);
    free(scratch->terms);
    free(scratch->band_end);
}

// Scales the samples of analysis frames `k` and `next`. Samples that frame `k` shares with the
// previous pair are already scaled, so they are only moved.
void scale_frames(TAVO_ONSET_WORKER *worker, int64_t k, int64_t next, double *samples) {
    const group_worker *record = group_record(worker);
    sample_view view = record != nullptr ? record->view : sample_view{worker->signal, 1.0};
    const int64_t size = worker->frame_size;
    const int64_t hop = worker->hop_size;
    const int64_t kept = k > worker->first ? std::max<int64_t>(size - hop, 0) : 0;
    if (kept > 0) std::copy_n(samples + 2 * hop, kept, samples);
    view.samples += k * hop + kept;
    scale_samples(view, size + (next - k) * hop - kept, samples + kept);
}

// Computes the bin powers of analysis frames `k` and `next` and fills their spectrum rows, if any.
void compute_spectrum(TAVO_ONSET_WORKER *worker, int64_t k, int64_t next,
                      const worker_scratch *scratch) {
    const int32_t size = worker->frame_size;
    scale_frames(worker, k, next, scratch->samples);
    const frame_pair frames = {scratch->samples, scratch->samples + (next - k) * worker->hop_size,
                               worker->window};
    compute_frame_powers(frames, size, worker->fft, scratch->transform, scratch->powers);
    for (int32_t j = 0; j < size / 2 && worker->spectrum != nullptr; ++j) {
        worker->spectrum[k][j] = static_cast<float>(scratch->powers[j][0]);
        worker->spectrum[next][j] = static_cast<float>(scratch->powers[j][1]);
    }
}

double decibels_of(double power) {
    return 20.0 * log10(power < kPowerFloor ? kPowerFloor : power);
}

double *mel_row_of(TAVO_ONSET_WORKER *worker, int64_t k) {
    group_worker *record = group_record(worker);
    return record != nullptr ? record->rows[k % kRows] : worker->mel[k];
}

// Fills the mel rows of analysis frames `k` and `next`. Terms with a zero factor are skipped, as in
// MultiplyMtxs.
void compute_bands(TAVO_ONSET_WORKER *worker, int64_t k, int64_t next,
                   const worker_scratch *scratch) {
    double *row = mel_row_of(worker, k);
    double *next_row = mel_row_of(worker, next);
    const double_pair zero = {0.0, 0.0};
    const mel_term *term = scratch->terms;
    for (int32_t band = 0; band < worker->band_count; ++band) {
        double_pair sum = zero;
        for (; term < scratch->terms + scratch->band_end[band]; ++term) {
            const double_pair power = *term->power;
            sum += power != zero ? power * term->weight : zero;
        }
        row[band] = decibels_of(sum[0]);
        next_row[band] = decibels_of(sum[1]);
    }
}

// Returns the mean absolute difference of two mel rows, so both rises and falls count.
double spectral_flux(const double *row, const double *next) {
    double sum = 0.0;
    for (int32_t band = 0; band < kMelBands; ++band) {
        const double difference = next[band] - row[band];
        if (!std::isnan(difference)) sum += fabs(difference);
    }
    return sum / kMelBands;
}

// Computes the spectral flux of analysis frames `k` to `end` - 1, comparing each with the frame
// before it. For the worker's first frame, only stores the mel row: the frame before it belongs to
// another worker, so fill_envelope computes that flux.
void compute_flux(group_worker *record, int64_t k, int64_t end) {
    for (; k < end; ++k) {
        const double *row = record->rows[k % kRows];
        if (k == record->worker.first) {
            std::copy_n(row, kMelBands, record->first_row);
        } else {
            record->flux[k - 1] = spectral_flux(record->rows[(k - 1) % kRows], row);
        }
    }
}

// Processes a worker's analysis frames two at a time. If their number is odd, the last one is
// paired with itself. If memory runs out, the rows of a direct caller's record stay unchanged.
void run_onset_worker(void *argument) {
    auto *worker = static_cast<TAVO_ONSET_WORKER *>(argument);
    group_worker *record = group_record(worker);
    worker_scratch scratch = {};
    const bool is_ready = worker->first > worker->last || allocate_scratch(worker, &scratch);
    for (int64_t k = worker->first; k <= worker->last && is_ready; k += 2) {
        const int64_t next = std::min(k + 1, worker->last);
        compute_spectrum(worker, k, next, &scratch);
        compute_bands(worker, k, next, &scratch);
        if (record != nullptr) compute_flux(record, k, next + 1);
    }
    if (record != nullptr) record->is_complete = is_ready;
    release_scratch(&scratch);
}

void release_group(onset_group *group) {
    free(group->window);
    tavo_fft_deinit(&group->fft);
    free(group->flux);
}

bool allocate_group(int64_t frames, int32_t frame_size, onset_group *group) {
    tavo_fft_init(static_cast<int16_t>(frame_size), &group->fft);
    group->window = create_hann_window(frame_size);
    group->flux = zeroed_items<double>(frames);
    return group->fft.cos_table != nullptr && group->window != nullptr && group->flux != nullptr;
}

// Fills one worker's record. If there is only one analysis frame, no worker gets it, because it may
// extend past the end of the signal.
void fill_worker(const TAVO_BEAT_CTX *beat, sample_view view, int32_t id, int32_t frame_size,
                 int32_t hop_size, onset_group *group) {
    const int64_t length = beat->frame_count / kBeatWorkers;
    const int64_t end = beat->frame_count == 1 ? 0 : beat->frame_count;
    group->members[id].view = view;
    group->members[id].flux = group->flux;
    TAVO_ONSET_WORKER *worker = &group->members[id].worker;
    worker->id = id;
    worker->first = id * length;
    worker->last = (id == kBeatWorkers - 1 ? end : (id + 1) * length) - 1;
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
    worker->window = group->window;
}

// Runs the workers and the side work. Returns true if every worker finished its analysis frames.
bool run_group(onset_group *group, const side_work *side) {
    worker_slot slots[kBeatWorkers];
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        TAVO_ONSET_WORKER *worker = &group->members[id].worker;
        slots[id] = {worker, &worker->thread, _tavo_proc_onsetenv, run_onset_worker};
    }
    worker_group_run(slots, kBeatWorkers, feat_mutex_mt, feat_cond_mt, group->done, side);
    return std::all_of(group->members, group->members + kBeatWorkers,
                       [](const group_worker &member) { return member.is_complete; });
}

// Computes the flux that the workers left out: between each worker's last analysis frame and the
// next worker's first. Then fills env[count] with the flux divided by its standard deviation.
void fill_envelope(onset_group *group, int64_t count, double *env) {
    for (int32_t id = 0; id + 1 < kBeatWorkers; ++id) {
        const group_worker *member = &group->members[id];
        const int64_t last = member->worker.last;
        if (last < member->worker.first) continue;
        group->flux[last] = spectral_flux(member->rows[last % kRows], (member + 1)->first_row);
    }
    double mean = 0.0;
    double deviation = 0.0;
    getMeanStd(group->flux, count, &mean, &deviation);
    for (int64_t k = 0; k < count; ++k) env[k] = group->flux[k] / deviation;
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
            fill_worker(beat, view, id, frame_size, hop_size, &group);
        }
        const bool is_complete = run_group(&group, side);
        if (is_complete) fill_envelope(&group, beat->frame_count - 1, beat->onset_env);
    } else if (side != nullptr) {
        side->run(side->arg);
    }
    release_group(&group);
}
