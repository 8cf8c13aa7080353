// Reads a media source until a buffer is full.
//
// In: a positioned source. Out: 16-bit mono PCM, bytes. Called for a segment (pcm/decode_run.cpp)
// and for the probe at a highlight (pcm/from_highlight.cpp).
#ifndef TAVO_PCM_READ_PCM_H
#define TAVO_PCM_READ_PCM_H

#include "media_source/mtsrc.h"

constexpr int64_t kReadBytes = 8192;  // largest single request to a source

// Fills dst with up to capacity bytes from the source's position, until it is full, the stream
// ends or the source fails; the bytes of a failed call are not counted. Returns the bytes.
int64_t read_pcm(mtsrc_ctx *src, uint8_t *dst, int64_t capacity);

// Whether a read has failed since the failure was last cleared, which tavo_decode_init does. The
// record is process-wide, as the decoding is: one instance at a time.
bool has_read_failed();
void clear_read_failure();

#endif
