// Part of stage 1: the code that all formats except WAV share. A codec source combines a container
// with a codec of the codec library.
//
// Input: the codec library's reader or demuxer and its decoder, both stored in the handle. Output:
// PCM in the handle's queue. Called by the format sources.
#pragma once

#include "common/limits.h"
#include "media_source/mtsrc_ctx.h"
#include "media_source/wexaaudio.h"

constexpr int32_t kBitsPerSample = 16;   // of every stream
constexpr int32_t kReducedChannels = 2;  // the AAC and FLAC decoders are configured for stereo

// The codec library's functions that deliver compressed frames: those of a container's demuxer, or
// of a bare stream's reader.
struct container_ops {
    // `stream` is the demuxer's stream or, for a bare stream, its reader.
    int32_t (*get_frm)(void *stream, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                       int64_t *second);
    int32_t (*seek)(void *stream, const int64_t *position, int64_t *reached);
    void (*close_stream)(void *stream);  // null for a bare stream
    void (*remove)(void *demux);         // deletes the demuxer or the reader
    void (*deinit)();                    // shuts down every codec that open initialised
};

struct codec_ops {
    int32_t code;         // codec code of the codec library
    int32_t frame_bytes;  // largest compressed frame
    int32_t spare_bytes;  // bytes by which a frame's PCM may exceed q_room before it is reduced
    int32_t min_rate;     // Hz; streams with a lower rate, or one above max_rate, are refused
    int32_t max_rate;     // Hz
    int32_t (*decode)(void *decoder, const wexa_frame *frame, wexa_output *output,
                      wexa_status *status);
    void (*reset)(void *decoder);
    void (*remove)(void *decoder);
};

struct codec_source {
    const container_ops *container;
    const codec_ops *codec;  // null if no decoder supports the codec
    // Reduces the decoded PCM at q_wr to one channel, in place. `first` is the value that get_frm
    // stored in *first for this compressed frame. Returns the size of the result in bytes.
    int32_t (*reduce)(const mtsrc_ctx *src, int32_t bytes, int64_t first);
};

// Returns the index of the first audio entry of kinds[count], or -1.
int32_t codec_source_first_audio(const int32_t *kinds, int32_t count);

// For codec_source.reduce: keeps only the first channel.
int32_t codec_source_reduce_to_first(const mtsrc_ctx *src, int32_t bytes, int64_t first);
// For codec_source.reduce: changes nothing, because the PCM already has one channel.
int32_t codec_source_reduce_none(const mtsrc_ctx *src, int32_t bytes, int64_t first);

// Starts opening a source: calls `init`, then sets demux, dstream and decoder to null. `init` is a
// function of the codec library that returns 0 on success. Returns 0, TAVO_ERR_HANDLE for a null
// handle, TAVO_ERR_OPEN without a probe file, or TAVO_ERR_CODEC if `init` fails.
int32_t codec_source_begin_open(mtsrc_ctx *src, int32_t (*init)());

// Stores the decoder and the stream's format in the handle, which then owns the decoder. Returns 0,
// TAVO_ERR_CODEC if the decoder is null, or TAVO_ERR_FORMAT for an unsupported sample rate.
int32_t codec_source_set_decoder(mtsrc_ctx *src, const codec_ops &codec, void *decoder,
                                 const mtsrc_format &format);

// Finishes opening a source, whether the open succeeded or failed. Frees the buffers of the tag
// record, which may be null. If `code` is a failure, also closes the source. Returns `code`.
int32_t codec_source_end_open(const codec_source &source, mtsrc_ctx *src, wexa_tags *tags,
                              int32_t code);

// All operations of a source except open. They accept a null handle; close also accepts a handle
// whose open failed.
void codec_source_close(const codec_source &source, mtsrc_ctx *src);
int32_t codec_source_get_frm(const codec_source &source, mtsrc_ctx *src, int32_t want,
                             mtsrc_frame *frame);
int32_t codec_source_seek(const codec_source &source, mtsrc_ctx *src, int64_t position,
                          int64_t *reached);
int32_t codec_source_reset(const codec_source &source, mtsrc_ctx *src);
