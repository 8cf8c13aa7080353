// What the compressed formats share: frame, decoder, queue with its one retry, and the seeking,
// resetting and releasing around it. Each source gives its differences as a table of operations.
//
// In: the codec library's reader and decoder in the handle. Out: PCM in the queue.
#ifndef TAVO_MEDIA_SOURCE_CODEC_SOURCE_H
#define TAVO_MEDIA_SOURCE_CODEC_SOURCE_H

#include "common/limits.h"
#include "media_source/mtsrc_ctx.h"
#include "media_source/wexaaudio.h"

// Bytes of one compressed frame's buffer, of the formats that two sources know.
constexpr int32_t kAacFrameBytes = 24'576;
constexpr int32_t kMpegFrameBytes = 19'200;

constexpr int32_t kBitsPerSample = 16;   // of every stream's format
constexpr int32_t kReducedChannels = 2;  // of AAC and FLAC decoders, which are asked for stereo

struct codec_source_ops {
    // Of the codec library. reset and remove_decoder are null when no decoder serves the handle's
    // codec, and then decode is too.
    void (*close_stream)(void *stream);  // null without a container
    void (*remove_reader)(void *reader);
    void (*remove_decoder)(void *decoder);
    void (*reset)(void *decoder);
    int32_t (*decode)(void *decoder, const wexa_frame *frame, wexa_output *output,
                      wexa_status *status);
    void (*deinit)(void);

    // Of the source.
    int32_t (*read)(mtsrc_ctx *src, wexa_frame *frame, int64_t *first);
    int32_t (*move)(mtsrc_ctx *src, const int64_t *position, int64_t *reached);
    // Reduces the bytes decoded to q_wr in place and returns those that count.
    int32_t (*reduce)(const mtsrc_ctx *src, int32_t bytes, int64_t first);
    // Bytes that a decoded frame may take beyond q_room before its reduction.
    int32_t spare;
};

int32_t codec_source_get_frm(const codec_source_ops &ops, mtsrc_ctx *src, int32_t want,
                             mtsrc_frame *frame);
int32_t codec_source_seek(const codec_source_ops &ops, mtsrc_ctx *src, int64_t position,
                          int64_t *reached);
int32_t codec_source_reset(const codec_source_ops &ops, mtsrc_ctx *src);

// Accepts a handle whose open failed anywhere.
void codec_source_close(const codec_source_ops &ops, mtsrc_ctx *src);

// The end of every open after the library's initialisation: frees what the tag record (may be null)
// leads to and, when code is a failure, everything that was created. Returns code.
int32_t codec_source_finish_open(const codec_source_ops &ops, mtsrc_ctx *src, wexa_tags *tags,
                                 int32_t code);

// The usual reductions.
int32_t codec_source_keep_first(const mtsrc_ctx *src, int32_t bytes, int64_t first);
int32_t codec_source_keep_all(const mtsrc_ctx *src, int32_t bytes, int64_t first);

xaac_config codec_source_aac_config(int32_t sample_rate, int32_t channels);

#endif
