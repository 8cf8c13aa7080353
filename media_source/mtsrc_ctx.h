// The source handle. Only mtsrc.cpp and the format sources use its fields.
//
// mtsrc.cpp allocates the handle, recognises the file and calls the format source through the
// pointers open, close, get_frm, seek and reset.
#pragma once

#include <pthread.h>

#include "include/tavo.h"
#include "media_source/mtsrc.h"

constexpr int32_t kQueueBytes = 1'048'576;  // value of q_cap
// Extra bytes allocated past q_cap. The largest FLAC block decodes to 262,140 bytes of stereo, but
// before each frame the queue guarantees only the 131,070 bytes that the block needs in mono.
constexpr int32_t kQueueSpareBytes = 131'070;

// Codec codes of the codec library. A decoder receives its codec's code with each frame.
constexpr int32_t kCodecMpeg = 305;
constexpr int32_t kCodecAac = 306;
constexpr int32_t kCodecFlac = 322;
constexpr int32_t kCodecVorbis = 323;

// The queue holds 16-bit mono PCM. These relations always hold: q_base <= q_rd <= q_wr, q_fill =
// q_wr - q_rd and q_room = q_cap - (q_wr - q_base).
struct mtsrc_ctx {
    uint32_t mark;  // "KOVA", in memory order, while the source is open
    int32_t (*open)(mtsrc_ctx *src);
    void (*close)(mtsrc_ctx *src);
    int32_t (*get_frm)(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);
    int32_t (*seek)(mtsrc_ctx *src, int64_t position, int64_t *reached);
    int32_t (*reset)(mtsrc_ctx *src);
    mtsrc_io io;             // the path buffer is owned
    mtsrc_file *probe_file;  // owned; opened for recognition and kept open
    mtsrc_format format;
    int32_t codec;    // the file's type code; once open, the stream's codec code
    void *demux;      // reader or demuxer, owned
    void *dstream;    // demuxer's stream (MP4, Ogg), owned
    void *decoder;    // owned; null for WAV
    uint8_t *q_base;  // [q_cap + kQueueSpareBytes] owned
    int32_t q_cap;    // bytes
    int32_t q_fill;   // bytes in the queue
    int32_t q_room;   // bytes free after q_wr
    uint8_t *q_rd;
    uint8_t *q_wr;
    int32_t frm_buf_size;  // size of the buffer for one compressed frame, bytes
    pthread_mutex_t lock;  // held by reset and deinit
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(mtsrc_ctx, io) == 48 && offsetof(mtsrc_ctx, format) == 176));
static_assert(sizeof(void *) != 8 ||
              (offsetof(mtsrc_ctx, codec) == 200 && offsetof(mtsrc_ctx, q_base) == 232));
static_assert(sizeof(void *) != 8 || offsetof(mtsrc_ctx, lock) == 280);

extern "C" {

// The five operations of each format source. open creates the reader and the decoder, fills in the
// handle and returns 0, TAVO_ERR_HANDLE, TAVO_ERR_FORMAT, TAVO_ERR_OPEN or TAVO_ERR_CODEC. close
// accepts a handle whose open failed. get_frm, seek and reset implement mtsrc_getstream,
// mtsrc_seekstream and mtsrc_reset, except that reset returns 0.
int32_t mtsource_wav_open(mtsrc_ctx *src);
void mtsource_wav_close(mtsrc_ctx *src);
int32_t mtsource_wav_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);
int32_t mtsource_wav_seek(mtsrc_ctx *src, int64_t position, int64_t *reached);
int32_t mtsource_wav_reset(mtsrc_ctx *src);

int32_t mtsource_aac_open(mtsrc_ctx *src);
void mtsource_aac_close(mtsrc_ctx *src);
int32_t mtsource_aac_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);
int32_t mtsource_aac_seek(mtsrc_ctx *src, int64_t position, int64_t *reached);
int32_t mtsource_aac_reset(mtsrc_ctx *src);

int32_t mtsource_flac_open(mtsrc_ctx *src);
void mtsource_flac_close(mtsrc_ctx *src);
int32_t mtsource_flac_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);
int32_t mtsource_flac_seek(mtsrc_ctx *src, int64_t position, int64_t *reached);
int32_t mtsource_flac_reset(mtsrc_ctx *src);

int32_t mtsource_mp123_open(mtsrc_ctx *src);
void mtsource_mp123_close(mtsrc_ctx *src);
int32_t mtsource_mp123_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);
int32_t mtsource_mp123_seek(mtsrc_ctx *src, int64_t position, int64_t *reached);
int32_t mtsource_mp123_reset(mtsrc_ctx *src);

int32_t mtsource_mp4a_open(mtsrc_ctx *src);
void mtsource_mp4a_close(mtsrc_ctx *src);
int32_t mtsource_mp4a_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);
int32_t mtsource_mp4a_seek(mtsrc_ctx *src, int64_t position, int64_t *reached);
int32_t mtsource_mp4a_reset(mtsrc_ctx *src);

int32_t mtsource_ogg_open(mtsrc_ctx *src);
void mtsource_ogg_close(mtsrc_ctx *src);
int32_t mtsource_ogg_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);
int32_t mtsource_ogg_seek(mtsrc_ctx *src, int64_t position, int64_t *reached);
int32_t mtsource_ogg_reset(mtsrc_ctx *src);

// Consumes the next compressed frame and returns the sample rate (Hz) that the decoder reports for
// it, or -1 on failure.
int32_t aac_get_hz(void *reader, void *decoder);

// Return the index of the first audio track or stream, or -1. `info` is an xmp4_info or an
// xogg_info, respectively.
int32_t get_mp4_audiostream(const void *info);
int32_t get_ogg_audiostream(const void *info);
}
