#include <cstdlib>

#include "media_source/codec_source.h"

namespace {

constexpr int32_t kFrameBytes = 16'384;
constexpr int32_t kMaxSetupBytes = 1 << 24;  // code books take some kilobytes
constexpr int32_t kVorbisChannels = 1;       // the decoder is asked for one

int32_t read_frame(mtsrc_ctx *src, wexa_frame *frame, int64_t *first) {
    int64_t second = 0;
    return xoggds_get_frm(src->dstream, frame->data, src->frm_buf_size, &frame->bytes, first,
                          &second);
}

int32_t seek_to(mtsrc_ctx *src, const int64_t *position, int64_t *reached) {
    return xoggds_seek(src->dstream, position, reached, 0);
}

constexpr codec_source_ops kOgg = {
    xoggds_close,           // close_stream
    xoggd_delete,           // remove_reader
    xvorbisd_delete,        // remove_decoder
    xvorbisd_reset,         // reset
    xvorbisd_decode,        // decode
    xvorbis_deinit,         // deinit
    read_frame,             // read
    seek_to,                // move
    codec_source_keep_all,  // reduce
    0,                      // spare
};

// On success the caller frees setup->data.
int32_t fetch_setup(mtsrc_ctx *src, wexa_frame *setup) {
    int32_t length = 0;
    if (xoggds_get_format(src->dstream, nullptr, &length) != 0 || length < 0 ||
        length > kMaxSetupBytes) {
        return -7;
    }
    const int32_t capacity = length;
    setup->data = malloc(static_cast<size_t>(capacity));
    if (!setup->data) {
        return -7;
    }
    if (xoggds_get_format(src->dstream, setup->data, &length) != 0 || length < 0 ||
        length > capacity) {
        free(setup->data);
        setup->data = nullptr;
        return -7;
    }
    setup->bytes = length;
    setup->codec = kCodecVorbis;
    return 0;
}

int32_t create_decoder(mtsrc_ctx *src, const wexa_frame &setup) {
    const wexa_config config = {1, kVorbisChannels, 2, 0};
    src->decoder = xvorbisd_create(&config, nullptr);
    if (!src->decoder) {
        return -255;
    }
    wexa_output output = {};
    wexa_status status = {};
    return xvorbisd_decode(src->decoder, &setup, &output, &status) == 0 ? 0 : -255;
}

int32_t create(mtsrc_ctx *src, xogg_info *info, wexa_frame *setup) {
    int64_t word = 0;
    src->demux = xoggd_create(&src->io, &word, info, nullptr);
    if (!src->demux) {
        return -7;
    }
    const int32_t index = get_ogg_audiostream(info);
    if (index < 0) {
        return -7;
    }
    src->dstream = xoggds_open(src->demux, index, nullptr);
    if (!src->dstream) {
        return -7;
    }
    xogg_stream stream = {};
    if (xoggds_get_info_aud(src->dstream, &stream) != 0 || fetch_setup(src, setup) != 0 ||
        stream.codec != kCodecVorbis) {
        return -7;
    }
    const int32_t code = create_decoder(src, *setup);
    if (code != 0) {
        return code;
    }
    src->frm_buf_size = kFrameBytes;
    src->codec = kCodecVorbis;
    src->format = {stream.sample_rate, kVorbisChannels, kBitsPerSample, info->duration};
    return stream.sample_rate > kMaxRate ? -3 : 0;
}

}  // namespace

int32_t get_ogg_audiostream(const void *info) {
    const auto *file = static_cast<const xogg_info *>(info);
    if (!file) {
        return -1;
    }
    for (int32_t i = 0; i < file->stream_count && i < kOggStreams; ++i) {
        if (file->kind[i] == kWexaKindAudio) {
            return i;
        }
    }
    return -1;
}

int32_t mtsource_ogg_open(mtsrc_ctx *src) {
    if (!src) {
        return -4;
    }
    if (!src->probe_file) {
        return -7;
    }
    if (xvorbis_init() != 0) {
        return -255;
    }
    src->demux = nullptr;
    src->dstream = nullptr;
    src->decoder = nullptr;
    xogg_info info = {};
    wexa_frame setup = {};
    const int32_t code = create(src, &info, &setup);
    free(setup.data);
    return codec_source_finish_open(kOgg, src, info.tags, code);
}

void mtsource_ogg_close(mtsrc_ctx *src) {
    if (src) {
        codec_source_close(kOgg, src);
    }
}

int32_t mtsource_ogg_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    return src ? codec_source_get_frm(kOgg, src, want, frame) : -4;
}

int32_t mtsource_ogg_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    return src ? codec_source_seek(kOgg, src, position, reached) : -4;
}

int32_t mtsource_ogg_reset(mtsrc_ctx *src) {
    return src ? codec_source_reset(kOgg, src) : -4;
}
