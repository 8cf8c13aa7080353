// Reading a media source until a buffer is full.
//
// In: a positioned source. Out: 16-bit mono PCM, bytes. Called for a segment's share
// (pcm/decode_run.cpp) and for the probe at a highlight (pcm/from_highlight.cpp).
#ifndef TAVO_PCM_READ_PCM_H
#define TAVO_PCM_READ_PCM_H

#include "media_source/mtsrc.h"

constexpr int64_t kReadBytes = 8192;  // largest single request to a source

// Fills dst with up to capacity bytes from where the source stands, until it is full, the stream
// ends or the source fails; the bytes of a failed call are not counted. Returns the bytes.
int64_t read_pcm(mtsrc_ctx *src, uint8_t *dst, int64_t capacity);

#endif
