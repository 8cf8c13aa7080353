// Format source for bare AAC streams in ADTS or ADIF form.
#include <cstdlib>

#include "media_source/codecs.h"

namespace {

constexpr container_ops kReader = {
    xaacfd_get_frm,  // get_frm
    xaacfd_seek,     // seek
    nullptr,         // close_stream
    xaacfd_delete,   // remove
    xaac_deinit,     // deinit
};
constexpr codec_source kAac = {&kReader, &kAacCodec, codec_source_reduce_to_first};

int32_t create(mtsrc_ctx *src, xaac_info *info) {
    int64_t word = 0;
    src->demux = xaacfd_create(&src->io, &word, info, nullptr);
    if (src->demux == nullptr) return TAVO_ERR_OPEN;
    return create_aac_decoder(src, info->sample_rate, info->channels, info->duration);
}

}  // namespace

int32_t mtsource_aac_open(mtsrc_ctx *src) {
    int32_t code = codec_source_begin_open(src, xaac_init);
    if (code != TAVO_OK) return code;
    xaac_info info = {};
    code = create(src, &info);
    return codec_source_end_open(kAac, src, info.tags, code);
}

void mtsource_aac_close(mtsrc_ctx *src) {
    codec_source_close(kAac, src);
}

int32_t mtsource_aac_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return codec_source_get_frm(kAac, src, want, frame);
}

int32_t mtsource_aac_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return codec_source_seek(kAac, src, position, reached);
}

int32_t mtsource_aac_reset(mtsrc_ctx *src) {
    return codec_source_reset(kAac, src);
}

int32_t aac_get_hz(void *reader, void *decoder) {
    const int32_t size = kAacCodec.frame_bytes;
    void *buf = malloc(static_cast<size_t>(size));
    if (buf == nullptr) return -1;
    wexa_frame frame = {};
    frame.data = buf;
    frame.codec = kCodecAac;
    int64_t first = 0;
    int64_t second = 0;
    xaac_stream_info info = {};
    const bool read = xaacfd_get_frm(reader, buf, size, &frame.bytes, &first, &second) == 0 &&
                      frame.bytes >= 0 && frame.bytes <= size;
    const bool known = read && xaacd_info(decoder, &frame, &info) == 0;
    free(buf);
    return known ? info.sample_rate : -1;
}
