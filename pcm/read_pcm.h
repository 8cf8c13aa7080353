// Reads a media source until a buffer is full.
//
// In: a positioned source. Out: 16-bit mono PCM, bytes. Called for a segment (pcm/decode.cpp) and
// for the probe at a highlight (pcm/from_highlight.cpp).
#ifndef TAVO_PCM_READ_PCM_H
#define TAVO_PCM_READ_PCM_H

#include "media_source/mtsrc.h"

constexpr int64_t kReadBytes = 8192;  // largest single request to a source

// Fills dst with up to capacity bytes from the source's position, until it is full, the stream
// ends or the source fails. *got: the bytes, from 0 on, growing with each read; those of a failed
// read are not counted.
void read_pcm(mtsrc_ctx *src, uint8_t *dst, int64_t capacity, int64_t *got);

#endif
