// Sets up stage 4: creates the context of one beat analysis and the lock of its worker groups.
//
// Input: a TAVO_CTX with ana, ana_len, ana_rate and onset. Output: a TAVO_BEAT_CTX, which lives for
// one call to getBeatPosition.
#pragma once

#include <pthread.h>

#include <cstddef>
#include <cstdint>

#include "common/alloc.h"
#include "common/tavo_ctx.h"

constexpr int32_t kMelBands = 36;
constexpr int32_t kBeatWorkers = 4;

// In the array sizes below, F is frame_count, n is the length of the analysis signal in samples,
// and N is the length of an analysis frame in samples.
struct TAVO_BEAT_CTX {
    double *onset_env;     // [F] spectral flux per analysis frame; the last entry stays 0
    float **mel_matrix;    // [N / 2] rows, one per FFT bin, of [36] band weights
    float *frame_times;    // [F] seconds; entry k is the time after k + 1 hops
    double *signal;        // [n] ana divided by 32767
    double *threshold;     // [F] the threshold curve; the last entry stays 0
    int32_t *rise_frames;  // [rise_count] analysis frames in which power rises start; may be null
    int32_t rise_count;
    int32_t *rise_flags;  // [n] 1 at each sample where a power rise starts, otherwise 0
    int32_t half_frame;   // N / 2
    int64_t frame_count;  // F
    double hop_seconds;
    int32_t band_count;  // 36
};

static_assert(sizeof(void *) != 8 || (offsetof(TAVO_BEAT_CTX, rise_flags) == 56 &&
                                      offsetof(TAVO_BEAT_CTX, band_count) == 88));

// A view of the analysis signal. Dividing a sample by full_scale gives a value in the nominal range
// -1 to 1. full_scale is 32767 for TAVO_CTX.ana and 1 for TAVO_BEAT_CTX.signal.
struct sample_view {
    const double *samples;
    double full_scale;
};

constexpr double kFullScale = 32767.0;  // full scale of TAVO_CTX.ana

extern "C" {

// The lock and condition that both worker groups in this folder share. They exist from __beat_init
// to __tavo_deinit and are null otherwise.
extern pthread_mutex_t *feat_mutex_mt;
extern pthread_cond_t *feat_cond_mt;

// Fills the zeroed `beat` from `ctx`. If memory runs out, some pointers in `beat` stay null.
void __beat_init(TAVO_CTX *ctx, TAVO_BEAT_CTX *beat);

// Releases the lock, the condition and everything that the context owns, but not the context.
void __tavo_deinit(TAVO_BEAT_CTX *beat);

// Fills matrix[bin][band] for the lower nfft / 2 bins with the weights of `nbands` triangular
// filters, which have unit area and are equally spaced on the mel scale from 0 to `fmax` Hz.
void fft2melmtx(int32_t sr, int32_t nfft, int32_t fmax, uint32_t nbands, float **matrix);
}

// Divides the first `count` samples of `view` by its full scale and stores the results in `scaled`.
void scale_samples(sample_view view, int64_t count, double *scaled);

// Implements __beat_init. If with_signal is false, `signal` and rise_flags stay null, which saves
// 12 bytes per sample; jobs pass false because they read `ana` directly. Returns false if the lock
// or any other field cannot be allocated.
bool init_beat_ctx(const TAVO_CTX *ctx, bool with_signal, TAVO_BEAT_CTX *beat);

// Returns the length of the analysis signal in samples, or 0 if `ana` is null.
inline int64_t analysis_length(const TAVO_CTX *ctx) {
    return ctx->ana != nullptr && ctx->ana_len > 0 ? ctx->ana_len : 0;
}
