#include "beat/onset_envelope.h"

#include <algorithm>
#include <cmath>

#include "beat/frame_pair.h"
#include "common/worker_group.h"
#include "dsp/matrix.h"
#include "dsp/stats.h"

namespace {

constexpr double kTwoPi = 6.283185307179586;
constexpr double kPowerFloor = 0.0001;    // -80 dB
constexpr int32_t kMaxFrameSize = 16384;  // the largest FFT
constexpr int64_t kRows = 3;              // mel rows kept by a part: the pair's and the one before

// One worker's share of the frames.
struct onset_part {
    const TAVO_ONSET_WORKER *worker;  // spectrum and mel null: no row outlives its frame
    double full_scale;                // of the worker's signal
    const pair_tables *tables;        // null: frames go one by one
    double *env;                  // [F - 1] change from each frame to the next; null: not wanted
    double first_row[kMelBands];  // decibels of the first frame, with env
    double last_row[kMelBands];   // of the last one
    bool complete;                // all memory was there
};

// What a part works in, in one allocation.
struct part_room {
    double *samples;  // [N + H] scaled, from sample begin to end of the signal
    int64_t begin;
    int64_t end;
    double *re;    // [N]
    double *im;    // [N] zero between frames
    double *rows;  // [kRows][bands] mel rows of a part that has no others
    float *power;  // [N / 2] spectrum of a part that has no others
};

// The four parts of one envelope and what they share; zero before anything is obtained.
struct onset_run {
    TAVO_ONSET_WORKER workers[kBeatWorkers];
    onset_part parts[kBeatWorkers];
    int32_t done[kBeatWorkers];
    double *window;  // [N]
    TAVO_FFT_CTX fft;
    pair_tables *tables;
};

double *hann_window(int32_t size) {
    auto *window = zeroed_items<double>(size);
    if (window == nullptr) return nullptr;
    for (int32_t i = 0; i < size; ++i) {
        window[i] = 0.5 * (1.0 - cos(kTwoPi * i / (size - 1)));
    }
    return window;
}

void release_run(onset_run *run) {
    free(run->window);
    tavo_fft_deinit(&run->fft);
    release_pair_tables(run->tables);
}

bool obtain_run(onset_run *run, int32_t frame_size, float *const *mel_matrix) {
    tavo_fft_init(static_cast<int16_t>(frame_size), &run->fft);
    run->window = hann_window(frame_size);
    if (run->fft.cos_table == nullptr || run->window == nullptr) return false;
    if (frame_size == kFrameSize) {
        run->tables = make_pair_tables(run->window, &run->fft, mel_matrix, kMelBands);
    }
    return true;
}

bool obtain_room(const onset_part *part, part_room *room) {
    const int64_t size = part->worker->frame_size;
    const int64_t bands = part->worker->band_count;
    const int64_t ahead = part->tables != nullptr ? part->worker->hop_size : 0;
    room->samples = zeroed_items<double>(ahead + 4 * size + kRows * bands);
    if (room->samples == nullptr) return false;
    room->re = room->samples + ahead + size;
    room->im = room->re + size;
    room->rows = room->im + size;
    room->power = reinterpret_cast<float *>(room->rows + kRows * bands);
    return true;
}

// The scaled samples of frame k and the frames behind it, count in all.
const double *hold_samples(const onset_part *part, part_room *room, int64_t k, int64_t count) {
    const TAVO_ONSET_WORKER *worker = part->worker;
    const int64_t begin = k * worker->hop_size;
    const int64_t end = begin + (count - 1) * worker->hop_size + worker->frame_size;
    const int64_t kept = room->end > begin ? room->end - begin : 0;
    if (kept > 0) std::copy_n(room->samples + (begin - room->begin), kept, room->samples);
    if (begin + kept < end) {
        scale_samples({worker->signal + begin + kept, part->full_scale}, end - begin - kept,
                      room->samples + kept);
    }
    room->begin = begin;
    room->end = std::max(begin + kept, end);
    return room->samples;
}

double *mel_row(const onset_part *part, const part_room *room, int64_t k) {
    if (part->worker->mel != nullptr) return part->worker->mel[k];
    return room->rows + k % kRows * part->worker->band_count;
}

// The windowed power spectrum of frame k and its mel bands.
void take_single(const onset_part *part, part_room *room, int64_t k) {
    const TAVO_ONSET_WORKER *worker = part->worker;
    const double *samples = hold_samples(part, room, k, 1);
    for (int32_t i = 0; i < worker->frame_size; ++i) room->re[i] = samples[i] * worker->window[i];
    tavo_fft_proc(room->re, room->im, static_cast<int16_t>(worker->frame_size), worker->fft);

    float *power = worker->spectrum != nullptr ? worker->spectrum[k] : room->power;
    for (int32_t j = 0; j < worker->frame_size / 2; ++j) {
        power[j] = static_cast<float>(room->re[j] * room->re[j] + room->im[j] * room->im[j]);
    }
    std::fill_n(room->im, worker->frame_size, 0.0);
    double *row = mel_row(part, room, k);
    MultiplyMtxs(1, worker->band_count, worker->frame_size / 2, &power, worker->mel_matrix, &row);
}

// The mel bands of the frames from k on; returns of how many, one or two.
int64_t take_bands(const onset_part *part, part_room *room, int64_t k) {
    if (part->tables != nullptr && k < part->worker->last) {
        const double *samples = hold_samples(part, room, k, 2);
        if (take_pair(part->tables, samples, samples + part->worker->hop_size,
                      mel_row(part, room, k), mel_row(part, room, k + 1))) {
            return 2;
        }
    }
    take_single(part, room, k);
    return 1;
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

// Turns the bands of frame k into decibels and compares them with the frame before.
void finish_row(onset_part *part, const part_room *room, int64_t k) {
    double *row = mel_row(part, room, k);
    for (int32_t b = 0; b < part->worker->band_count; ++b) {
        row[b] = 20.0 * log10(row[b] < kPowerFloor ? kPowerFloor : row[b]);
    }
    if (part->env == nullptr) return;
    if (k > part->worker->first) part->env[k - 1] = band_change(mel_row(part, room, k - 1), row);
    if (k == part->worker->first) std::copy_n(row, kMelBands, part->first_row);
    if (k == part->worker->last) std::copy_n(row, kMelBands, part->last_row);
}

void run_part(void *record) {
    auto *part = static_cast<onset_part *>(record);
    part_room room = {};
    if (!obtain_room(part, &room)) return;
    for (int64_t k = part->worker->first; k <= part->worker->last;) {
        const int64_t taken = take_bands(part, &room, k);
        for (const int64_t end = k + taken; k < end; ++k) finish_row(part, &room, k);
    }
    part->complete = true;
    free(room.samples);
}

void report_done(const TAVO_ONSET_WORKER *worker) {
    worker_group_done(worker->mutex, worker->cond, worker->done_flags, worker->thread_count,
                      worker->id);
}

void part_cleanup(void *record) {
    report_done(static_cast<const onset_part *>(record)->worker);
}

void *part_entry(void *record) {
    run_worker(record, run_part, part_cleanup);
}

// A caller's own record asks for its rows and nothing more.
void run_onset_worker(void *record) {
    onset_part part = {};
    part.worker = static_cast<const TAVO_ONSET_WORKER *>(record);
    part.full_scale = 1.0;
    run_part(&part);
}

void fill_parts(TAVO_BEAT_CTX *beat, sample_view view, int32_t frame_size, int32_t hop_size,
                onset_run *run) {
    const int64_t share = beat->frame_count / kBeatWorkers;
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        TAVO_ONSET_WORKER *worker = &run->workers[id];
        onset_part *part = &run->parts[id];
        part->worker = worker;
        part->full_scale = view.full_scale;
        part->tables = run->tables;
        part->env = beat->onset_env;

        const bool is_last = id == kBeatWorkers - 1;
        worker->id = id;
        worker->signal = view.samples;
        worker->first = id * share;
        worker->last = is_last ? beat->frame_count - 1 : (id + 1) * share - 1;
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
        worker->window = run->window;
    }
}

// Returns true when every worker computed all of its frames.
bool run_parts(onset_run *run, const side_work *beside) {
    worker_slot slots[kBeatWorkers];
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        slots[id] = {&run->parts[id], &run->workers[id].thread, part_entry, run_part};
    }
    worker_group_run(slots, kBeatWorkers, feat_mutex_mt, feat_cond_mt, run->done, beside);
    return std::all_of(run->parts, run->parts + kBeatWorkers,
                       [](const onset_part &part) { return part.complete; });
}

// Between the last frame of each worker and the first one of the next, then all changes over their
// standard deviation.
void finish_envelope(TAVO_BEAT_CTX *beat, const onset_run *run) {
    for (int32_t id = 0; id + 1 < kBeatWorkers; ++id) {
        const onset_part *part = &run->parts[id];
        if (part->worker->first > part->worker->last) continue;
        beat->onset_env[part->worker->last] =
            band_change(part->last_row, run->parts[id + 1].first_row);
    }
    const int64_t count = beat->frame_count - 1;
    double mean = 0.0;
    double deviation = 0.0;
    getMeanStd(beat->onset_env, count, &mean, &deviation);
    for (int64_t k = 0; k < count; ++k) beat->onset_env[k] /= deviation;
}

}  // namespace

void _thd_cleanup(void *record) {
    report_done(static_cast<const TAVO_ONSET_WORKER *>(record));
}

void *_tavo_proc_onsetenv(void *record) {
    run_worker(record, run_onset_worker, _thd_cleanup);
}

void _getOnsetEnvelope(TAVO_BEAT_CTX *beat, int32_t frame_size, int32_t hop_size) {
    fill_onset_envelope(beat, {beat->signal, 1.0}, frame_size, hop_size, nullptr);
}

void fill_onset_envelope(TAVO_BEAT_CTX *beat, sample_view view, int32_t frame_size,
                         int32_t hop_size, const side_work *beside) {
    const bool usable = frame_size >= 2 && frame_size <= kMaxFrameSize && hop_size >= 1 &&
                        beat->frame_count >= 2 && feat_mutex_mt != nullptr &&
                        feat_cond_mt != nullptr;
    onset_run run = {};
    if (usable && obtain_run(&run, frame_size, beat->mel_matrix)) {
        fill_parts(beat, view, frame_size, hop_size, &run);
        if (run_parts(&run, beside)) {
            finish_envelope(beat, &run);
        } else {
            std::fill_n(beat->onset_env, beat->frame_count - 1, 0.0);
        }
    } else if (beside != nullptr) {
        beside->run(beside->arg);
    }
    release_run(&run);
}
