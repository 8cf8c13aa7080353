// Format source for Ogg files with Vorbis. The decoder receives the set-up data before the first
// frame and outputs one channel.
#include <algorithm>
#include <cstdlib>

#include "media_source/codec_source.h"

namespace {

constexpr int32_t kMaxSetupBytes = 1 << 24;  // real codebooks take a few kilobytes
constexpr int32_t kVorbisChannels = 1;       // of the decoder's output

int32_t seek(void *stream, const int64_t *position, int64_t *reached) {
    return xoggds_seek(stream, position, reached, 0);
}

constexpr container_ops kOggContainer = {
    xoggds_get_frm,  // get_frm
    seek,            // seek
    xoggds_close,    // close_stream
    xoggd_delete,    // remove
    xvorbis_deinit,  // deinit
};
constexpr codec_ops kVorbisCodec = {
    kCodecVorbis,     // code
    16'384,           // frame_bytes
    0,                // spare_bytes
    INT32_MIN,        // min_rate
    kMaxRate,         // max_rate
    xvorbisd_decode,  // decode
    xvorbisd_reset,   // reset
    xvorbisd_delete,  // remove
};
constexpr codec_source kOgg = {&kOggContainer, &kVorbisCodec, codec_source_reduce_none};

// Stores the set-up data in *setup. Returns 0 or TAVO_ERR_OPEN; the caller frees setup->data.
int32_t read_setup(void *stream, wexa_frame *setup) {
    int32_t capacity = 0;
    if (xoggds_get_format(stream, nullptr, &capacity) != 0) return TAVO_ERR_OPEN;
    if (capacity < 0 || capacity > kMaxSetupBytes) return TAVO_ERR_OPEN;
    setup->data = malloc(static_cast<size_t>(capacity));
    if (setup->data == nullptr) return TAVO_ERR_OPEN;
    setup->bytes = capacity;
    setup->codec = kCodecVorbis;
    if (xoggds_get_format(stream, setup->data, &setup->bytes) != 0) return TAVO_ERR_OPEN;
    return setup->bytes >= 0 && setup->bytes <= capacity ? TAVO_OK : TAVO_ERR_OPEN;
}

int32_t create_decoder(mtsrc_ctx *src, const wexa_frame &setup) {
    const wexa_config config = {1, kVorbisChannels, 2, 0};
    src->decoder = xvorbisd_create(&config, nullptr);
    if (src->decoder == nullptr) return TAVO_ERR_CODEC;
    wexa_output output = {};
    wexa_status status = {};
    const int32_t result = xvorbisd_decode(src->decoder, &setup, &output, &status);
    return result == 0 ? TAVO_OK : TAVO_ERR_CODEC;
}

int32_t create(mtsrc_ctx *src, xogg_info *info, wexa_frame *setup) {
    int64_t word = 0;
    src->demux = xoggd_create(&src->io, &word, info, nullptr);
    if (src->demux == nullptr) return TAVO_ERR_OPEN;
    const int32_t index = get_ogg_audiostream(info);
    if (index < 0) return TAVO_ERR_OPEN;
    src->dstream = xoggds_open(src->demux, index, nullptr);
    if (src->dstream == nullptr) return TAVO_ERR_OPEN;
    xogg_stream stream = {};
    if (xoggds_get_info_aud(src->dstream, &stream) != 0) return TAVO_ERR_OPEN;
    if (read_setup(src->dstream, setup) != TAVO_OK) return TAVO_ERR_OPEN;
    if (stream.codec != kCodecVorbis) return TAVO_ERR_OPEN;
    const int32_t code = create_decoder(src, *setup);
    if (code != TAVO_OK) return code;
    return codec_source_set_decoder(
        src, kVorbisCodec, src->decoder,
        {stream.sample_rate, kVorbisChannels, kBitsPerSample, info->duration});
}

}  // namespace

int32_t get_ogg_audiostream(const void *info) {
    const auto *file = static_cast<const xogg_info *>(info);
    if (file == nullptr) return -1;
    return codec_source_first_audio(file->kind, std::min(file->stream_count, kOggStreams));
}

int32_t mtsource_ogg_open(mtsrc_ctx *src) {
    int32_t code = codec_source_begin_open(src, xvorbis_init);
    if (code != TAVO_OK) return code;
    xogg_info info = {};
    wexa_frame setup = {};
    code = create(src, &info, &setup);
    free(setup.data);
    return codec_source_end_open(kOgg, src, info.tags, code);
}

void mtsource_ogg_close(mtsrc_ctx *src) {
    codec_source_close(kOgg, src);
}

int32_t mtsource_ogg_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return codec_source_get_frm(kOgg, src, want, frame);
}

int32_t mtsource_ogg_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return codec_source_seek(kOgg, src, position, reached);
}

int32_t mtsource_ogg_reset(mtsrc_ctx *src) {
    return codec_source_reset(kOgg, src);
}
