// Part of stage 1, below mtsrc.h: the code that all formats except WAV share. A codec source pairs
// a container with a codec of the codec library.
//
// Input: the library's reader or demuxer and its decoder, in the handle. Output: PCM in the queue.
// Called by the operations of each format.
#ifndef TAVO_MEDIA_SOURCE_CODEC_SOURCE_H
#define TAVO_MEDIA_SOURCE_CODEC_SOURCE_H

#include "common/limits.h"
#include "media_source/mtsrc_ctx.h"
#include "media_source/wexaaudio.h"

constexpr int32_t kBitsPerSample = 16;  // of every stream
constexpr int32_t kReducedChannels =
    2;  // of AAC and FLAC, whose decoders are configured for stereo

// The source of compressed frames: a container, or the reader of a bare stream.
struct container_ops {
    // stream: the demuxer's stream, or the bare stream's reader.
    int32_t (*get_frm)(void *stream, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                       int64_t *second);
    int32_t (*seek)(void *stream, const int64_t *position, int64_t *reached);
    void (*close_stream)(void *stream);  // null for a bare stream
    void (*remove)(void *demux);         // deletes the demuxer or the reader
    void (*deinit)();                    // shuts down every codec that the open initialised
};

struct codec_ops {
    int32_t code;         // the codec library's code
    int32_t frame_bytes;  // largest compressed frame
    int32_t spare_bytes;  // bytes by which a frame's PCM may exceed q_room before its reduction
    int32_t min_rate;     // Hz; streams outside min_rate to max_rate are refused
    int32_t max_rate;     // Hz
    int32_t (*decode)(void *decoder, const wexa_frame *frame, wexa_output *output,
                      wexa_status *status);
    void (*reset)(void *decoder);
    void (*remove)(void *decoder);
};

struct codec_source {
    const container_ops *container;
    const codec_ops *codec;  // null if no decoder supports the codec
    // Reduces the decoded bytes at q_wr to one channel, in place. first: the value that get_frm
    // stored in *first for this compressed frame. Returns the number of bytes left.
    int32_t (*reduce)(const mtsrc_ctx *src, int32_t bytes, int64_t first);
};

// Index of the first audio track or stream, or -1.
int32_t codec_source_first_audio(const int32_t *kinds, int32_t count);

// The two usual reductions: to the first channel, and none, for PCM that already has one channel.
int32_t codec_source_reduce_to_first(const mtsrc_ctx *src, int32_t bytes, int64_t first);
int32_t codec_source_reduce_none(const mtsrc_ctx *src, int32_t bytes, int64_t first);

// Begins every open. init: the codec library's function; it returns 0 on success. Returns 0 with
// demux, dstream and decoder null; TAVO_ERR_HANDLE for a null handle; TAVO_ERR_OPEN if there is no
// probe file; TAVO_ERR_CODEC if init failed.
int32_t codec_source_begin_open(mtsrc_ctx *src, int32_t (*init)());

// Stores the decoder (may be null) and the stream's format in the handle, which owns the decoder.
// Returns 0, TAVO_ERR_CODEC without a decoder, or TAVO_ERR_FORMAT for an unsupported sample rate.
int32_t codec_source_set_decoder(mtsrc_ctx *src, const codec_ops &codec, void *decoder,
                                 const mtsrc_format &format);

// Finishes an open, whether it succeeded or failed. Frees the buffers of the tag record (may be
// null) and, if code is a failure, everything that was created. Returns code.
int32_t codec_source_end_open(const codec_source &source, mtsrc_ctx *src, wexa_tags *tags,
                              int32_t code);

// The other four operations of a format. They accept a null handle; close also accepts a handle
// whose open failed.
void codec_source_close(const codec_source &source, mtsrc_ctx *src);
int32_t codec_source_get_frm(const codec_source &source, mtsrc_ctx *src, int32_t want,
                             mtsrc_frame *frame);
int32_t codec_source_seek(const codec_source &source, mtsrc_ctx *src, int64_t position,
                          int64_t *reached);
int32_t codec_source_reset(const codec_source &source, mtsrc_ctx *src);

#endif
