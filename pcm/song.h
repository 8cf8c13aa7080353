// The jobs' forms of stages 2 and 3. They give the bytes and samples of DecodePcmMT,
// dorn_resampler_run and tavo_get_from_here, but free each buffer, or use it for its successor, as
// soon as nothing reads it any more.
//
// In: a plan of pcm/decode.h. Out: TAVO_CTX.pcm, then ana. Called by core/jobs.cpp.
#ifndef TAVO_PCM_SONG_H
#define TAVO_PCM_SONG_H

#include "pcm/decode.h"

extern "C" {

// Decodes the plan into pcm, as large as pcm_bytes says, and sets pcm_bytes to the bytes decoded, 0
// on failure. pcm may move. The segments' buffers are freed: the segments are decoded in parts of
// pcm.
void decode_song(TAVO_CTX *ctx);

// tavo_get_from_here, which see; a second decoding leaves no segment buffers behind.
int32_t start_song_at(TAVO_CTX *ctx, int64_t pos);

// Converts pcm without its first off bytes into a new ana of ana_len samples at ana_rate. pcm is
// freed and null in any case. Returns the codes of dorn_resampler_run.
int32_t convert_song(TAVO_CTX *ctx, int64_t off);
}

// Frees the segment's buffer.
void free_segment_buffer(TAVO_DECSEG *seg);

#endif
