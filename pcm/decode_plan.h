// Stage 2a: plans the decoding.
//
// Input: a path, or a start position in the stream. Output: the segments, each with an open source
// and a buffer, and one zeroed PCM buffer for all of them. Follows media_source/mtsrc.h and
// precedes pcm/decode.h.
//
// The stream is divided into one or four segments, each with its own media source, buffer and
// thread. Each segment except the last is decoded two seconds past its end.
#pragma once

#include "common/tavo_ctx.h"
#include "media_source/mtsrc.h"

// One decoding segment. A thread uses only its own record, buffer and source. Only the done flags
// are shared; the mutex guards them.
struct TAVO_DECSEG {
    int32_t index;  // from 0, also the segment's index in done
    pthread_t thread;
    mtsrc_ctx *src;          // owned; stays open until the table is released
    mtsrc_param open_param;  // its path is read during set-up only
    TAVO_FMT fmt;
    int64_t duration;        // duration of the stream, 100-ns units
    uint8_t *buf;            // [cap] PCM bytes, owned
    int64_t cap;             // bytes
    int64_t got;             // bytes decoded into buf
    int64_t start;           // 100-ns units from the start of the stream
    int64_t seek_pos;        // position that the seek reported, 100-ns units
    int32_t *done;           // [count] one array for all segments, owned by the table
    int32_t count;           // number of segments in the plan
    pthread_mutex_t *mutex;  // ext_mutex_mt
    pthread_cond_t *cond;    // ext_cond_mt
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_DECSEG, src) == 16 && offsetof(TAVO_DECSEG, duration) == 48));
static_assert(sizeof(void *) != 8 ||
              (offsetof(TAVO_DECSEG, got) == 72 && offsetof(TAVO_DECSEG, cond) == 120));

extern "C" {

// The lock and condition of the decoding threads. They exist from tavo_decode_init to
// tavo_decode_deinit and are null otherwise.
extern pthread_mutex_t *ext_mutex_mt;
extern pthread_cond_t *ext_cond_mt;

// Plans the decoding of the file: fills fmt, duration, seg, seg_count, pcm and pcm_bytes. Returns
// 0. On failure, releases everything. It then returns TAVO_ERR_HANDLE if the file cannot be opened,
// TAVO_ERR_FORMAT if check_stream refuses the stream, TAVO_ERR_MEMORY if memory runs out, or the
// code of mtsrc_init if a segment's source cannot be opened.
int32_t tavo_decode_init(TAVO_CTX *ctx, const TAVO_PARAM *param);

// Releases the segment table with its sources and buffers, the PCM buffer, the lock and the
// condition. Accepts a partly built plan and may be called twice.
void tavo_decode_deinit(TAVO_CTX *ctx);

// Plans the decoding from `start` (100-ns units) to the end of the stream, using the sources that
// are already open. Allocates new segment buffers and a new pcm; the caller must have freed the old
// ones. Returns 0. If memory runs out or nothing is left to decode, frees the segment buffers and
// returns TAVO_ERR_MEMORY.
int32_t construct_decbuf(TAVO_CTX *ctx, int64_t start);
}

// Returns TAVO_OK if the stream can be analysed. Otherwise returns TAVO_ERR_SHORT,
// TAVO_ERR_LOW_RATE or, if the byte count overflows, TAVO_ERR_FORMAT.
int32_t check_stream(const mtsrc_format &format);
