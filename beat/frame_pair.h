// Stage 4, inside: the power in the mel bands of two frames of 512 samples, side by side in vector
// lanes, with the bits that tavo_fft_proc and MultiplyMtxs give to each frame alone.
//
// In: samples, the analysis window, the mel matrix. Out: [bands] powers for each of the frames.
// Caller: beat/onset_envelope.cpp.
#ifndef TAVO_BEAT_FRAME_PAIR_H
#define TAVO_BEAT_FRAME_PAIR_H

#include <cstdint>

#include "common/tavo_ctx.h"
#include "dsp/fft.h"
#include "dsp/lanes.h"

constexpr int32_t kPairBins = kFrameSize / 2;
constexpr int32_t kPairGroups = kFrameSize / 8;  // groups of eight elements in the third stage

// The bins of one band, with the zero weights between them.
struct band_span {
    int32_t first;               // bin
    int32_t count;               // bins
    const double_pair *weights;  // [count] each twice
};

// Read-only once made: shared by the workers.
struct pair_tables {
    double_pair cosine[kPairBins];  // cos(2 pi k / 512), each twice
    double_pair sine[kPairBins];    // -sin(2 pi k / 512), each twice
    double window[kFrameSize];
    int32_t order[kPairGroups];  // the group whose first sample is the frame's sample i
    int32_t band_count;
    band_span *bands;      // [band_count]
    double_pair *weights;  // of all bands
};

// For frames of 512 samples: window[512], the FFT context of that size, matrix[256][bands]. Null
// when memory runs out or a weight is not finite: frames then go one by one.
pair_tables *make_pair_tables(const double *window, const TAVO_FFT_CTX *fft, float *const *matrix,
                              int32_t bands);
// Null does nothing.
void release_pair_tables(pair_tables *tables);

// first, second: [512] samples of the two frames, which may overlap. to_first, to_second: [bands].
// False when a value on the way is not finite; the outputs then mean nothing.
bool take_pair(const pair_tables *tables, const double *first, const double *second,
               double *to_first, double *to_second);

#endif
