// Format source for bare MPEG audio streams, Layers I to III.
#include <algorithm>
#include <cstring>

#include "media_source/codecs.h"
#include "media_source/pcm_queue.h"

namespace {

// The decoder's delay, which is dropped at the start of a 44.1-kHz stereo stream.
constexpr int32_t kDelayRate = 44'100;  // Hz
constexpr int32_t kDelayChannels = 2;
constexpr int32_t kDelayBytes = kWexaMpegDelay * kDelayChannels * 2;

// Reduces a frame to the mean of its first two channels. Drops the delay from the first frame.
int32_t reduce(const mtsrc_ctx *src, int32_t bytes, int64_t first) {
    const bool delayed = src->format.channels == kDelayChannels &&
                         src->format.sample_rate == kDelayRate && first == 0;
    if (delayed) {
        // A first frame that is shorter than the delay is dropped entirely.
        const int32_t dropped = std::min(bytes, kDelayBytes);
        bytes -= dropped;
        memmove(src->q_wr, src->q_wr + dropped, static_cast<size_t>(bytes));
    }
    return pcm_mean_of_two(src->q_wr, src->q_wr, bytes, src->format.channels);
}

constexpr container_ops kReader = {
    xmp123fd_get_frm,  // get_frm
    xmp123fd_seek,     // seek
    nullptr,           // close_stream
    xmp123fd_delete,   // remove
    xmp123_deinit,     // deinit
};
constexpr codec_source kMp123 = {&kReader, &kMpegCodec, reduce};

int32_t create(mtsrc_ctx *src, xmp123_info *info) {
    int64_t word = 0;
    src->demux = xmp123fd_create(&src->io, &word, info, nullptr);
    if (src->demux == nullptr) return TAVO_ERR_OPEN;
    return create_mpeg_decoder(src, info->sample_rate, info->channels, info->duration);
}

}  // namespace

int32_t mtsource_mp123_open(mtsrc_ctx *src) {
    int32_t code = codec_source_begin_open(src, xmp123_init);
    if (code != TAVO_OK) return code;
    xmp123_info info = {};
    code = create(src, &info);
    return codec_source_end_open(kMp123, src, info.tags, code);
}

void mtsource_mp123_close(mtsrc_ctx *src) {
    codec_source_close(kMp123, src);
}

int32_t mtsource_mp123_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return codec_source_get_frm(kMp123, src, want, frame);
}

int32_t mtsource_mp123_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return codec_source_seek(kMp123, src, position, reached);
}

int32_t mtsource_mp123_reset(mtsrc_ctx *src) {
    return codec_source_reset(kMp123, src);
}
