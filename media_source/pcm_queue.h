// The queue between a source's decoder and the caller. Decoded PCM is written at q_wr and read at
// q_rd in requests of any size.
//
// Input: 16-bit interleaved PCM of one compressed frame. Output: one channel, as many bytes as the
// caller requests.
#ifndef TAVO_MEDIA_SOURCE_PCM_QUEUE_H
#define TAVO_MEDIA_SOURCE_PCM_QUEUE_H

#include "media_source/mtsrc_ctx.h"

// Adds a format's next frame to the queue.
struct pcm_fill {
    // frame_buf: [frm_buf_size]; more bytes than that are free at q_wr. Returns 0 to continue, even
    // if nothing was added; kMtsrcEndOfStream; or a negative code, which ends the call.
    int32_t (*step)(mtsrc_ctx *src, uint8_t *frame_buf, void *work);
    void *work;  // argument of step
};

void pcm_queue_clear(mtsrc_ctx *src);

// Adds bytes that were written at q_wr, at most q_room.
void pcm_queue_push(mtsrc_ctx *src, int32_t bytes);

// The body of every get_frm: fills the queue until it holds `want` bytes, and delivers them.
// Returns 0; kMtsrcEndOfStream with the remaining bytes delivered; TAVO_ERR_MEMORY for lack of
// memory; TAVO_ERR_HANDLE for a bad frame, or if `want` is negative or more than the queue can hold
// (its bytes stay there); TAVO_ERR_READ if no step adds anything; otherwise the step's code.
int32_t pcm_queue_get(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame, const pcm_fill &fill);

// Reduce interleaved PCM to one channel: the first, or the mean of the first two. dst may equal
// pcm; both may have any alignment. Return bytes / channels, which also counts an incomplete last
// sample.
int32_t pcm_first_channel(uint8_t *dst, const uint8_t *pcm, int32_t bytes, int32_t channels);
int32_t pcm_mean_of_two(uint8_t *dst, const uint8_t *pcm, int32_t bytes, int32_t channels);

#endif
