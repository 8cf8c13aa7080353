// Format source for FLAC files.
#include "media_source/codec_source.h"

namespace {

// Sets the flag byte in the reader's state, then reads.
int32_t get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                int64_t *second) {
    static_cast<uint8_t *>(reader)[kFlacReaderFlag] = 1;
    return xflacfd_get_frm(reader, buf, size, bytes, first, second);
}

constexpr container_ops kReader = {
    get_frm,         // get_frm
    xflacfd_seek,    // seek
    nullptr,         // close_stream
    xflacfd_delete,  // remove
    xflac_deinit,    // deinit
};
constexpr codec_ops kFlacCodec = {
    kCodecFlac,        // code
    131'070,           // frame_bytes
    kQueueSpareBytes,  // spare_bytes
    kMinRate,          // min_rate
    192'000,           // max_rate
    xflacd_decode,     // decode
    xflacd_reset,      // reset
    xflacd_delete,     // remove
};
constexpr codec_source kFlac = {&kReader, &kFlacCodec, codec_source_reduce_to_first};

int32_t create(mtsrc_ctx *src, xflac_info *info) {
    int64_t word = 0;
    src->demux = xflacfd_create(&src->io, &word, info, nullptr);
    if (src->demux == nullptr) return TAVO_ERR_OPEN;
    const wexa_config config = {1, kReducedChannels, 2, 0};
    return codec_source_set_decoder(
        src, kFlacCodec, xflacd_create(&config, nullptr),
        {info->sample_rate, kReducedChannels, kBitsPerSample, info->duration});
}

}  // namespace

int32_t mtsource_flac_open(mtsrc_ctx *src) {
    int32_t code = codec_source_begin_open(src, xflac_init);
    if (code != TAVO_OK) return code;
    xflac_info info = {};
    code = create(src, &info);
    return codec_source_end_open(kFlac, src, info.tags, code);
}

void mtsource_flac_close(mtsrc_ctx *src) {
    codec_source_close(kFlac, src);
}

int32_t mtsource_flac_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return codec_source_get_frm(kFlac, src, want, frame);
}

int32_t mtsource_flac_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return codec_source_seek(kFlac, src, position, reached);
}

int32_t mtsource_flac_reset(mtsrc_ctx *src) {
    return codec_source_reset(kFlac, src);
}
