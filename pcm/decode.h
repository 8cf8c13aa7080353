// Stage 2: the file becomes one buffer of 16-bit mono PCM at the stream's own rate.
//
// In: a path. Out: TAVO_CTX.pcm, pcm_bytes bytes. Before: media_source/mtsrc.h. After:
// highlight/position.h, pcm/resample.h. Jobs call pcm/song.h, which holds less memory.
//
// The stream is cut into 1 or 4 segments, each with a media source, a buffer and a thread of its
// own. All but the last decode two seconds more than their share, and they are stitched where the
// overlaps hold the same bytes.
#ifndef TAVO_PCM_DECODE_H
#define TAVO_PCM_DECODE_H

#include "common/tavo_ctx.h"
#include "media_source/mtsrc.h"

// One decoding segment. A thread touches only its own record, buffer and source; done is shared and
// guarded by the mutex.
struct TAVO_DECSEG {
    int32_t index;  // from 0, also its slot in done
    pthread_t thread;
    mtsrc_ctx *src;          // opened at setup, kept to the end, owned
    mtsrc_param open_param;  // path: read only while setup runs
    TAVO_FMT fmt;
    int64_t duration;        // of the stream, 100-ns units
    uint8_t *buf;            // [cap] PCM bytes, owned
    int64_t cap;             // bytes
    int64_t got;             // bytes decoded into buf
    int64_t start;           // 100-ns units from the start of the stream
    int64_t seek_pos;        // position that the seek reported, 100-ns units
    int32_t *done;           // [seg_count] one array for all segments, owned by the table
    int32_t count;           // segments of the plan
    pthread_mutex_t *mutex;  // ext_mutex_mt
    pthread_cond_t *cond;    // ext_cond_mt
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_DECSEG, src) == 16 && offsetof(TAVO_DECSEG, duration) == 48));
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_DECSEG, got) == 72 && offsetof(TAVO_DECSEG, cond) == 120));

extern "C" {

// The decoding group's lock and condition, from tavo_decode_init to tavo_decode_deinit; else null.
extern pthread_mutex_t *ext_mutex_mt;
extern pthread_cond_t *ext_cond_mt;

// Plans the decoding of the file: fills fmt, duration, seg, seg_count, pcm, pcm_bytes.
// Returns 0; -2 out of memory; -3 format unusable, at most 1 s long or below 8000 Hz; -4 the file
// cannot be opened; or the code of a segment's source. On failure all made here is released.
int32_t tavo_decode_init(TAVO_CTX *ctx, const TAVO_PARAM *param);

// Releases the segment table with sources and buffers, the PCM buffer, the lock and the condition.
// Safe on a partly built setup and when called twice.
void tavo_decode_deinit(TAVO_CTX *ctx);

// Plans again for the stream from start (100-ns units) to its end, with the sources that are open,
// and allocates new segment buffers and a new pcm. The caller has freed the old ones. Returns 0; -2
// out of memory or nothing left, with the segment buffers freed.
int32_t construct_decbuf(TAVO_CTX *ctx, int64_t start);

// Decodes the planned segments in parallel and stitches them into dst (dst_capacity bytes); their
// buffers stay allocated. Returns the bytes written, 0 when any segment gave nothing.
int64_t DecodePcmMT(TAVO_CTX *ctx, void *dst, int64_t dst_capacity);

// Thread entry of one segment, and its completion handler. The argument is the TAVO_DECSEG.
void *_tavo_mtproc_decoding(void *seg);
void thd_cleanup(void *seg);

// dst[i] = (left + right) / 2 of frame i of interleaved stereo src, toward zero. For direct use.
void stereo2mono(int16_t *dst, const int16_t *src, int32_t frames);
}

#endif
