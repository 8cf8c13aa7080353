// Reads a media source until a buffer is full.
//
// Input: a positioned source. Output: 16-bit mono PCM, bytes. Called by pcm/decode.cpp for a
// segment and by pcm/from_highlight.cpp for the probe at a highlight.
#ifndef TAVO_PCM_READ_PCM_H
#define TAVO_PCM_READ_PCM_H

#include "media_source/mtsrc.h"

constexpr int64_t kReadBytes = 8192;  // largest single read

// Fills dst from the source's position until it holds capacity bytes, the stream ends or the source
// fails. *got is the number of bytes so far, updated after each read. The bytes of a failed read do
// not count.
void read_pcm(mtsrc_ctx *src, uint8_t *dst, int64_t capacity, int64_t *got);

#endif
