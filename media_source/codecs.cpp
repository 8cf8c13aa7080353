#include "media_source/codecs.h"

const codec_ops kAacCodec = {
    kCodecAac,     // code
    24'576,        // frame_bytes
    0,             // spare_bytes
    kMinRate,      // min_rate
    kMaxRate,      // max_rate
    xaacd_decode,  // decode
    xaacd_reset,   // reset
    xaacd_delete,  // remove
};

const codec_ops kMpegCodec = {
    kCodecMpeg,      // code
    19'200,          // frame_bytes
    0,               // spare_bytes
    INT32_MIN,       // min_rate
    kMaxRate,        // max_rate
    xmp123d_decode,  // decode
    xmp123d_reset,   // reset
    xmp123d_delete,  // remove
};

int32_t create_aac_decoder(mtsrc_ctx *src, int32_t sample_rate, int32_t channels,
                           int64_t duration) {
    const xaac_config config = {{1, kReducedChannels, 2, 0}, 3, sample_rate, channels, 0};
    return codec_source_set_decoder(src, kAacCodec, xaacd_create(&config, nullptr),
                                    {sample_rate, kReducedChannels, kBitsPerSample, duration});
}

int32_t create_mpeg_decoder(mtsrc_ctx *src, int32_t sample_rate, int32_t channels,
                            int64_t duration) {
    const wexa_config config = {1, 0, 2, 0};
    const int32_t code =
        codec_source_set_decoder(src, kMpegCodec, xmp123d_create(&config, nullptr),
                                 {sample_rate, channels, kBitsPerSample, duration});
    return code == TAVO_OK && channels <= 0 ? TAVO_ERR_FORMAT : code;
}
