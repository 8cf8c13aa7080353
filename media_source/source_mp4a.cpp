// Format source for MP4 files whose first audio track is AAC or MPEG Layer III.
#include <algorithm>

#include "media_source/codecs.h"

namespace {

int32_t init() {
    // If the second call fails, closing the handle undoes the first.
    const int32_t result = xaac_init();
    return result != 0 ? result : xmp123_init();
}

void deinit() {
    xaac_deinit();
    xmp123_deinit();
}

int32_t seek(void *stream, const int64_t *position, int64_t *reached) {
    return xmp4fds_seek(stream, position, reached, 0);
}

constexpr container_ops kMp4 = {
    xmp4fds_get_frm,  // get_frm
    seek,             // seek
    xmp4fds_close,    // close_stream
    xmp4fd_delete,    // remove
    deinit,           // deinit
};
constexpr codec_source kAacInMp4 = {&kMp4, &kAacCodec, codec_source_reduce_to_first};
constexpr codec_source kMpegInMp4 = {&kMp4, &kMpegCodec, codec_source_reduce_to_first};
// Used for any other codec. Without a decoder it delivers only what is already in the queue.
constexpr codec_source kOtherInMp4 = {&kMp4, nullptr, codec_source_reduce_to_first};

const codec_source &source_of(const mtsrc_ctx *src) {
    if (src != nullptr && src->codec == kCodecAac) return kAacInMp4;
    if (src != nullptr && src->codec == kCodecMpeg) return kMpegInMp4;
    return kOtherInMp4;
}

int32_t create(mtsrc_ctx *src, xmp4_info *info) {
    int32_t word = 0;
    src->demux = xmp4fd_create(&src->io, &word, info, nullptr);
    if (src->demux == nullptr) return TAVO_ERR_OPEN;
    const int32_t index = get_mp4_audiostream(info);
    if (index < 0) return TAVO_ERR_OPEN;
    src->dstream = xmp4fds_open(src->demux, index, nullptr);
    if (src->dstream == nullptr) return TAVO_ERR_OPEN;
    xmp4_track track = {};
    xmp4fds_get_info_aud(src->dstream, &track);
    switch (track.format_tag) {
        case kWexaTagAac:
            return create_aac_decoder(src, track.sample_rate, track.channels, info->duration);
        case kWexaTagMpegLayer3:
            return create_mpeg_decoder(src, track.sample_rate, track.channels, info->duration);
        default:
            return TAVO_ERR_FORMAT;
    }
}

}  // namespace

int32_t get_mp4_audiostream(const void *info) {
    const auto *file = static_cast<const xmp4_info *>(info);
    if (file == nullptr) return -1;
    return codec_source_first_audio(file->kind, std::min(file->track_count, kMp4Tracks));
}

int32_t mtsource_mp4a_open(mtsrc_ctx *src) {
    int32_t code = codec_source_begin_open(src, init);
    if (code != TAVO_OK) return code;
    xmp4_info info = {};
    code = create(src, &info);
    return codec_source_end_open(source_of(src), src, info.tags, code);
}

void mtsource_mp4a_close(mtsrc_ctx *src) {
    codec_source_close(source_of(src), src);
}

int32_t mtsource_mp4a_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return codec_source_get_frm(source_of(src), src, want, frame);
}

int32_t mtsource_mp4a_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    if (src == nullptr || src->dstream == nullptr) return TAVO_ERR_HANDLE;
    return codec_source_seek(source_of(src), src, position, reached);
}

int32_t mtsource_mp4a_reset(mtsrc_ctx *src) {
    return codec_source_reset(source_of(src), src);
}
