#include "media_source/codec_source.h"

#include <cstdlib>

#include "media_source/pcm_queue.h"

namespace {

// What lasts for one call of get_frm.
struct decoding {
    const codec_source_ops *ops;
    wexa_output output;
    wexa_status status;
    bool failed_before;  // the previous decode of this call
};

// The reader's and the decoder's byte counts come from another binary: one that cannot be true ends
// the call.
bool possible(int32_t bytes, int32_t room) {
    return bytes >= 0 && bytes <= room;
}

int32_t fill_step(mtsrc_ctx *src, uint8_t *frame_buf, void *work) {
    auto *now = static_cast<decoding *>(work);
    const codec_source_ops &ops = *now->ops;
    wexa_frame frame = {};
    frame.data = frame_buf;
    int64_t first = 0;
    const int32_t result = ops.read(src, &frame, &first);
    if (result != 0) {
        return result == 1 ? 1 : -6;
    }
    if (!ops.decode || !possible(frame.bytes, src->frm_buf_size)) {
        return -6;
    }
    frame.codec = src->codec;
    now->output.data = src->q_wr;
    if (ops.decode(src->decoder, &frame, &now->output, &now->status) != 0) {
        if (now->failed_before) {
            return -6;
        }
        now->failed_before = true;
        ops.reset(src->decoder);
        return 0;
    }
    now->failed_before = false;
    if (now->status.produced == 0) {
        return 0;
    }
    if (!possible(now->output.bytes, src->q_room + ops.spare)) {
        return -6;
    }
    const int32_t kept = ops.reduce(src, now->output.bytes, first);
    if (kept > src->q_room) {
        return -6;
    }
    pcm_queue_push(src, kept);
    return 0;
}

void free_buffer(void **place) {
    free(*place);
    *place = nullptr;
}

// The record itself stays the codec library's.
void free_tag_buffers(wexa_tags *tags) {
    for (wexa_tag_text &text : tags->text) {
        free_buffer(&text.data);
    }
    for (wexa_tag_entry &entry : tags->entry) {
        free_buffer(&entry.first);
        free_buffer(&entry.second);
    }
    free_buffer(&tags->last);
}

}  // namespace

int32_t codec_source_get_frm(const codec_source_ops &ops, mtsrc_ctx *src, int32_t want,
                             mtsrc_frame *frame) {
    decoding now = {};
    now.ops = &ops;
    return pcm_queue_get(src, want, frame, {fill_step, &now});
}

int32_t codec_source_seek(const codec_source_ops &ops, mtsrc_ctx *src, int64_t position,
                          int64_t *reached) {
    codec_source_reset(ops, src);
    return ops.move(src, &position, reached) == 0 ? 0 : -4;
}

int32_t codec_source_reset(const codec_source_ops &ops, mtsrc_ctx *src) {
    if (ops.reset) {
        ops.reset(src->decoder);
    }
    pcm_queue_clear(src);
    return 0;
}

void codec_source_close(const codec_source_ops &ops, mtsrc_ctx *src) {
    if (src->dstream && ops.close_stream) {
        ops.close_stream(src->dstream);
        src->dstream = nullptr;
    }
    if (src->demux) {
        ops.remove_reader(src->demux);
        src->demux = nullptr;
    }
    if (src->decoder && ops.remove_decoder) {
        ops.remove_decoder(src->decoder);
        src->decoder = nullptr;
    }
    ops.deinit();
}

int32_t codec_source_finish_open(const codec_source_ops &ops, mtsrc_ctx *src, wexa_tags *tags,
                                 int32_t code) {
    if (tags) {
        free_tag_buffers(tags);
    }
    if (code != 0) {
        codec_source_close(ops, src);
    }
    return code;
}

int32_t codec_source_keep_first(const mtsrc_ctx *src, int32_t bytes, int64_t /*first*/) {
    return pcm_first_channel(src->q_wr, src->q_wr, bytes, src->format.channels);
}

int32_t codec_source_keep_all(const mtsrc_ctx * /*src*/, int32_t bytes, int64_t /*first*/) {
    return bytes;
}

xaac_config codec_source_aac_config(int32_t sample_rate, int32_t channels) {
    return {{1, 2, 2, 0}, 3, sample_rate, channels, 0};
}
