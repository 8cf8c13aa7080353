#include "media_source/codec_source.h"

#include <cstdlib>

#include "media_source/pcm_queue.h"

namespace {

// State of one call to codec_source_get_frm.
struct decoding {
    const codec_source *source;
    wexa_output output;
    wexa_status status;
    bool failed_before;  // the previous frame of this call could not be decoded
};

void *stream_of(const codec_source &source, const mtsrc_ctx *src) {
    return source.container->close_stream != nullptr ? src->dstream : src->demux;
}

// Checks a byte count from the codec library, a separate binary that may report a wrong count.
bool is_possible(int32_t bytes, int32_t capacity) {
    return bytes >= 0 && bytes <= capacity;
}

// Reduces the PCM of the last decoded frame to one channel and queues it.
int32_t queue_decoded(mtsrc_ctx *src, const decoding &call, int64_t first) {
    const int32_t bytes = call.output.bytes;
    if (!is_possible(bytes, src->q_room + call.source->codec->spare_bytes)) return TAVO_ERR_READ;
    const int32_t mono_bytes = call.source->reduce(src, bytes, first);
    if (mono_bytes > src->q_room) return TAVO_ERR_READ;
    pcm_queue_push(src, mono_bytes);
    return TAVO_OK;
}

// Reads one compressed frame, decodes it and queues its PCM.
int32_t fill_step(mtsrc_ctx *src, uint8_t *frame_buf, void *work) {
    auto *call = static_cast<decoding *>(work);
    const codec_ops *codec = call->source->codec;
    wexa_frame frame = {};
    frame.data = frame_buf;
    int64_t first = 0;
    int64_t second = 0;
    const int32_t result = call->source->container->get_frm(
        stream_of(*call->source, src), frame_buf, src->frm_buf_size, &frame.bytes, &first, &second);
    if (result == kWexaEndOfStream) return kMtsrcEndOfStream;
    if (result != 0 || codec == nullptr) return TAVO_ERR_READ;
    if (!is_possible(frame.bytes, src->frm_buf_size)) return TAVO_ERR_READ;

    frame.codec = src->codec;
    call->output.data = src->q_wr;
    if (codec->decode(src->decoder, &frame, &call->output, &call->status) != 0) {
        if (call->failed_before) return TAVO_ERR_READ;
        call->failed_before = true;
        codec->reset(src->decoder);
        return TAVO_OK;
    }
    call->failed_before = false;
    return call->status.produced != 0 ? queue_decoded(src, *call, first) : TAVO_OK;
}

void free_buffer(void **buffer) {
    free(*buffer);
    *buffer = nullptr;
}

// Frees only the buffers; the codec library owns the record.
void free_tag_buffers(wexa_tags *tags) {
    for (wexa_tag_text &text : tags->text) free_buffer(&text.data);
    for (wexa_tag_entry &entry : tags->entry) {
        free_buffer(&entry.first);
        free_buffer(&entry.second);
    }
    free_buffer(&tags->last);
}

}  // namespace

int32_t codec_source_first_audio(const int32_t *kinds, int32_t count) {
    for (int32_t i = 0; i < count; ++i) {
        if (kinds[i] == kWexaKindAudio) return i;
    }
    return -1;
}

int32_t codec_source_reduce_to_first(const mtsrc_ctx *src, int32_t bytes, int64_t /*first*/) {
    return pcm_first_channel(src->q_wr, src->q_wr, bytes, src->format.channels);
}

int32_t codec_source_reduce_none(const mtsrc_ctx * /*src*/, int32_t bytes, int64_t /*first*/) {
    return bytes;
}

int32_t codec_source_begin_open(mtsrc_ctx *src, int32_t (*init)()) {
    if (src == nullptr) return TAVO_ERR_HANDLE;
    if (src->probe_file == nullptr) return TAVO_ERR_OPEN;
    if (init() != 0) return TAVO_ERR_CODEC;
    src->demux = nullptr;
    src->dstream = nullptr;
    src->decoder = nullptr;
    return TAVO_OK;
}

int32_t codec_source_set_decoder(mtsrc_ctx *src, const codec_ops &codec, void *decoder,
                                 const mtsrc_format &format) {
    src->decoder = decoder;
    if (decoder == nullptr) return TAVO_ERR_CODEC;
    src->frm_buf_size = codec.frame_bytes;
    src->codec = codec.code;
    src->format = format;
    const bool accepted =
        format.sample_rate >= codec.min_rate && format.sample_rate <= codec.max_rate;
    return accepted ? TAVO_OK : TAVO_ERR_FORMAT;
}

int32_t codec_source_end_open(const codec_source &source, mtsrc_ctx *src, wexa_tags *tags,
                              int32_t code) {
    if (tags != nullptr) free_tag_buffers(tags);
    if (code != TAVO_OK) codec_source_close(source, src);
    return code;
}

void codec_source_close(const codec_source &source, mtsrc_ctx *src) {
    if (src == nullptr) return;
    const container_ops *container = source.container;
    if (src->dstream != nullptr && container->close_stream != nullptr) {
        container->close_stream(src->dstream);
        src->dstream = nullptr;
    }
    if (src->demux != nullptr) {
        container->remove(src->demux);
        src->demux = nullptr;
    }
    if (src->decoder != nullptr && source.codec != nullptr) {
        source.codec->remove(src->decoder);
        src->decoder = nullptr;
    }
    container->deinit();
}

int32_t codec_source_get_frm(const codec_source &source, mtsrc_ctx *src, int32_t want,
                             mtsrc_frame *frame) {
    if (src == nullptr) return TAVO_ERR_HANDLE;
    decoding call = {};
    call.source = &source;
    return pcm_queue_get(src, want, frame, {fill_step, &call});
}

int32_t codec_source_seek(const codec_source &source, mtsrc_ctx *src, int64_t position,
                          int64_t *reached) {
    if (codec_source_reset(source, src) != TAVO_OK) return TAVO_ERR_HANDLE;
    const int32_t result = source.container->seek(stream_of(source, src), &position, reached);
    return result == 0 ? TAVO_OK : TAVO_ERR_HANDLE;
}

int32_t codec_source_reset(const codec_source &source, mtsrc_ctx *src) {
    if (src == nullptr) return TAVO_ERR_HANDLE;
    if (source.codec != nullptr) source.codec->reset(src->decoder);
    pcm_queue_clear(src);
    return TAVO_OK;
}
