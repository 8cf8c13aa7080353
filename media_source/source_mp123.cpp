#include <cstring>

#include "media_source/codec_source.h"
#include "media_source/pcm_queue.h"

namespace {

// A decoder's delay at the start of a 44.1-kHz stereo stream: 529 sample pairs.
constexpr int32_t kDelayBytes = 2116;
constexpr int32_t kDelayRate = 44'100;  // Hz
constexpr int32_t kDelayChannels = 2;

int32_t read_frame(mtsrc_ctx *src, wexa_frame *frame, int64_t *first) {
    int64_t second = 0;
    return xmp123fd_get_frm(src->demux, frame->data, src->frm_buf_size, &frame->bytes, first,
                            &second);
}

int32_t seek_to(mtsrc_ctx *src, const int64_t *position, int64_t *reached) {
    return xmp123fd_seek(src->demux, position, reached);
}

int32_t reduce(const mtsrc_ctx *src, int32_t bytes, int64_t first) {
    const bool delayed = src->format.channels == kDelayChannels &&
                         src->format.sample_rate == kDelayRate && first == 0;
    if (delayed) {
        // A first frame shorter than the delay goes whole.
        const int32_t dropped = bytes < kDelayBytes ? bytes : kDelayBytes;
        bytes -= dropped;
        memmove(src->q_wr, src->q_wr + dropped, static_cast<size_t>(bytes));
    }
    return pcm_mean_of_two(src->q_wr, src->q_wr, bytes, src->format.channels);
}

constexpr codec_source_ops kMp123 = {
    nullptr,          // close_stream
    xmp123fd_delete,  // remove_reader
    xmp123d_delete,   // remove_decoder
    xmp123d_reset,    // reset
    xmp123d_decode,   // decode
    xmp123_deinit,    // deinit
    read_frame,       // read
    seek_to,          // move
    reduce,           // reduce
    0,                // spare
};

int32_t create(mtsrc_ctx *src, xmp123_info *info) {
    int64_t word = 0;
    src->demux = xmp123fd_create(&src->io, &word, info, nullptr);
    if (!src->demux) {
        return -7;
    }
    const wexa_config config = {1, 0, 2, 0};
    src->decoder = xmp123d_create(&config, nullptr);
    if (!src->decoder) {
        return -255;
    }
    src->frm_buf_size = kMpegFrameBytes;
    src->codec = kCodecMpeg;
    src->format = {info->sample_rate, info->channels, kBitsPerSample, info->duration};
    return info->sample_rate > kMaxRate || info->channels <= 0 ? -3 : 0;
}

}  // namespace

int32_t mtsource_mp123_open(mtsrc_ctx *src) {
    if (!src) {
        return -4;
    }
    if (!src->probe_file) {
        return -7;
    }
    if (xmp123_init() != 0) {
        return -255;
    }
    src->demux = nullptr;
    src->decoder = nullptr;
    xmp123_info info = {};
    const int32_t code = create(src, &info);
    return codec_source_finish_open(kMp123, src, info.tags, code);
}

void mtsource_mp123_close(mtsrc_ctx *src) {
    if (src) {
        codec_source_close(kMp123, src);
    }
}

int32_t mtsource_mp123_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return src ? codec_source_get_frm(kMp123, src, want, frame) : -4;
}

int32_t mtsource_mp123_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return src ? codec_source_seek(kMp123, src, position, reached) : -4;
}

int32_t mtsource_mp123_reset(mtsrc_ctx *src) {
    return src ? codec_source_reset(kMp123, src) : -4;
}
