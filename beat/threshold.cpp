#include "beat/threshold.h"

#include "common/worker_group.h"
#include "dsp/peaks.h"

namespace {

constexpr int32_t kPercentile = 97;

int32_t percentile_index(int32_t count, int32_t percentile) {
    return static_cast<int32_t>(int64_t{count} * percentile / 100);
}

// Moves sorted[pos] up to its sorted position among otherwise ascending values. NaNs (from silent
// input) are left in place.
void move_up(double *sorted, int32_t pos, int32_t count) {
    const double value = sorted[pos];
    for (; pos + 1 < count && sorted[pos + 1] < value; ++pos) sorted[pos] = sorted[pos + 1];
    sorted[pos] = value;
}

void move_down(double *sorted, int32_t pos) {
    const double value = sorted[pos];
    for (; pos > 0 && sorted[pos - 1] > value; --pos) sorted[pos] = sorted[pos - 1];
    sorted[pos] = value;
}

void sort_ascending(double *values, int32_t count) {
    for (int32_t i = 1; i < count; ++i) move_down(values, i);
}

// Returns the 97th percentile (kPercentile) of env[count]. Overwrites scratch[count].
double percentile_of(const double *env, int32_t count, double *scratch) {
    for (int32_t i = 0; i < count; ++i) scratch[i] = env[i];
    sort_ascending(scratch, count);
    return scratch[percentile_index(count, kPercentile)];
}

// Slides a sorted window over the worker's range. At index i, the window starts half a window
// length before i. Each step replaces the value that leaves the window with the one that enters it.
void slide_window(TAVO_THRES_WORKER *worker, double *win) {
    const int32_t size = worker->window;
    const int32_t half = size / 2;
    const int32_t rank = percentile_index(size, worker->percentile);
    const double *env = worker->onset_env;
    for (int32_t k = 0; k < size; ++k) win[k] = env[worker->first - half + k];
    sort_ascending(win, size);

    for (int64_t i = worker->first; i <= worker->last; ++i) {
        if (i > worker->first) {
            const int32_t pos = findIndex(win, size, env[i - 1 - half]);
            const double old = win[pos];
            win[pos] = env[i - half + size - 1];
            if (old < win[pos]) {
                move_up(win, pos, size);
            } else {
                move_down(win, pos);
            }
        }
        worker->thr[i] = win[rank];
        if (worker->thr[i] > worker->running_max) worker->running_max = worker->thr[i];
    }
}

// Computes a worker's range of the threshold. If memory runs out, sets the record's `thr` to null
// so that run_workers can report the failure.
void run_thres_worker(void *record) {
    auto *worker = static_cast<TAVO_THRES_WORKER *>(record);
    if (worker->first > worker->last || worker->window < 1) return;
    auto *win = zeroed_items<double>(worker->window);
    if (win == nullptr) {
        worker->thr = nullptr;
        return;
    }
    slide_window(worker, win);
    free(win);
}

// Divides the indices that have a full window into four equal ranges. If no index has a full
// window, all ranges are empty. An index on a boundary belongs only to the earlier worker so that
// no two threads write the same value.
void fill_workers(const TAVO_BEAT_CTX *beat, int32_t window, double *thr,
                  TAVO_THRES_WORKER *workers, int32_t *done) {
    const int64_t count = beat->frame_count - 1;
    const int64_t half = window / 2;
    const int64_t length = (count - window) / kBeatWorkers;
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        TAVO_THRES_WORKER *worker = &workers[id];
        const bool is_last = id == kBeatWorkers - 1;
        worker->id = id;
        worker->thr = thr;
        worker->onset_env = beat->onset_env;
        worker->first = id * length + half + (id == 0 ? 0 : 1);
        worker->last = is_last ? count - half : (id + 1) * length + half;
        if (beat->frame_count < window) worker->last = worker->first - 1;
        worker->window = window;
        worker->percentile = kPercentile;
        worker->done_flags = done;
        worker->thread_count = kBeatWorkers;
        worker->mutex = feat_mutex_mt;
        worker->cond = feat_cond_mt;
    }
}

// Fills the middle of `thr` on four threads and raises *top to the largest value written.
int32_t run_workers(const TAVO_BEAT_CTX *beat, int32_t window, double *thr, double *top) {
    TAVO_THRES_WORKER workers[kBeatWorkers] = {};
    int32_t done[kBeatWorkers] = {};
    worker_slot slots[kBeatWorkers];
    fill_workers(beat, window, thr, workers, done);
    for (int32_t id = 0; id < kBeatWorkers; ++id) {
        slots[id] = {&workers[id], &workers[id].thread, _tavo_proc_beatcandi, run_thres_worker};
    }
    worker_group_run(slots, kBeatWorkers, feat_mutex_mt, feat_cond_mt, done);

    for (const TAVO_THRES_WORKER &worker : workers) {
        if (worker.thr == nullptr) return TAVO_ERR_MEMORY;
        if (worker.running_max > *top) *top = worker.running_max;
    }
    return 0;
}

// Fills the part after the last full window with a straight line towards `top`.
void ramp_tail(double *thr, int64_t count, int32_t window, double top) {
    const int64_t fitting = count - window / 2;
    const int64_t start = fitting > 1 ? fitting : 1;
    const double slope = (top - thr[start - 1]) / (window * 0.5);
    for (int64_t i = start; i < count; ++i) {
        thr[i] = top - slope * static_cast<double>(count - i);
    }
}

// Fills the part before the first full window. Each index gets the percentile of a one-second
// window around it, which the end of a short signal may cut off. The first half second stays 0.
void fill_head(const TAVO_BEAT_CTX *beat, int32_t window, int32_t second, double *thr,
               double *scratch) {
    const int64_t count = beat->frame_count - 1;
    const int64_t end = window / 2 < count ? window / 2 : count;
    for (int64_t i = second / 2; i < end; ++i) {
        const int64_t start = i - second / 2;
        const int64_t rest = beat->frame_count - start;
        const int32_t size = rest < second ? static_cast<int32_t>(rest) : second;
        thr[i] = percentile_of(beat->onset_env + start, size, scratch);
    }
}

}  // namespace

void _thd_thres_cleanup(void *record) {
    const auto *worker = static_cast<const TAVO_THRES_WORKER *>(record);
    worker_group_done(worker->mutex, worker->cond, worker->done_flags, worker->thread_count,
                      worker->id);
}

void *_tavo_proc_beatcandi(void *record) {
    run_worker(record, run_thres_worker, _thd_thres_cleanup);
}

int32_t build_threshold(const TAVO_BEAT_CTX *beat, int32_t window, float hop, double *thr) {
    const int64_t frames = beat->frame_count;
    const int64_t half = window / 2;
    if (feat_mutex_mt == nullptr || feat_cond_mt == nullptr) return TAVO_ERR_MEMORY;
    const auto second = static_cast<int32_t>(1.0f / hop);
    auto *scratch = zeroed_items<double>(window > second ? window : second);
    if (scratch == nullptr) return TAVO_ERR_MEMORY;

    double top = 0.0;
    const int32_t code = run_workers(beat, window, thr, &top);
    if (code == 0 && window >= 2) {
        // If the envelope is one or two values shorter than the window, the middle entry gets the
        // percentile of all values.
        if (frames < window && frames >= window - 2 && half < frames - 1) {
            thr[half] = percentile_of(beat->onset_env, static_cast<int32_t>(frames), scratch);
            if (thr[half] > top) top = thr[half];
        }
        ramp_tail(thr, frames - 1, window, top);
        fill_head(beat, window, second, thr, scratch);
    }
    free(scratch);
    return code;
}
