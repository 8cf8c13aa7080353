#include "beat/onset_envelope.h"

#include <cmath>

#include "common/worker_group.h"
#include "dsp/matrix.h"
#include "dsp/stats.h"

namespace {

constexpr double kTwoPi = 6.283185307179586;
constexpr double kPowerFloor = 0.0001;    // -80 dB
constexpr int32_t kMaxFrameSize = 16384;  // the largest FFT
constexpr int64_t kBatch = 32;  // frames between FFT and mel projection: their spectra stay cached

// What one run of the envelope holds; zero before anything is obtained.
struct onset_run {
    TAVO_ONSET_WORKER *workers;  // [4]
    int32_t *done;               // [4]
    float **spectrum;            // [F] rows; a worker's batches follow each other in the same rows
    float *spectrum_rows;        // [4][kBatch][N / 2]
    double **mel;                // [F] rows
    double *mel_rows;            // [F][36]
    double *window;              // [N]
    TAVO_FFT_CTX fft;
};

double *hann_window(int32_t size) {
    double *window = zeroed_items<double>(size);
    if (window == nullptr) return nullptr;
    for (int32_t i = 0; i < size; ++i) {
        window[i] = 0.5 * (1.0 - cos(kTwoPi * i / (size - 1)));
    }
    return window;
}

void release_run(onset_run *run) {
    free(run->workers);
    free(run->done);
    free(run->spectrum);
    free(run->spectrum_rows);
    free(run->mel);
    free(run->mel_rows);
    free(run->window);
    tavo_fft_deinit(&run->fft);
}

bool obtain_run(onset_run *run, int64_t frames, int32_t frame_size) {
    tavo_fft_init(static_cast<int16_t>(frame_size), &run->fft);
    run->workers = zeroed_items<TAVO_ONSET_WORKER>(kBeatWorkers);
    run->done = zeroed_items<int32_t>(kBeatWorkers);
    run->spectrum = zeroed_items<float *>(frames);
    run->spectrum_rows = zeroed_items<float>(kBeatWorkers * kBatch * (frame_size / 2));
    run->mel = zeroed_items<double *>(frames);
    run->mel_rows = zeroed_items<double>(frames * kMelBands);
    run->window = hann_window(frame_size);
    return run->fft.cos_table != nullptr && run->workers != nullptr && run->done != nullptr &&
           run->spectrum != nullptr && run->spectrum_rows != nullptr && run->mel != nullptr &&
           run->mel_rows != nullptr && run->window != nullptr;
}

// The windowed power spectrum of frame k; im is zero before and after.
void take_spectrum(const TAVO_ONSET_WORKER *worker, int64_t k, double *re, double *im) {
    const double *frame = worker->signal + k * worker->hop_size;
    for (int32_t i = 0; i < worker->frame_size; ++i) re[i] = frame[i] * worker->window[i];
    tavo_fft_proc(re, im, static_cast<int16_t>(worker->frame_size), worker->fft);

    float *row = worker->spectrum[k];
    for (int32_t j = 0; j < worker->frame_size / 2; ++j) {
        row[j] = static_cast<float>(re[j] * re[j] + im[j] * im[j]);
    }
    for (int32_t i = 0; i < worker->frame_size; ++i) im[i] = 0.0;
}

void take_decibels(double *row, int32_t bands) {
    for (int32_t b = 0; b < bands; ++b) {
        row[b] = 20.0 * log10(row[b] < kPowerFloor ? kPowerFloor : row[b]);
    }
}

void run_batch(const TAVO_ONSET_WORKER *worker, int64_t first, int64_t count, double *re,
               double *im) {
    for (int64_t k = first; k < first + count; ++k) take_spectrum(worker, k, re, im);
    MultiplyMtxs(static_cast<int32_t>(count), worker->band_count, worker->frame_size / 2,
                 worker->spectrum + first, worker->mel_matrix, worker->mel + first);
    for (int64_t k = first; k < first + count; ++k) {
        take_decibels(worker->mel[k], worker->band_count);
    }
}

// The work of one worker. A batch of frames goes through all its steps before the next one, so that
// the next one may reuse its spectrum rows.
// A worker that gets no memory clears its mel pointer, which its starter looks at after the join.
void run_onset_worker(void *record) {
    auto *worker = static_cast<TAVO_ONSET_WORKER *>(record);
    double *re = zeroed_items<double>(worker->frame_size);
    double *im = zeroed_items<double>(worker->frame_size);
    if (re == nullptr || im == nullptr) {
        worker->mel = nullptr;
    } else {
        for (int64_t k = worker->first; k <= worker->last; k += kBatch) {
            const int64_t left = worker->last - k + 1;
            run_batch(worker, k, left < kBatch ? left : kBatch, re, im);
        }
    }
    free(re);
    free(im);
}

void fill_workers(const TAVO_BEAT_CTX *beat, int32_t frame_size, int32_t hop_size,
                  const onset_run *run) {
    const int64_t share = beat->frame_count / kBeatWorkers;
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        TAVO_ONSET_WORKER *worker = &run->workers[id];
        const bool is_last = id == kBeatWorkers - 1;
        worker->id = id;
        worker->signal = beat->signal;
        worker->first = id * share;
        worker->last = is_last ? beat->frame_count - 1 : (id + 1) * share - 1;
        worker->spectrum = run->spectrum;
        worker->frame_size = frame_size;
        worker->hop_size = hop_size;
        worker->first_sample = worker->first * hop_size;
        worker->fft = &run->fft;
        worker->done_flags = run->done;
        worker->thread_count = kBeatWorkers;
        worker->mutex = feat_mutex_mt;
        worker->cond = feat_cond_mt;
        worker->band_count = kMelBands;
        worker->mel_matrix = beat->mel_matrix;
        worker->mel = run->mel;
        worker->window = run->window;
        for (int64_t k = worker->first; k <= worker->last; ++k) {
            const int64_t row = id * kBatch + (k - worker->first) % kBatch;
            run->spectrum[k] = run->spectrum_rows + row * (frame_size / 2);
            run->mel[k] = run->mel_rows + k * kMelBands;
        }
    }
}

// Returns true when every worker computed all of its frames.
bool run_workers(const onset_run *run) {
    worker_slot slots[kBeatWorkers];
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        TAVO_ONSET_WORKER *worker = &run->workers[id];
        slots[id] = {worker, &worker->thread, _tavo_proc_onsetenv, run_onset_worker};
    }
    worker_group_run(slots, kBeatWorkers, feat_mutex_mt, feat_cond_mt, run->done);
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        if (run->workers[id].mel == nullptr) return false;
    }
    return true;
}

// Mean change of level from one frame's bands to the next one's, falls and rises alike.
double band_change(const double *now, const double *next) {
    double sum = 0.0;
    for (int32_t b = 0; b < kMelBands; ++b) {
        const double difference = next[b] - now[b];
        if (!std::isnan(difference)) sum += fabs(difference);
    }
    return sum / kMelBands;
}

void fill_envelope(TAVO_BEAT_CTX *beat, double *const *mel) {
    const int64_t count = beat->frame_count - 1;
    for (int64_t k = 0; k < count; ++k) {
        beat->onset_env[k] = band_change(mel[k], mel[k + 1]);
    }

    double mean = 0.0;
    double deviation = 0.0;
    getMeanStd(beat->onset_env, count, &mean, &deviation);
    for (int64_t k = 0; k < count; ++k) beat->onset_env[k] /= deviation;
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
    const bool usable = frame_size >= 2 && frame_size <= kMaxFrameSize && hop_size >= 1;
    if (!usable || beat->frame_count < 2 || feat_mutex_mt == nullptr || feat_cond_mt == nullptr) {
        return;
    }

    onset_run run = {};
    if (obtain_run(&run, beat->frame_count, frame_size)) {
        fill_workers(beat, frame_size, hop_size, &run);
        if (run_workers(&run)) fill_envelope(beat, run.mel);
    }
    release_run(&run);
}
