#include "desktop/wexaaudio/shared/bundle.h"

#include <cstring>

namespace {

constexpr int32_t kLengthBytes = sizeof(int32_t);

}  // namespace

int64_t bundle_size(int32_t setup, int32_t frames, int64_t payload) {
    return static_cast<int64_t>(sizeof(bundle_head)) + setup +
           static_cast<int64_t>(frames) * kLengthBytes + payload;
}

void bundle_begin(bundle_writer *w, void *buf, int32_t cap, bundle_head head, const void *setup) {
    *w = {static_cast<uint8_t *>(buf), cap, 0, 0, head.frames, false};
    if (bundle_size(head.setup, head.frames, 0) > cap) {
        w->failed = true;
        return;
    }
    memcpy(head.mark, kBundleMark, sizeof head.mark);
    memcpy(w->buf, &head, sizeof head);
    w->used = sizeof head;
    if (head.setup > 0) {
        memcpy(w->buf + w->used, setup, static_cast<size_t>(head.setup));
        w->used += head.setup;
    }
    w->slot = w->used;
    w->used += head.frames * kLengthBytes;
}

uint8_t *bundle_add(bundle_writer *w, int32_t bytes) {
    if (w->failed || w->slots < 1 || bytes < 0 || bytes > w->cap - w->used) {
        w->failed = true;
        return nullptr;
    }
    memcpy(w->buf + w->slot, &bytes, kLengthBytes);
    w->slot += kLengthBytes;
    --w->slots;
    uint8_t *space = w->buf + w->used;
    w->used += bytes;
    return space;
}

int32_t bundle_end(const bundle_writer *w) {
    return w->failed || w->slots != 0 ? -1 : w->used;
}

bool bundle_open(bundle_view *v, const void *data, int32_t bytes) {
    *v = {};
    if (data == nullptr || bytes < static_cast<int32_t>(sizeof(bundle_head)) ||
        memcmp(data, kBundleMark, sizeof kBundleMark) != 0) {
        return false;
    }
    const uint8_t *start = static_cast<const uint8_t *>(data);
    memcpy(&v->head, start, sizeof v->head);
    if (v->head.setup < 0 || v->head.frames < 0 ||
        bundle_size(v->head.setup, v->head.frames, 0) > bytes) {
        return false;
    }
    v->setup = start + sizeof v->head;
    v->length = v->setup + v->head.setup;
    v->left = v->head.frames;
    v->data = v->length + static_cast<int64_t>(v->left) * kLengthBytes;
    int64_t payload = 0;
    for (int32_t i = 0; i < v->left; ++i) {
        int32_t length = 0;
        memcpy(&length, v->length + static_cast<int64_t>(i) * kLengthBytes, kLengthBytes);
        if (length < 0) {
            return false;
        }
        payload += length;
    }
    return bundle_size(v->head.setup, v->head.frames, payload) <= bytes;
}

const uint8_t *bundle_next(bundle_view *v, int32_t *bytes) {
    *bytes = 0;
    if (v->left == 0) {
        return nullptr;
    }
    memcpy(bytes, v->length, kLengthBytes);
    const uint8_t *frame = v->data;
    v->length += kLengthBytes;
    v->data += *bytes;
    --v->left;
    return frame;
}
