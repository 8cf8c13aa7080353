// Stage 4: computes the onset envelope, the mean change of the mel spectrum per analysis frame.
//
// Input: the analysis signal. Output: TAVO_BEAT_CTX.onset_env, one value per hop (256 samples at
// 11025 Hz), divided by the standard deviation of all values. Follows beat/beat_ctx.h and precedes
// beat/tempo.h and beat/threshold.h.
#pragma once

#include "beat/beat_ctx.h"
#include "common/worker_group.h"
#include "dsp/fft.h"

// One of the four threads that compute the onset envelope. It writes only its own analysis frames.
struct TAVO_ONSET_WORKER {
    int32_t id;  // 0 to 3, also the worker's index in done_flags
    pthread_t thread;
    const double *signal;     // [n]
    int64_t first;            // first analysis frame
    int64_t last;             // last analysis frame, inclusive
    float **spectrum;         // [F] rows of [N / 2], shared
    int32_t frame_size;       // N
    int32_t hop_size;         // H
    int64_t first_sample;     // start of the first analysis frame
    const TAVO_FFT_CTX *fft;  // tables for size N, shared, read-only
    int32_t *done_flags;      // [thread_count] shared
    int32_t thread_count;     // 4
    pthread_mutex_t *mutex;   // feat_mutex_mt
    pthread_cond_t *cond;     // feat_cond_mt
    int32_t band_count;       // 36
    float **mel_matrix;       // shared, read-only
    double **mel;             // [F] rows of [36] decibels, shared
    const double *window;     // [N] shared, read-only
};
static_assert(sizeof(void *) != 8 || (offsetof(TAVO_ONSET_WORKER, fft) == 64 &&
                                      offsetof(TAVO_ONSET_WORKER, window) == 128));

extern "C" {

// Fills onset_env[0 .. F - 2] on four threads, or leaves it unchanged if memory runs out. Reads
// only signal, frame_count and mel_matrix (frame_size / 2 rows of 36 weights) from the context.
// frame_size and hop_size are in samples; frame_size is a power of two from 2 to 16384.
void _getOnsetEnvelope(TAVO_BEAT_CTX *beat, int32_t frame_size, int32_t hop_size);

// The thread entry of a worker and its completion handler. Both receive the TAVO_ONSET_WORKER.
void *_tavo_proc_onsetenv(void *record);
void _thd_cleanup(void *record);
}

// Implements _getOnsetEnvelope, but reads the samples of `view`, because jobs leave the context's
// signal null. If `side` is not null, the calling thread runs the side work exactly once, even if
// the envelope cannot be computed.
void compute_onset_envelope(TAVO_BEAT_CTX *beat, sample_view view, int32_t frame_size,
                            int32_t hop_size, const side_work *side);
