// Part of stage 1, below codec_source.h: the two codecs that occur both bare and in MP4.
//
// Input: the stream as its reader or its track describes it. Output: a decoder in the handle.
#ifndef TAVO_MEDIA_SOURCE_CODECS_H
#define TAVO_MEDIA_SOURCE_CODECS_H

#include "media_source/codec_source.h"

extern const codec_ops kAacCodec;
extern const codec_ops kMpegCodec;

// Creates the decoder. sample_rate: Hz; duration: 100-ns units. Returns 0; TAVO_ERR_CODEC without a
// decoder; TAVO_ERR_FORMAT for an unsupported sample rate or, in MPEG, a stream without channels.
int32_t create_aac_decoder(mtsrc_ctx *src, int32_t sample_rate, int32_t channels, int64_t duration);
int32_t create_mpeg_decoder(mtsrc_ctx *src, int32_t sample_rate, int32_t channels,
                            int64_t duration);

#endif
