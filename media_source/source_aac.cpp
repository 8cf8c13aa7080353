#include <cstdlib>

#include "media_source/codec_source.h"

namespace {

int32_t read_frame(mtsrc_ctx *src, wexa_frame *frame, int64_t *first) {
    int64_t second = 0;
    return xaacfd_get_frm(src->demux, frame->data, src->frm_buf_size, &frame->bytes, first,
                          &second);
}

int32_t seek_to(mtsrc_ctx *src, const int64_t *position, int64_t *reached) {
    return xaacfd_seek(src->demux, position, reached);
}

constexpr codec_source_ops kAac = {
    nullptr,                  // close_stream
    xaacfd_delete,            // remove_reader
    xaacd_delete,             // remove_decoder
    xaacd_reset,              // reset
    xaacd_decode,             // decode
    xaac_deinit,              // deinit
    read_frame,               // read
    seek_to,                  // move
    codec_source_keep_first,  // reduce
    0,                        // spare
};

int32_t create(mtsrc_ctx *src, xaac_info *info) {
    int64_t word = 0;
    src->demux = xaacfd_create(&src->io, &word, info, nullptr);
    if (!src->demux) {
        return -7;
    }
    const xaac_config config = codec_source_aac_config(info->sample_rate, info->channels);
    src->decoder = xaacd_create(&config, nullptr);
    if (!src->decoder) {
        return -255;
    }
    src->frm_buf_size = kAacFrameBytes;
    src->codec = kCodecAac;
    src->format = {info->sample_rate, kReducedChannels, kBitsPerSample, info->duration};
    return info->sample_rate < kMinRate || info->sample_rate > kMaxRate ? -3 : 0;
}

}  // namespace

int32_t mtsource_aac_open(mtsrc_ctx *src) {
    if (!src) {
        return -4;
    }
    if (!src->probe_file) {
        return -7;
    }
    if (xaac_init() != 0) {
        return -255;
    }
    src->demux = nullptr;
    src->decoder = nullptr;
    xaac_info info = {};
    const int32_t code = create(src, &info);
    return codec_source_finish_open(kAac, src, info.tags, code);
}

void mtsource_aac_close(mtsrc_ctx *src) {
    if (src) {
        codec_source_close(kAac, src);
    }
}

int32_t mtsource_aac_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return src ? codec_source_get_frm(kAac, src, want, frame) : -4;
}

int32_t mtsource_aac_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return src ? codec_source_seek(kAac, src, position, reached) : -4;
}

int32_t mtsource_aac_reset(mtsrc_ctx *src) {
    return src ? codec_source_reset(kAac, src) : -4;
}

int32_t aac_get_hz(void *reader, void *decoder) {
    void *buf = malloc(kAacFrameBytes);
    if (!buf) {
        return -1;
    }
    wexa_frame frame = {};
    frame.data = buf;
    frame.codec = kCodecAac;
    int64_t first = 0;
    int64_t second = 0;
    xaac_stream_info info = {};
    const bool known =
        xaacfd_get_frm(reader, buf, kAacFrameBytes, &frame.bytes, &first, &second) == 0 &&
        frame.bytes >= 0 && frame.bytes <= kAacFrameBytes &&
        xaacd_info(decoder, &frame, &info) == 0;
    free(buf);
    return known ? info.sample_rate : -1;
}
