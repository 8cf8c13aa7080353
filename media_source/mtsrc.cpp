#include <cstdlib>
#include <cstring>

#include "common/limits.h"
#include "media_source/format_table.h"
#include "media_source/mtsrc_ctx.h"
#include "media_source/pcm_queue.h"

namespace {

constexpr char kMark[] = "KOVA";
constexpr int32_t kReadOnly = 0;

bool is_open(const mtsrc_ctx *src) {
    return src && memcmp(&src->mark, kMark, sizeof(src->mark)) == 0;
}

// The handle with its queue and lock; null when memory runs out.
mtsrc_ctx *new_handle(const mtsrc_io *io) {
    auto *src = static_cast<mtsrc_ctx *>(calloc(1, sizeof(mtsrc_ctx)));
    if (!src) {
        return nullptr;
    }
    src->q_cap = kQueueBytes;
    // Zeroed: bytes that count but hold no sample are delivered as well.
    src->q_base = static_cast<uint8_t *>(calloc(1, kQueueBytes + kQueueSpareBytes));
    if (!src->q_base || pthread_mutex_init(&src->lock, nullptr) != 0) {
        free(src->q_base);
        free(src);
        return nullptr;
    }
    pcm_queue_clear(src);
    src->io = *io;
    src->codec = kMtsrcTypeUnknown;
    return src;
}

// The file, open, with its format source stored in the handle. Returns 0, -3, -6 or -7.
int32_t choose_source(mtsrc_ctx *src) {
    mtsrc_file *file = src->io.open(&src->io, kReadOnly);
    if (!file) {
        return -7;
    }
    int32_t code = mtsrc_get_file_type(&src->io, file, &src->codec);
    const format_ops *ops = code == 0 ? format_ops_of(src->codec) : nullptr;
    if (!ops) {
        src->io.close(file);
        return code == 0 ? -3 : code;
    }
    src->open = ops->open;
    src->close = ops->close;
    src->get_frm = ops->get_frm;
    src->seek = ops->seek;
    src->reset = ops->reset;
    src->probe_file = file;
    return 0;
}

// A handle whose opening failed; its path stays the caller's.
void discard(mtsrc_ctx *src) {
    pthread_mutex_destroy(&src->lock);
    if (src->close) {
        src->close(src);
    }
    if (src->probe_file) {
        src->io.close(src->probe_file);
    }
    free(src->q_base);
    free(src);
}

}  // namespace

mtsrc_ctx *mtsrc_init(const mtsrc_param *param, int32_t *err) {
    if (!err) {
        return nullptr;
    }
    *err = -4;
    if (!param || !param->path) {
        return nullptr;
    }
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.path = static_cast<char *>(calloc(1, kPathBytes));
    const size_t length = strnlen(param->path, kPathBytes);
    if (!io.path || length >= static_cast<size_t>(kPathBytes)) {
        *err = -3;
        free(io.path);
        return nullptr;
    }
    memcpy(io.path, param->path, length);
    mtsrc_ctx *src = mtsrc_open_mfal(&io, 0, err);
    if (!src) {
        free(io.path);
    }
    return src;
}

mtsrc_ctx *mtsrc_open_mfal(const mtsrc_io *io, int64_t /*flags*/, int32_t *err) {
    if (!err) {
        return nullptr;
    }
    if (!io || !io->open) {
        *err = -4;
        return nullptr;
    }
    *err = -255;
    mtsrc_ctx *src = new_handle(io);
    if (!src) {
        *err = -2;
        return nullptr;
    }
    int32_t code = choose_source(src);
    if (code == 0) {
        code = src->open(src);
    }
    *err = code;
    if (code != 0) {
        discard(src);
        return nullptr;
    }
    memcpy(&src->mark, kMark, sizeof(src->mark));
    return src;
}

int32_t mtsrc_getstream_format(mtsrc_ctx *src, mtsrc_format *fmt) {
    if (!is_open(src) || !fmt) {
        return -4;
    }
    // Field by field: the gap behind bits belongs to the caller.
    fmt->sample_rate = src->format.sample_rate;
    fmt->channels = src->format.channels;
    fmt->bits = src->format.bits;
    fmt->duration = src->format.duration;
    return 0;
}

int32_t mtsrc_seekstream(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    if (!is_open(src)) {
        return -4;
    }
    return src->seek(src, position, reached);
}

int32_t mtsrc_getstream(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    if (!is_open(src) || !src->get_frm) {
        return -4;
    }
    return src->get_frm(src, want, frame);
}

int32_t mtsrc_reset(mtsrc_ctx *src) {
    if (!is_open(src)) {
        return -4;
    }
    pthread_mutex_lock(&src->lock);
    src->reset(src);
    pthread_mutex_unlock(&src->lock);
    return -5;
}

int32_t mtsrc_deinit(mtsrc_ctx *src) {
    if (!is_open(src)) {
        return -4;
    }
    pthread_mutex_lock(&src->lock);
    if (src->probe_file) {
        src->io.close(src->probe_file);
        src->probe_file = nullptr;
    }
    src->close(src);
    pthread_mutex_unlock(&src->lock);
    pthread_mutex_destroy(&src->lock);
    free(src->io.path);
    src->io = {};
    free(src->q_base);
    free(src);
    return -5;
}
