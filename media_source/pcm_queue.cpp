#include "media_source/pcm_queue.h"

#include <cstdlib>
#include <cstring>

#include "common/alloc.h"

namespace {

constexpr int32_t kBytesPerSample = 2;
// A read fails after this many consecutive empty steps, far more than any real file causes.
constexpr int32_t kMaxEmptySteps = 16'777'216;

void compact_queue(mtsrc_ctx *src) {
    memmove(src->q_base, src->q_rd, static_cast<size_t>(src->q_fill));
    src->q_rd = src->q_base;
    src->q_wr = src->q_base + src->q_fill;
    src->q_room = src->q_cap - src->q_fill;
}

void deliver(mtsrc_ctx *src, int32_t bytes, mtsrc_frame *frame) {
    memcpy(frame->data, src->q_rd, static_cast<size_t>(bytes));
    frame->size = bytes;
    src->q_rd += bytes;
    src->q_fill -= bytes;
}

// Returns 0 once the queue holds `want` bytes, otherwise the code that ends the read.
int32_t fill_queue(mtsrc_ctx *src, int32_t want, uint8_t *frame_buf, const pcm_fill &fill) {
    int32_t empty_steps = 0;
    while (src->q_fill < want) {
        if (src->q_room <= src->frm_buf_size) {
            compact_queue(src);
            if (src->q_room <= src->frm_buf_size) return TAVO_ERR_HANDLE;
        }
        const int32_t before = src->q_fill;
        const int32_t code = fill.step(src, frame_buf, fill.work);
        if (code != TAVO_OK) return code;
        empty_steps = src->q_fill > before ? 0 : empty_steps + 1;
        if (empty_steps >= kMaxEmptySteps) return TAVO_ERR_READ;
    }
    return TAVO_OK;
}

// Sample frames per chunk, a constant so that the compiler vectorises the loops.
constexpr int32_t kChunkFrames = 64;

struct left_of {
    static void reduce(const int16_t *stereo, int16_t *mono) {
        for (int32_t j = 0; j < kChunkFrames; ++j) mono[j] = stereo[2 * j];
    }
    static int16_t reduce_one(const int16_t *frame) { return frame[0]; }
};

struct mean_of {
    static void reduce(const int16_t *stereo, int16_t *mono) {
        for (int32_t j = 0; j < kChunkFrames; ++j) {
            mono[j] = static_cast<int16_t>((stereo[2 * j] + stereo[2 * j + 1]) / 2);
        }
    }
    static int16_t reduce_one(const int16_t *frame) {
        return static_cast<int16_t>((frame[0] + frame[1]) / 2);
    }
};

// Implements pcm_first_channel and pcm_mean_of_two. Copies each chunk before writing its result,
// because `dst` may equal `pcm`.
template <typename reduction>
int32_t reduce_pcm(uint8_t *dst, const uint8_t *pcm, int32_t bytes, int32_t channels) {
    if (channels <= 1) {
        memmove(dst, pcm, static_cast<size_t>(bytes));
        return bytes;
    }
    const int64_t count = bytes / kBytesPerSample / channels;
    int64_t j = 0;
    for (; channels == 2 && j + kChunkFrames <= count; j += kChunkFrames) {
        int16_t stereo[2 * kChunkFrames];
        int16_t mono[kChunkFrames];
        memcpy(stereo, pcm + j * 2 * kBytesPerSample, sizeof stereo);
        reduction::reduce(stereo, mono);
        memcpy(dst + j * kBytesPerSample, mono, sizeof mono);
    }
    for (; j < count; ++j) {
        int16_t frame[2];
        memcpy(frame, pcm + j * channels * kBytesPerSample, sizeof frame);
        const int16_t mono = reduction::reduce_one(frame);
        memcpy(dst + j * kBytesPerSample, &mono, sizeof mono);
    }
    return bytes / channels;
}

}  // namespace

void pcm_queue_clear(mtsrc_ctx *src) {
    src->q_rd = src->q_base;
    src->q_wr = src->q_base;
    src->q_fill = 0;
    src->q_room = src->q_cap;
}

void pcm_queue_push(mtsrc_ctx *src, int32_t bytes) {
    src->q_wr += bytes;
    src->q_fill += bytes;
    src->q_room -= bytes;
}

int32_t pcm_queue_get(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame, const pcm_fill &fill) {
    if (frame == nullptr || frame->data == nullptr || want < 0) return TAVO_ERR_HANDLE;
    auto *frame_buf = static_cast<uint8_t *>(malloc(static_cast<size_t>(src->frm_buf_size)));
    if (frame_buf == nullptr) return TAVO_ERR_MEMORY;
    const int32_t code = fill_queue(src, want, frame_buf, fill);
    if (code == TAVO_OK) {
        deliver(src, want, frame);
    } else if (code == kMtsrcEndOfStream) {
        deliver(src, src->q_fill, frame);
    }
    free(frame_buf);
    return code;
}

void pcm_queue_release_pages(const mtsrc_ctx *src) {
    release_pages(src->q_base, src->q_rd);
    release_pages(src->q_wr, src->q_base + src->q_cap);
}

int32_t pcm_first_channel(uint8_t *dst, const uint8_t *pcm, int32_t bytes, int32_t channels) {
    return reduce_pcm<left_of>(dst, pcm, bytes, channels);
}

int32_t pcm_mean_of_two(uint8_t *dst, const uint8_t *pcm, int32_t bytes, int32_t channels) {
    return reduce_pcm<mean_of>(dst, pcm, bytes, channels);
}
