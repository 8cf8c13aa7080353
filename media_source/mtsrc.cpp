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
    return src != nullptr && memcmp(&src->mark, kMark, sizeof src->mark) == 0;
}

// Allocates a handle with its queue and lock. Returns null if memory runs out.
mtsrc_ctx *new_handle(const mtsrc_io *io) {
    auto *src = static_cast<mtsrc_ctx *>(calloc(1, sizeof(mtsrc_ctx)));
    if (src == nullptr) return nullptr;
    src->q_cap = kQueueBytes;
    // The queue is zeroed, because it may count an incomplete last sample that is never written.
    src->q_base = static_cast<uint8_t *>(calloc(1, kQueueBytes + kQueueSpareBytes));
    if (src->q_base == nullptr || pthread_mutex_init(&src->lock, nullptr) != 0) {
        free(src->q_base);
        free(src);
        return nullptr;
    }
    pcm_queue_clear(src);
    src->io = *io;
    src->codec = kMtsrcTypeUnknown;
    return src;
}

// Opens and recognises the file, and stores the operations of its format source in the handle.
// Returns 0, TAVO_ERR_FORMAT, TAVO_ERR_READ or TAVO_ERR_OPEN.
int32_t choose_source(mtsrc_ctx *src) {
    mtsrc_file *file = src->io.open(&src->io, kReadOnly);
    if (file == nullptr) return TAVO_ERR_OPEN;
    const int32_t code = mtsrc_get_file_type(&src->io, file, &src->codec);
    const format_ops *ops = code == TAVO_OK ? format_ops_of(src->codec) : nullptr;
    if (ops == nullptr) {
        src->io.close(file);
        return code == TAVO_OK ? TAVO_ERR_FORMAT : code;
    }
    src->open = ops->open;
    src->close = ops->close;
    src->get_frm = ops->get_frm;
    src->seek = ops->seek;
    src->reset = ops->reset;
    src->probe_file = file;
    return TAVO_OK;
}

// Releases a handle that could not be opened. The caller still owns the path.
void discard(mtsrc_ctx *src) {
    pthread_mutex_destroy(&src->lock);
    if (src->close != nullptr) src->close(src);
    if (src->probe_file != nullptr) src->io.close(src->probe_file);
    free(src->q_base);
    free(src);
}

}  // namespace

mtsrc_ctx *mtsrc_init(const mtsrc_param *param, int32_t *err) {
    if (err == nullptr) return nullptr;
    *err = TAVO_ERR_HANDLE;
    if (param == nullptr || param->path == nullptr) return nullptr;
    mtsrc_io io = {};
    mtsrc_file_callbacks(&io);
    io.path = static_cast<char *>(calloc(1, kPathBytes));
    const size_t length = strnlen(param->path, kPathBytes);
    if (io.path == nullptr || length >= static_cast<size_t>(kPathBytes)) {
        *err = TAVO_ERR_FORMAT;
        free(io.path);
        return nullptr;
    }
    memcpy(io.path, param->path, length);
    mtsrc_ctx *src = mtsrc_open_mfal(&io, 0, err);
    if (src == nullptr) free(io.path);
    return src;
}

mtsrc_ctx *mtsrc_open_mfal(const mtsrc_io *io, int64_t /*flags*/, int32_t *err) {
    if (err == nullptr) return nullptr;
    if (io == nullptr || io->open == nullptr) {
        *err = TAVO_ERR_HANDLE;
        return nullptr;
    }
    *err = TAVO_ERR_CODEC;
    mtsrc_ctx *src = new_handle(io);
    if (src == nullptr) {
        *err = TAVO_ERR_MEMORY;
        return nullptr;
    }
    int32_t code = choose_source(src);
    if (code == TAVO_OK) code = src->open(src);
    *err = code;
    if (code != TAVO_OK) {
        discard(src);
        return nullptr;
    }
    memcpy(&src->mark, kMark, sizeof src->mark);
    return src;
}

int32_t mtsrc_getstream_format(mtsrc_ctx *src, mtsrc_format *fmt) {
    if (!is_open(src) || fmt == nullptr) return TAVO_ERR_HANDLE;
    // Copy field by field so that the padding after `bits` stays unchanged.
    fmt->sample_rate = src->format.sample_rate;
    fmt->channels = src->format.channels;
    fmt->bits = src->format.bits;
    fmt->duration = src->format.duration;
    return TAVO_OK;
}

int32_t mtsrc_seekstream(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    if (!is_open(src)) return TAVO_ERR_HANDLE;
    return src->seek(src, position, reached);
}

int32_t mtsrc_getstream(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    if (!is_open(src) || src->get_frm == nullptr) return TAVO_ERR_HANDLE;
    return src->get_frm(src, want, frame);
}

int32_t mtsrc_reset(mtsrc_ctx *src) {
    if (!is_open(src)) return TAVO_ERR_HANDLE;
    pthread_mutex_lock(&src->lock);
    src->reset(src);
    pthread_mutex_unlock(&src->lock);
    return kMtsrcDone;
}

int32_t mtsrc_deinit(mtsrc_ctx *src) {
    if (!is_open(src)) return TAVO_ERR_HANDLE;
    pthread_mutex_lock(&src->lock);
    if (src->probe_file != nullptr) {
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
    return kMtsrcDone;
}
