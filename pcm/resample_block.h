// Stage 3, whole ratios from 1 to 4: the mean of each block of samples, on four threads.
//
// In: 16-bit mono PCM. Out: doubles on the 16-bit scale. Called by pcm/resample.cpp.
#ifndef TAVO_PCM_RESAMPLE_BLOCK_H
#define TAVO_PCM_RESAMPLE_BLOCK_H

#include <pthread.h>

#include <cstddef>
#include <cstdint>

constexpr int32_t kMaxWholeRatio = 4;

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
static_assert(sizeof(void *) != 8 ||
              (offsetof(RESAMPLE_PART, first) == 32 && offsetof(RESAMPLE_PART, done) == 72));
static_assert(sizeof(void *) != 8 || offsetof(RESAMPLE_PART, cond) == 96);

extern "C" {

// The block-average group's lock and condition, for the length of one conversion; else null.
extern pthread_mutex_t *ext_mutex_resample;
extern pthread_cond_t *ext_cond_resample;

// Block average of count samples into out[n]. Leaves out as it was if memory runs out. Makes the
// lock itself if none exists.
void resamplePcmMonoMT(const int16_t *in, int64_t count, int32_t source_rate, double *out,
                       int64_t n, int32_t ana_rate);

// Thread entry of one part, and its completion handler. The argument is the RESAMPLE_PART.
void *_resampleMT(void *part);
void resampleMT_thd_cleanup(void *part);
}

// The ratio as a whole number from 1 to kMaxWholeRatio; 0 for any other.
int32_t whole_ratio(float ratio);

// resamplePcmMonoMT under a lock that exists. out may be the memory of in at ratio 4. Returns false
// if memory runs out.
bool average_on_threads(const int16_t *in, int64_t count, float ratio, double *out, int64_t n);

#endif
