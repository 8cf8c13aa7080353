// The queue between a source's decoder and the caller: PCM goes in frame by frame at q_wr and comes
// out at q_rd in requests of any size.
//
// In: 16-bit interleaved PCM of one frame. Out: the bytes that the caller wants, one channel.
#ifndef TAVO_MEDIA_SOURCE_PCM_QUEUE_H
#define TAVO_MEDIA_SOURCE_PCM_QUEUE_H

#include "media_source/mtsrc_ctx.h"

// How a format adds its next frame to the queue.
struct pcm_fill {
    // frame_buf: [frm_buf_size]; more than that many bytes are free at q_wr. Returns 0 to go on
    // (also when nothing was added), kMtsrcEndOfStream, or the negative code that ends the call.
    int32_t (*step)(mtsrc_ctx *src, uint8_t *frame_buf, void *work);
    void *work;  // for step
};

void pcm_queue_clear(mtsrc_ctx *src);

// Counts bytes that were written at q_wr; at most q_room.
void pcm_queue_push(mtsrc_ctx *src, int32_t bytes);

// The body of every get_frm: fills until want bytes are held and delivers them. Returns 0;
// kMtsrcEndOfStream with the bytes left; TAVO_ERR_MEMORY; TAVO_ERR_HANDLE for a bad frame, a
// negative want and one that the queue cannot hold (what is queued by then stays queued);
// TAVO_ERR_READ when the steps never add anything; else the code of the step.
int32_t pcm_queue_get(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame, const pcm_fill &fill);

// Reduce bytes of interleaved PCM to one channel: the first, or the mean of the first two. to may
// equal from; neither needs alignment. Return bytes / channels, which also counts an incomplete
// last sample.
int32_t pcm_first_channel(uint8_t *to, const uint8_t *from, int32_t bytes, int32_t channels);
int32_t pcm_mean_of_two(uint8_t *to, const uint8_t *from, int32_t bytes, int32_t channels);

#endif
