// The decoders of all codecs. The readers deliver PCM as frames, so decoding a frame only copies
// it. See shared/stream.h.
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/shared/codec_library.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kSampleBytes = 2;

struct copy_decoder {
    int32_t rate;  // configured sample rate, Hz; only for AAC
};

// Returns null if the configuration requests PCM in a form that the readers do not deliver.
copy_decoder *create(const wexa_config *config, int32_t channels) {
    if (config->bytes_per_sample != kSampleBytes || config->output_channels != channels) {
        return nullptr;
    }
    return static_cast<copy_decoder *>(calloc(1, sizeof(copy_decoder)));
}

}  // namespace

int32_t xaac_init(void) {
    return codec_library_get() != nullptr ? 0 : -1;
}

int32_t xflac_init(void) {
    return 0;
}

void xaac_deinit(void) {}

void *xaacd_create(const xaac_config *config, void * /*reserved*/) {
    copy_decoder *d = create(&config->base, 2);
    if (d != nullptr) d->rate = config->sample_rate;
    return d;
}

void *xflacd_create(const wexa_config *config, void * /*reserved*/) {
    return create(config, 2);
}

void *xmp123d_create(const wexa_config *config, void * /*reserved*/) {
    return create(config, 0);
}

void *xvorbisd_create(const wexa_config *config, void * /*reserved*/) {
    return create(config, 1);
}

int32_t xaacd_decode(void * /*decoder*/, const wexa_frame *frame, wexa_output *output,
                     wexa_status *status) {
    if (frame->data == nullptr || frame->bytes < 0 || output->data == nullptr) return -1;
    memcpy(output->data, frame->data, static_cast<size_t>(frame->bytes));
    output->bytes = frame->bytes;
    status->produced = frame->bytes > 0 ? 1 : 0;
    return 0;
}

// The first call passes the set-up data and no output buffer.
int32_t xvorbisd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                        wexa_status *status) {
    if (output->data != nullptr) return xaacd_decode(decoder, frame, output, status);
    const auto *setup = static_cast<const uint8_t *>(frame->data);
    if (setup == nullptr || frame->bytes <= 0 || *setup != kVorbisSetupMark) return -1;
    output->bytes = status->produced = 0;
    return 0;
}

int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info) {
    if (frame->bytes <= 0) return -1;
    info->sample_rate = static_cast<copy_decoder *>(decoder)->rate;
    return 0;
}

void xaacd_reset(void * /*decoder*/) {}

void xaacd_delete(void *decoder) {
    free(decoder);
}

// The functions of the other codecs differ from those of AAC only in their names.
decltype(xaac_init) xmp123_init [[gnu::alias("xaac_init")]];
decltype(xaac_init) xvorbis_init [[gnu::alias("xaac_init")]];
decltype(xaac_deinit) xflac_deinit [[gnu::alias("xaac_deinit")]];
decltype(xaac_deinit) xmp123_deinit [[gnu::alias("xaac_deinit")]];
decltype(xaac_deinit) xvorbis_deinit [[gnu::alias("xaac_deinit")]];
decltype(xaacd_decode) xflacd_decode [[gnu::alias("xaacd_decode")]];
decltype(xaacd_decode) xmp123d_decode [[gnu::alias("xaacd_decode")]];
decltype(xaacd_reset) xflacd_reset [[gnu::alias("xaacd_reset")]];
decltype(xaacd_reset) xmp123d_reset [[gnu::alias("xaacd_reset")]];
decltype(xaacd_reset) xvorbisd_reset [[gnu::alias("xaacd_reset")]];
decltype(xaacd_delete) xflacd_delete [[gnu::alias("xaacd_delete")]];
decltype(xaacd_delete) xmp123d_delete [[gnu::alias("xaacd_delete")]];
decltype(xaacd_delete) xvorbisd_delete [[gnu::alias("xaacd_delete")]];
