// AAC: bundles of raw blocks to 16-bit PCM, two channels (or as configured).
//
// A block that does not decode comes out as silence of its own length, so that what follows stays
// in its place: decoding fails for want of memory only, never for damaged data.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/aac/aac_stream.h"
#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/bundle.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kSampleBytes = 2;
constexpr int32_t kMaxChannels = 64;

struct aac_decoder {
    av_decoder av;
    int32_t output_channels;  // 0: the stream's own
};

// Decodes every frame of the bundle. Returns false when the decoder cannot be opened, the frame is
// none of the reader's, or out of memory.
bool decode_bundle(aac_decoder *d, const wexa_frame *frame, bundle_view *view,
                   int32_t *last_samples) {
    *last_samples = 0;
    if (!bundle_open(view, frame->data, frame->bytes)) {
        return false;
    }
    if (d->av.ctx == nullptr || (view->head.flags & kBundleFresh) != 0) {
        av_setup setup = {};
        setup.extra = view->setup;
        setup.extra_bytes = view->head.setup;
        if (!av_decoder_open(&d->av, "aac", &setup)) {
            return false;
        }
    }
    int32_t bytes = 0;
    for (const uint8_t *block = bundle_next(view, &bytes); block != nullptr;
         block = bundle_next(view, &bytes)) {
        *last_samples = av_decoder_decode(&d->av, block, bytes);
        if (*last_samples == kAvNoMemory) {
            return false;
        }
    }
    return true;
}

}  // namespace

int32_t xaac_init(void) {
    av_prepare();
    return 0;
}

void xaac_deinit(void) {}

void *xaacd_create(const xaac_config *config, void * /*reserved*/) {
    if (config == nullptr || config->base.bytes_per_sample != kSampleBytes) {
        return nullptr;
    }
    aac_decoder *d = static_cast<aac_decoder *>(calloc(1, sizeof(aac_decoder)));
    if (d != nullptr) {
        d->output_channels = config->base.output_channels;
    }
    return d;
}

int32_t xaacd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                     wexa_status *status) {
    aac_decoder *d = static_cast<aac_decoder *>(decoder);
    if (d == nullptr || frame == nullptr || output == nullptr || status == nullptr) {
        return -1;
    }
    output->bytes = 0;
    status->produced = 0;
    bundle_view view;
    int32_t last_samples = 0;
    if (!decode_bundle(d, frame, &view, &last_samples)) {
        return -1;
    }
    const int32_t own = std::clamp(d->output_channels > 0 ? d->output_channels : view.head.channels,
                                   1, kMaxChannels);
    const int32_t samples = view.head.samples;
    if (samples == 0) {
        return 0;  // decoded for the state
    }
    if (output->data == nullptr || samples < 0 ||
        samples > kAacFrameBuffer / (own * kSampleBytes)) {
        return -1;
    }
    const int32_t wanted = samples * own * kSampleBytes;
    int32_t got = 0;
    if (last_samples > 0) {
        const av_channels policy = d->output_channels == 1   ? kAvMean
                                   : d->output_channels == 2 ? kAvFront
                                                             : kAvOwn;
        got = av_decoder_pcm(&d->av, policy, own, view.head.skip, samples, output->data, wanted);
        got = std::max(got, 0);
    }
    memset(static_cast<uint8_t *>(output->data) + got, 0, static_cast<size_t>(wanted - got));
    output->bytes = wanted;
    status->produced = 1;
    return 0;
}

void xaacd_reset(void *decoder) {
    aac_decoder *d = static_cast<aac_decoder *>(decoder);
    if (d != nullptr) {
        av_decoder_close(&d->av);
    }
}

void xaacd_delete(void *decoder) {
    xaacd_reset(decoder);
    free(decoder);
}

int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info) {
    aac_decoder *d = static_cast<aac_decoder *>(decoder);
    bundle_view view;
    int32_t last_samples = 0;
    if (d == nullptr || frame == nullptr || info == nullptr ||
        !decode_bundle(d, frame, &view, &last_samples) || last_samples <= 0) {
        return -1;
    }
    info->sample_rate = av_decoder_rate(&d->av);
    return 0;
}
