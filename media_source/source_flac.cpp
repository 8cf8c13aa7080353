#include "media_source/codec_source.h"

namespace {

constexpr int32_t kFrameBytes = 131'070;
constexpr int32_t kMinRate = 8'000;        // Hz
constexpr int32_t kMaxFlacRate = 192'000;  // Hz

int32_t read_frame(mtsrc_ctx *src, wexa_frame *frame, int64_t *first) {
    int64_t second = 0;
    static_cast<uint8_t *>(src->demux)[kFlacReaderFlag] = 1;
    return xflacfd_get_frm(src->demux, frame->data, src->frm_buf_size, &frame->bytes, first,
                           &second);
}

int32_t seek_to(mtsrc_ctx *src, const int64_t *position, int64_t *reached) {
    return xflacfd_seek(src->demux, position, reached);
}

constexpr codec_source_ops kFlac = {
    nullptr,                  // close_stream
    xflacfd_delete,           // remove_reader
    xflacd_delete,            // remove_decoder
    xflacd_reset,             // reset
    xflacd_decode,            // decode
    xflac_deinit,             // deinit
    read_frame,               // read
    seek_to,                  // move
    codec_source_keep_first,  // reduce
    kQueueSpareBytes,         // spare
};

int32_t create(mtsrc_ctx *src, xflac_info *info) {
    int64_t word = 0;
    src->demux = xflacfd_create(&src->io, &word, info, nullptr);
    if (!src->demux) {
        return -7;
    }
    const wexa_config config = {1, kReducedChannels, 2, 0};
    src->decoder = xflacd_create(&config, nullptr);
    if (!src->decoder) {
        return -255;
    }
    src->frm_buf_size = kFrameBytes;
    src->codec = kCodecFlac;
    src->format = {info->sample_rate, kReducedChannels, kBitsPerSample, info->duration};
    return info->sample_rate < kMinRate || info->sample_rate > kMaxFlacRate ? -3 : 0;
}

}  // namespace

int32_t mtsource_flac_open(mtsrc_ctx *src) {
    if (!src) {
        return -4;
    }
    if (!src->probe_file) {
        return -7;
    }
    if (xflac_init() != 0) {
        return -255;
    }
    src->demux = nullptr;
    src->decoder = nullptr;
    xflac_info info = {};
    const int32_t code = create(src, &info);
    return codec_source_finish_open(kFlac, src, info.tags, code);
}

void mtsource_flac_close(mtsrc_ctx *src) {
    if (src) {
        codec_source_close(kFlac, src);
    }
}

int32_t mtsource_flac_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return src ? codec_source_get_frm(kFlac, src, want, frame) : -4;
}

int32_t mtsource_flac_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return src ? codec_source_seek(kFlac, src, position, reached) : -4;
}

int32_t mtsource_flac_reset(mtsrc_ctx *src) {
    return src ? codec_source_reset(kFlac, src) : -4;
}
