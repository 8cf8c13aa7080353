// Part of stage 1: AAC and MPEG audio, the codecs that occur both as bare streams and in MP4.
//
// Input: a stream's properties, from its reader or MP4 track. Output: a decoder in the handle.
#pragma once

#include "media_source/codec_source.h"

extern const codec_ops kAacCodec;
extern const codec_ops kMpegCodec;

// Create the decoder. `sample_rate` is in Hz, `duration` in 100-ns units. Both return 0,
// TAVO_ERR_CODEC if the decoder cannot be created, or TAVO_ERR_FORMAT for an unsupported sample
// rate or an MPEG stream without channels.
int32_t create_aac_decoder(mtsrc_ctx *src, int32_t sample_rate, int32_t channels, int64_t duration);
int32_t create_mpeg_decoder(mtsrc_ctx *src, int32_t sample_rate, int32_t channels,
                            int64_t duration);
