#include "media_source/codec_source.h"

namespace {

int32_t read_frame(mtsrc_ctx *src, wexa_frame *frame, int64_t *first) {
    int64_t second = 0;
    return xmp4fds_get_frm(src->dstream, frame->data, src->frm_buf_size, &frame->bytes, first,
                           &second);
}

int32_t seek_to(mtsrc_ctx *src, const int64_t *position, int64_t *reached) {
    return xmp4fds_seek(src->dstream, position, reached, 0);
}

void deinit() {
    xaac_deinit();
    xmp123_deinit();
}

// The decoder follows the handle's codec; without one only what is queued can be delivered.
constexpr codec_source_ops kMp4Aac = {
    xmp4fds_close,            // close_stream
    xmp4fd_delete,            // remove_reader
    xaacd_delete,             // remove_decoder
    xaacd_reset,              // reset
    xaacd_decode,             // decode
    deinit,                   // deinit
    read_frame,               // read
    seek_to,                  // move
    codec_source_keep_first,  // reduce
    0,                        // spare
};
constexpr codec_source_ops kMp4Mpeg = {
    xmp4fds_close,            // close_stream
    xmp4fd_delete,            // remove_reader
    xmp123d_delete,           // remove_decoder
    xmp123d_reset,            // reset
    xmp123d_decode,           // decode
    deinit,                   // deinit
    read_frame,               // read
    seek_to,                  // move
    codec_source_keep_first,  // reduce
    0,                        // spare
};
constexpr codec_source_ops kMp4None = {
    xmp4fds_close,            // close_stream
    xmp4fd_delete,            // remove_reader
    nullptr,                  // remove_decoder
    nullptr,                  // reset
    nullptr,                  // decode
    deinit,                   // deinit
    read_frame,               // read
    seek_to,                  // move
    codec_source_keep_first,  // reduce
    0,                        // spare
};

const codec_source_ops &ops_of(const mtsrc_ctx *src) {
    switch (src->codec) {
        case kCodecAac:
            return kMp4Aac;
        case kCodecMpeg:
            return kMp4Mpeg;
        default:
            return kMp4None;
    }
}

int32_t open_aac(mtsrc_ctx *src, const xmp4_track &track, int64_t duration) {
    const xaac_config config = codec_source_aac_config(track.sample_rate, track.channels);
    src->decoder = xaacd_create(&config, nullptr);
    if (!src->decoder) {
        return -255;
    }
    src->frm_buf_size = kAacFrameBytes;
    src->codec = kCodecAac;
    src->format = {track.sample_rate, kReducedChannels, kBitsPerSample, duration};
    return track.sample_rate < kMinRate || track.sample_rate > kMaxRate ? -3 : 0;
}

int32_t open_mpeg(mtsrc_ctx *src, const xmp4_track &track, int64_t duration) {
    const wexa_config config = {1, 0, 2, 0};
    src->decoder = xmp123d_create(&config, nullptr);
    if (!src->decoder) {
        return -255;
    }
    src->frm_buf_size = kMpegFrameBytes;
    src->codec = kCodecMpeg;
    src->format = {track.sample_rate, track.channels, kBitsPerSample, duration};
    return track.sample_rate > kMaxRate || track.channels <= 0 ? -3 : 0;
}

int32_t create(mtsrc_ctx *src, xmp4_info *info) {
    int32_t word = 0;
    src->demux = xmp4fd_create(&src->io, &word, info, nullptr);
    if (!src->demux) {
        return -7;
    }
    const int32_t index = get_mp4_audiostream(info);
    if (index < 0) {
        return -7;
    }
    src->dstream = xmp4fds_open(src->demux, index, nullptr);
    if (!src->dstream) {
        return -7;
    }
    xmp4_track track = {};
    xmp4fds_get_info_aud(src->dstream, &track);
    int32_t code = -3;
    if (track.format_tag == kWexaTagAac) {
        code = open_aac(src, track, info->duration);
    } else if (track.format_tag == kWexaTagMpegLayer3) {
        code = open_mpeg(src, track, info->duration);
    }
    return code;
}

}  // namespace

int32_t get_mp4_audiostream(const void *info) {
    const auto *file = static_cast<const xmp4_info *>(info);
    if (!file) {
        return -1;
    }
    for (int32_t i = 0; i < file->track_count && i < kMp4Tracks; ++i) {
        if (file->kind[i] == kWexaKindAudio) {
            return i;
        }
    }
    return -1;
}

int32_t mtsource_mp4a_open(mtsrc_ctx *src) {
    if (!src) {
        return -4;
    }
    if (!src->probe_file) {
        return -7;
    }
    // Nothing is undone here when the second fails: the close that follows gives both back.
    if (xaac_init() != 0 || xmp123_init() != 0) {
        return -255;
    }
    src->demux = nullptr;
    src->dstream = nullptr;
    src->decoder = nullptr;
    xmp4_info info = {};
    const int32_t code = create(src, &info);
    return codec_source_finish_open(ops_of(src), src, info.tags, code);
}

void mtsource_mp4a_close(mtsrc_ctx *src) {
    if (src) {
        codec_source_close(ops_of(src), src);
    }
}

int32_t mtsource_mp4a_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return src ? codec_source_get_frm(ops_of(src), src, want, frame) : -4;
}

int32_t mtsource_mp4a_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return src && src->dstream ? codec_source_seek(ops_of(src), src, position, reached) : -4;
}

int32_t mtsource_mp4a_reset(mtsrc_ctx *src) {
    return src ? codec_source_reset(ops_of(src), src) : -4;
}
