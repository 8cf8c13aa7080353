// Stage 1, below mtsrc.h: the code that all formats except WAV share. A codec source pairs a
// container with a codec of the codec library.
//
// In: the library's reader or demuxer and its decoder, in the handle. Out: PCM in the queue.
// Called by the operations of each format.
#ifndef TAVO_MEDIA_SOURCE_CODEC_SOURCE_H
#define TAVO_MEDIA_SOURCE_CODEC_SOURCE_H

#include "common/limits.h"
#include "media_source/mtsrc_ctx.h"
#include "media_source/wexaaudio.h"

constexpr int32_t kBitsPerSample = 16;   // of every stream's format
constexpr int32_t kReducedChannels = 2;  // of AAC and FLAC decoders, which are asked for stereo

// The source of frames: a container, or the reader of a bare stream.
struct container_ops {
    // Handle of the demuxer's stream, or of the bare stream's reader.
    int32_t (*get_frm)(void *stream, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                       int64_t *second);
    int32_t (*seek)(void *stream, const int64_t *position, int64_t *reached);
    void (*close_stream)(void *stream);  // null for a bare stream
    void (*remove)(void *demux);         // of the demuxer or the reader
    void (*deinit)();                    // of all codecs that the open initialised
};

struct codec_ops {
    int32_t code;         // of the codec library
    int32_t frame_bytes;  // largest compressed frame
    int32_t spare_bytes;  // by which a frame's PCM may exceed q_room before its reduction
    int32_t min_rate;     // Hz, of the streams accepted
    int32_t max_rate;     // Hz
    int32_t (*decode)(void *decoder, const wexa_frame *frame, wexa_output *output,
                      wexa_status *status);
    void (*reset)(void *decoder);
    void (*remove)(void *decoder);
};

struct codec_source {
    const container_ops *container;
    const codec_ops *codec;  // null for a codec that no decoder serves
    // Reduces the bytes decoded to q_wr to one channel, in place. first: the reader's first value
    // for the frame. Returns the bytes that are left.
    int32_t (*reduce)(const mtsrc_ctx *src, int32_t bytes, int64_t first);
};

// Index of the first audio track or stream, -1 without one.
int32_t codec_source_first_audio(const int32_t *kinds, int32_t count);

// The two usual reductions.
int32_t codec_source_keep_first(const mtsrc_ctx *src, int32_t bytes, int64_t first);
int32_t codec_source_keep_all(const mtsrc_ctx *src, int32_t bytes, int64_t first);

// The start of every open. init: of the codec library, 0 on success. Returns 0 with demux, dstream
// and decoder null; TAVO_ERR_HANDLE null handle, TAVO_ERR_OPEN no probe file, TAVO_ERR_CODEC init
// failed.
int32_t codec_source_begin_open(mtsrc_ctx *src, int32_t (*init)());

// Stores the decoder, which may be null, and the stream's format in the handle, which owns both.
// Returns 0; TAVO_ERR_CODEC without a decoder, TAVO_ERR_FORMAT for a rate that is not accepted.
int32_t codec_source_use(mtsrc_ctx *src, const codec_ops &codec, void *decoder,
                         const mtsrc_format &format);

// The end of every open that began: frees the buffers that the tag record (may be null) points to
// and, when code is a failure, all that was created. Returns code.
int32_t codec_source_end_open(const codec_source &source, mtsrc_ctx *src, wexa_tags *tags,
                              int32_t code);

// The other four operations of a format; they accept a null handle. close also accepts one whose
// open failed anywhere.
void codec_source_close(const codec_source &source, mtsrc_ctx *src);
int32_t codec_source_get_frm(const codec_source &source, mtsrc_ctx *src, int32_t want,
                             mtsrc_frame *frame);
int32_t codec_source_seek(const codec_source &source, mtsrc_ctx *src, int64_t position,
                          int64_t *reached);
int32_t codec_source_reset(const codec_source &source, mtsrc_ctx *src);

#endif
