// Stage 3: source-rate PCM becomes the analysis signal.
//
// In: 16-bit mono PCM at the stream's rate. Out: doubles on the 16-bit scale at the analysis rate.
// Whole ratios 1 to 4 are block-averaged on four threads; any other goes through a windowed-sinc
// interpolator with 961 phases. Before: pcm/decode.h. After: beat/beats.h.
#ifndef TAVO_PCM_RESAMPLE_H
#define TAVO_PCM_RESAMPLE_H

#include <pthread.h>

#include <cstddef>
#include <cstdint>

constexpr int32_t kResamplePhases = 961;  // fractional offsets -0.5 to 0.5 in steps of 1/960
constexpr int32_t kResampleRow = 25;      // room for the taps + 1 coefficients of a phase

struct dorn_resampler_state {
    int32_t taps;      // N: 20 for a ratio within 0.0001 of a whole number, else 19
    float ratio;       // source rate / target rate
    int32_t channels;  // interleaved, in and out
    float coef[kResamplePhases][kResampleRow];  // the first taps + 1 of a row used
};

// One of the four block-average threads; it writes out[first, end) only.
struct RESAMPLE_PART {
    int32_t index;
    const int16_t *in;  // [in_count]
    double *out;        // [out_count]
    float ratio;
    int64_t first;
    int64_t end;        // excluded
    int64_t in_count;   // samples
    int64_t out_count;  // samples
    pthread_t thread;
    int32_t *done;  // [count] shared
    int32_t count;
    pthread_mutex_t *mutex;  // ext_mutex_resample
    pthread_cond_t *cond;    // ext_cond_resample
};
static_assert(sizeof(void *) != 8 || offsetof(dorn_resampler_state, coef) == 12);
static_assert(sizeof(void *) != 8 ||
              (offsetof(RESAMPLE_PART, first) == 32 && offsetof(RESAMPLE_PART, done) == 72));
static_assert(sizeof(void *) != 8 || offsetof(RESAMPLE_PART, cond) == 96);

extern "C" {

// The block-average group's lock and condition, for the length of one conversion; else null.
extern pthread_mutex_t *ext_mutex_resample;
extern pthread_cond_t *ext_cond_resample;

// Converts bytes / 2 samples. On success *out is a new array of *out_len doubles (64 cleared bytes
// follow them), the caller's to free. Returns 0; -2 out of memory, or sizes or a source rate that
// give no length, with *out null and *out_len 0. Input beyond 2^31 - 1 samples is left out by the
// interpolator: its part of the output is 0.
int32_t dorn_resampler_run(const int16_t *pcm, int64_t bytes, int32_t source_rate, int32_t ana_rate,
                           int64_t *out_len, double **out);

// Block average of count samples into out[n]. Leaves out as it was when memory runs out. Makes the
// lock itself when there is none.
void resamplePcmMonoMT(const int16_t *in, int64_t count, int32_t source_rate, double *out,
                       int64_t n, int32_t ana_rate);

// Thread entry of one part, and its completion handler. The argument is the RESAMPLE_PART.
void *_resampleMT(void *part);
void resampleMT_thd_cleanup(void *part);

// Fills a cleared state. Returns 0; -1 when the target rate is not positive or the source rate is
// 0. A source rate below 0 gives a table of no use: the conversion refuses it.
int32_t dorn_resampler_prepare(dorn_resampler_state *state, int32_t source_rate,
                               int32_t target_rate, int32_t channels);

// Converts in_len samples (all channels together). Returns the samples written to out, 0 when the
// input is too short for one; -1 for a missing argument or a phase out of range.
int32_t dorn_resampler_convert(const dorn_resampler_state *state, const int16_t *in, int32_t in_len,
                               int16_t *out);
}

#endif
