// Reads a media source until a buffer is full.
//
// Input: a media source that has been positioned. Output: bytes of 16-bit mono PCM. Called by
// pcm/decode.cpp to decode a segment and by pcm/from_highlight.cpp to decode some PCM at the
// highlight.
#pragma once

#include "media_source/mtsrc.h"

constexpr int64_t kReadBytes = 8192;  // size of the largest single read

// Reads from the source's position until `dst` holds `capacity` bytes, the stream ends or the
// source fails. *got is the number of bytes read so far, updated after each read. The bytes of a
// failed read do not count.
void read_pcm(mtsrc_ctx *src, uint8_t *dst, int64_t capacity, int64_t *got);
