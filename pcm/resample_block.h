// Stage 3 for the ratios 1, 2, 3 and 4: averages blocks of samples on four threads.
//
// Input: 16-bit mono PCM. Output: doubles on the 16-bit scale. Called by pcm/resample.cpp.
#pragma once

#include <pthread.h>

#include <cstddef>
#include <cstdint>

constexpr int32_t kMaxWholeRatio = 4;

// One of the four averaging threads. It writes only out[first .. end - 1].
struct RESAMPLE_PART {
    int32_t index;
    const int16_t *in;  // [in_count]
    double *out;        // [out_count]
    float ratio;
    int64_t first;      // first output
    int64_t end;        // end of the outputs, exclusive
    int64_t in_count;   // samples
    int64_t out_count;  // samples
    pthread_t thread;
    int32_t *done;  // [count] shared
    int32_t count;
    pthread_mutex_t *mutex;  // ext_mutex_resample
    pthread_cond_t *cond;    // ext_cond_resample
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(RESAMPLE_PART, first) == 32 && offsetof(RESAMPLE_PART, done) == 72));
static_assert(sizeof(void *) != 8 || offsetof(RESAMPLE_PART, cond) == 96);

extern "C" {

// The lock and condition of the averaging threads. They exist during a conversion and are null
// otherwise.
extern pthread_mutex_t *ext_mutex_resample;
extern pthread_cond_t *ext_cond_resample;

// Averages blocks of in[count] and stores the means in out[n]. Leaves `out` unchanged if memory
// runs out. Creates the lock if it does not exist.
void resamplePcmMonoMT(const int16_t *in, int64_t count, int32_t source_rate, double *out,
                       int64_t n, int32_t ana_rate);

// The thread entry of a part and its completion handler. Both receive the RESAMPLE_PART.
void *_resampleMT(void *part);
void resampleMT_thd_cleanup(void *part);
}

// Returns the ratio if it is a whole number from 1 to kMaxWholeRatio; otherwise 0.
int32_t whole_ratio(float ratio);

// Same as resamplePcmMonoMT, but the lock must exist. At ratio 4, `in` and `out` may be the same
// memory. Returns false if memory runs out.
bool average_on_threads(const int16_t *in, int64_t count, float ratio, double *out, int64_t n);
