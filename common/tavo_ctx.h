// Records that several folders share: the instance, TAVO_CTX, and its parts.
//
// The instance owns everything reachable through its pointers, except the callback. Decoding counts
// time in 100-ns units (10,000,000 per second); results are in milliseconds. core/instance.h
// creates and releases instances.
#pragma once

#include <pthread.h>

#include <cstddef>
#include <cstdint>

#include "include/tavo.h"

struct TAVO_DECSEG;  // pcm/decode.h

// States of an instance. Finished and failed are final.
constexpr int32_t kStateReady = 1;
constexpr int32_t kStateRunning = 2;
constexpr int32_t kStateFinished = 3;
constexpr int32_t kStateFailed = 4;

constexpr int64_t kUnitsPerSecond = 10'000'000;  // 100-ns units
constexpr int64_t kUnitsPerMs = 10'000;

constexpr int32_t kAnalysisRate = 11025;  // Hz, modes 1 and 2
constexpr int32_t kFrameSize = 512;       // samples at the analysis rate
constexpr int32_t kHopSize = 256;         // samples at the analysis rate

// Format of the stream, as the media source reports it.
struct TAVO_FMT {
    int32_t sample_rate;  // Hz
    int32_t channels;     // channels of the decoder's output; the delivered PCM is always mono
    int32_t bits;         // 16
};

// Context of the highlight search, in modes 0 and 2.
struct TAVO_HL_CTX {
    int32_t hl_param;     // requested highlight length in seconds; 0 or less for none
    float *power;         // [power_count] one loudness value per 2 s, owned
    int32_t power_count;  // number of values in power
    uint32_t hl_pos;      // highlight start, milliseconds
};

// Context of the beat analysis, in modes 1 and 2.
struct TAVO_ONSET_CTX {
    int32_t max_beats;    // maximum number of threshold-selected beats; 0 or less for no limit
    int32_t beat_param2;  // stored, never read
    int32_t beat_count;   // entries of beat_times
    float *beat_times;    // [beat_count] ms, ascending, owned; TAVO_INFO.beat_times points here
    int32_t bpm;          // tempo estimate, 30 to 200
    int32_t frame_size;   // samples
    int32_t hop_size;     // samples
};

struct TAVO_CTX {
    char magic[4];          // "ZEKA", written last when the instance is created
    int32_t quit;           // 1 once a stop has been requested; atomic access only
    int16_t *pcm;           // source-rate PCM, mono; null once converted
    int64_t pcm_bytes;      // capacity before decoding, number of decoded bytes afterwards
    double *ana;            // analysis signal on the 16-bit scale, mono
    int64_t ana_len;        // samples in ana
    int32_t ana_rate;       // Hz: 11025, or 0 in mode 0
    TAVO_DECSEG *seg;       // [1 or 4] decoding segments
    TAVO_FMT fmt;           // format of the stream
    int64_t duration;       // duration of the stream, 100-ns units
    TAVO_ONSET_CTX *onset;  // modes 1 and 2
    TAVO_HL_CTX *hl;        // modes 0 and 2
    TAVO_CALLBACK callback;
    pthread_t worker;   // the job's thread; zero before tavo_analyze
    int32_t state;      // kState*; atomic access only
    int32_t mode;       // TAVO_MODE_*
    TAVO_INFO *info;    // the result record
    int32_t seg_count;  // segments of the current plan, 1 or 4
};

static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_HL_CTX, power) == 8 && offsetof(TAVO_HL_CTX, hl_pos) == 20));
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_ONSET_CTX, beat_times) == 16 && sizeof(TAVO_ONSET_CTX) == 40));
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_CTX, pcm) == 8 && offsetof(TAVO_CTX, ana_rate) == 40));
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_CTX, fmt) == 56 && offsetof(TAVO_CTX, duration) == 72));
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_CTX, worker) == 104 && offsetof(TAVO_CTX, seg_count) == 128));
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_INFO, beat_times) == 8 && offsetof(TAVO_INFO, status) == 16));

// Read and write a flag (state, quit) that one thread sets and others read without a lock.
inline int32_t load_flag(const int32_t *flag) {
    return __atomic_load_n(flag, __ATOMIC_ACQUIRE);
}
inline void store_flag(int32_t *flag, int32_t value) {
    __atomic_store_n(flag, value, __ATOMIC_RELEASE);
}
