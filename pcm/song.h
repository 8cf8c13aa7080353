// The jobs' forms of stages 2 and 3: the bytes and samples of DecodePcmMT and dorn_resampler_run,
// with each buffer given back, or used for its successor, as soon as nothing reads it any more.
//
// In: a plan of pcm/decode.h. Out: TAVO_CTX.pcm, then ana. Called by core/jobs.cpp and
// pcm/from_highlight.cpp.
#ifndef TAVO_PCM_SONG_H
#define TAVO_PCM_SONG_H

#include "pcm/decode.h"

extern "C" {

// Decodes the plan into pcm, as large as pcm_bytes says, and sets pcm_bytes to the bytes decoded, 0
// on failure. The segments' buffers are freed.
void decode_song(TAVO_CTX *ctx);

// Converts pcm without its first off bytes into a new ana of ana_len samples at ana_rate. pcm is
// freed and null in any case. Returns the codes of dorn_resampler_run.
int32_t convert_song(TAVO_CTX *ctx, int64_t off);
}

// Frees the segment's buffer.
void free_segment_buffer(TAVO_DECSEG *seg);

#endif
