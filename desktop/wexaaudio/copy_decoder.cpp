// The decoders of all codecs: the readers have decoded already, so a frame is finished PCM, and
// decoding copies it. See shared/stream.h.
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/ogg/vorbis_setup.h"
#include "desktop/wexaaudio/shared/codec_library.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kSampleBytes = 2;

struct copy_decoder {
    int32_t rate;  // Hz, as configured; AAC only
};

// channels: the output of the codec's readers, the only configuration that is supported.
void *create(const wexa_config *config, int32_t channels, int32_t rate) {
    if (config == nullptr || config->bytes_per_sample != kSampleBytes ||
        config->output_channels != channels) {
        return nullptr;
    }
    auto *d = static_cast<copy_decoder *>(calloc(1, sizeof(copy_decoder)));
    if (d != nullptr) d->rate = rate;
    return d;
}

int32_t decode(const void *decoder, const wexa_frame *frame, wexa_output *output,
               wexa_status *status) {
    if (decoder == nullptr || frame == nullptr || frame->data == nullptr || frame->bytes < 0 ||
        output == nullptr || output->data == nullptr || status == nullptr) {
        return -1;
    }
    memcpy(output->data, frame->data, static_cast<size_t>(frame->bytes));
    output->bytes = frame->bytes;
    status->produced = frame->bytes > 0 ? 1 : 0;
    return 0;
}

int32_t need_library() {
    return codec_library_get() != nullptr ? 0 : -1;
}

}  // namespace

int32_t xaac_init(void) {
    return need_library();
}
void xaac_deinit(void) {}
void *xaacd_create(const xaac_config *config, void * /*reserved*/) {
    return config != nullptr ? create(&config->base, 2, config->sample_rate) : nullptr;
}
int32_t xaacd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                     wexa_status *status) {
    return decode(decoder, frame, output, status);
}
void xaacd_reset(void * /*decoder*/) {}
void xaacd_delete(void *decoder) {
    free(decoder);
}
int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info) {
    if (decoder == nullptr || frame == nullptr || frame->bytes <= 0 || info == nullptr) return -1;
    info->sample_rate = static_cast<copy_decoder *>(decoder)->rate;
    return 0;
}

int32_t xflac_init(void) {
    return 0;
}
void xflac_deinit(void) {}
void *xflacd_create(const wexa_config *config, void * /*reserved*/) {
    return create(config, 2, 0);
}
int32_t xflacd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                      wexa_status *status) {
    return decode(decoder, frame, output, status);
}
void xflacd_reset(void * /*decoder*/) {}
void xflacd_delete(void *decoder) {
    free(decoder);
}

int32_t xmp123_init(void) {
    return need_library();
}
void xmp123_deinit(void) {}
void *xmp123d_create(const wexa_config *config, void * /*reserved*/) {
    return create(config, 0, 0);
}
int32_t xmp123d_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                       wexa_status *status) {
    return decode(decoder, frame, output, status);
}
void xmp123d_reset(void * /*decoder*/) {}
void xmp123d_delete(void *decoder) {
    free(decoder);
}

int32_t xvorbis_init(void) {
    return need_library();
}
void xvorbis_deinit(void) {}
void *xvorbisd_create(const wexa_config *config, void * /*reserved*/) {
    return create(config, 1, 0);
}
// The set-up data comes first, without a destination.
int32_t xvorbisd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                        wexa_status *status) {
    const bool set_up = output != nullptr && output->data == nullptr;
    if (!set_up) return decode(decoder, frame, output, status);
    const bool known = decoder != nullptr && frame != nullptr && frame->data != nullptr &&
                       frame->bytes > 0 && status != nullptr &&
                       *static_cast<const uint8_t *>(frame->data) == kVorbisSetupMark;
    if (known) output->bytes = status->produced = 0;
    return known ? 0 : -1;
}
void xvorbisd_reset(void * /*decoder*/) {}
void xvorbisd_delete(void *decoder) {
    free(decoder);
}
