// The queue between a source's decoder and its caller. The decoder writes PCM at q_wr; the caller
// reads any number of bytes at q_rd.
//
// Input: the interleaved 16-bit PCM of one compressed frame at a time. Output: mono PCM, as many
// bytes as the caller requests.
#pragma once

#include "media_source/mtsrc_ctx.h"

// The function that adds a format's next frame to the queue, and its argument.
struct pcm_fill {
    // `frame_buf` has frm_buf_size bytes, and the queue has more than that free at q_wr. Returns 0
    // to continue the read, even if no bytes were added. kMtsrcEndOfStream or a negative code ends
    // the read.
    int32_t (*step)(mtsrc_ctx *src, uint8_t *frame_buf, void *work);
    void *work;  // argument of step
};

void pcm_queue_clear(mtsrc_ctx *src);

// Adds the bytes that the caller has written at q_wr, at most q_room.
void pcm_queue_push(mtsrc_ctx *src, int32_t bytes);

// Implements every get_frm. Delivers `want` bytes and returns 0. At the end of the stream, delivers
// what is left and returns kMtsrcEndOfStream. Returns TAVO_ERR_MEMORY if memory runs out,
// TAVO_ERR_READ after too many empty steps, or the code of a failed step. If `frame` is bad, or if
// `want` is negative or too large, returns TAVO_ERR_HANDLE and keeps all queued bytes.
int32_t pcm_queue_get(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame, const pcm_fill &fill);

// Releases the memory of pages that hold no PCM. The pages stay allocated and read as zeros.
void pcm_queue_release_pages(const mtsrc_ctx *src);

// Reduce interleaved PCM to one channel: the first, or the mean of the first two. `dst` may equal
// `pcm`, and neither needs to be aligned. Both return bytes / channels, which includes an
// incomplete last sample.
int32_t pcm_first_channel(uint8_t *dst, const uint8_t *pcm, int32_t bytes, int32_t channels);
int32_t pcm_mean_of_two(uint8_t *dst, const uint8_t *pcm, int32_t bytes, int32_t channels);
